// SPDX-License-Identifier: GPL-2.0-or-later
// How walks end: at a stop, at an error, or complete.
#include <cerrno>
#include <string>

#include "platform/log.h"
#include "unit/worker/walks_fixture.h"

namespace fileindexd {
namespace {

using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::UnorderedElementsAre;

TEST_F(WorkerWalksTest, TheEndOfEachWalkIsToldAtDebugLevelOnly) {
  const std::string d = Dir("d");
  script.Fail("UpdateFSDocument");
  script.Fail("AddFSDocument");
  script.Forget();
  for (int which = 0; which < WALKS; ++which) {
    Walk(which, d);
  }
  EXPECT_EQ(script.CountLines("IndexDir"), 0U);

  TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_DEBUG;
  for (int which = 0; which < WALKS; ++which) {
    Walk(which, d);
  }
  EXPECT_THAT(Log(), Contains("IndexDirAdd: " + d));
  EXPECT_THAT(Log(), Contains("IndexDirUpdate: " + d));
  EXPECT_THAT(Log(), Contains("IndexDirClean: " + d));
}

TEST_F(WorkerWalksTest, AWalkThatBeginsStoppedDoesNothing) {
  for (const int state : {WORKER_IDLE, WORKER_OUT_OF_SPACE}) {
    worker->state = state;
    for (int which = 0; which < WALKS; ++which) {
      EXPECT_EQ(Walk(which, Dir("d")), 3);
    }
  }
  EXPECT_THAT(script.Calls(), IsEmpty());
  EXPECT_EQ(worker->op_count, 0);
}

TEST_F(WorkerWalksTest, AStopEndsEveryLevelAtItsNextRead) {
  Dir("d/a/b/c");
  File("d/a/b/c/f");
  script.Fail("IsFullPathIndexed");  // so that a clean descends
  for (int which = 0; which < WALKS; ++which) {
    worker->state = WORKER_RUNNING;
    const int before = script.CallCount("readdir64_r");
    int reads = 0;
    const char* const touch = which == 0   ? "IsFileExist"
                              : which == 1 ? "UpdateFSDocument"
                                           : "DelFSDocument";
    const int nth = script.CallCount(touch) + (which == 0 ? 1 : 5);
    script.Run(touch, nth, [&] {
      worker->state = WORKER_IDLE;
      reads = script.CallCount("readdir64_r");
    });

    EXPECT_EQ(Walk(which, In("d")), 3) << which;

    EXPECT_GT(reads, before) << which;
    EXPECT_EQ(script.CallCount("readdir64_r") - reads, 4) << which;  // one at each level
  }
}

TEST_F(WorkerWalksTest, ADirectoryThatCannotBeOpenedIsPassedOver) {
  for (const int error : {EACCES, ENOENT, EMFILE, EIO}) {
    for (int which = 0; which < WALKS; ++which) {
      script.Answer("opendir", script.CallCount("opendir") + 1, error);
      script.Forget();
      EXPECT_EQ(Walk(which, Dir("d")), 1) << which << " " << error;
      EXPECT_THAT(Log(), IsEmpty());
      EXPECT_THAT(script.Calls(),
                  Contains("NoteUnopenedDirectory " + In("d") + " " + std::to_string(error)));
    }
  }
}

TEST_F(WorkerWalksTest, AnUnopenableDirectoryBelowDoesNotEndTheWalk) {
  Dir("d/a");
  Dir("d/b");
  script.Answer("opendir", 2, EACCES);

  EXPECT_EQ(worker->IndexDirAdd(In("d")), 2);
  EXPECT_THAT(Touched(), UnorderedElementsAre("Add /d", "Add /d/a", "Add /d/b"));
}

TEST_F(WorkerWalksTest, AReadErrorEndsTheWalkAsIfItWereComplete) {
  File("d/f");
  for (int which = 0; which < WALKS; ++which) {
    script.Answer("readdir64_r", script.CallCount("readdir64_r") + 1, EIO);
    EXPECT_EQ(Walk(which, In("d")), 2) << which;
  }
  EXPECT_THAT(Touched(), ElementsAre("Add /d", "Upd /d"));
}

TEST_F(WorkerWalksTest, AReadErrorIsSeenBeforeAStop) {
  TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_DEBUG;
  File("d/f");
  for (int which = 0; which < WALKS; ++which) {
    worker->state = WORKER_RUNNING;
    const int nth = script.CallCount("readdir64_r") + 1;
    script.Answer("readdir64_r", nth, EIO);
    script.Run("readdir64_r", nth, [&] { worker->state = WORKER_IDLE; });

    EXPECT_EQ(Walk(which, In("d")), 2) << which;

    EXPECT_EQ(Log().back(), NAMES[which] + (": " + In("d")));
    EXPECT_EQ(script.CallCount("readdir64_r"), nth) << which;
  }
}

TEST_F(WorkerWalksTest, AStopIsSeenBeforeTheEnd) {
  const std::string d = Dir("d");
  for (int which = 0; which < WALKS; ++which) {
    worker->state = WORKER_RUNNING;
    script.Run("readdir64_r", script.CallCount("readdir64_r") + 3,  // ".", "..", end
               [&] { worker->state = WORKER_IDLE; });
    EXPECT_EQ(Walk(which, d), 3) << which;
  }
}

TEST_F(WorkerWalksTest, EveryOpenedStreamIsClosedOnce) {
  File("d/a/f");
  File("d/b/g");
  script.Fail("readdir64_r", 4);
  script.Fail("IsFullPathIndexed");
  for (int which = 0; which < WALKS; ++which) {
    Walk(which, In("d"));
  }
  EXPECT_GT(script.CallCount("opendir"), 3);
  EXPECT_EQ(script.CallCount("opendir"), script.CallCount("closedir"));
}

TEST_F(WorkerWalksTest, NoSpaceAtACommitStopsTheWalk) {
  File("d/f");
  worker->op_count = 1999;
  script.Fail("IsShareSpaceEnough");

  EXPECT_EQ(worker->IndexDirAdd(In("d")), 3);
  EXPECT_THAT(Changes(), ElementsAre(::testing::StartsWith("AddFSDocument"), "Commit"));
}

TEST_F(WorkerWalksTest, ADirectoryThatBecomesAFileInBetweenIsComplete) {
  const std::string d = Dir("d");
  for (int which = 0; which < WALKS; ++which) {
    script.Answer("opendir", script.CallCount("opendir") + 1, ENOTDIR);
    EXPECT_EQ(Walk(which, d), 2) << which;
  }
}

}  // namespace
}  // namespace fileindexd
