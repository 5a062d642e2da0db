// SPDX-License-Identifier: GPL-2.0-or-later
#include <algorithm>
#include <cerrno>
#include <filesystem>

#include "platform/log.h"
#include "unit/worker/worker_fixture.h"

namespace fileindexd {
namespace {

using scripted::EVERY_CALL;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::UnorderedElementsAre;

class WorkerWalksTest : public WorkerFixture {
 protected:
  WorkerWalksTest() {
    Create();
    worker->state = WORKER_RUNNING;
    descriptors = scripted::OpenDescriptors();
    script.Forget();
  }
  ~WorkerWalksTest() override { EXPECT_EQ(scripted::OpenDescriptors(), descriptors); }

  std::string Dir(const std::string& name) { return folder.MakeDir("share/" + name); }
  std::string File(const std::string& name) { return folder.Write("share/" + name, ""); }

  // The operations on the index, as "Add path"; paths without the share's own.
  std::vector<std::string> Touched() {
    std::vector<std::string> touched;
    for (const std::string& call : Changes()) {
      const size_t path = call.find(' ') + 1;
      const std::string whole = call.substr(path, call.find(' ', path) - path);
      touched.push_back(call.substr(0, 3) + " " + whole.substr(share_path.size()));
    }
    return touched;
  }

  static Json::Value Flags() {
    Json::Value flags(Json::objectValue);
    flags["audio"] = true;
    return flags;
  }

  // Each of the three walks, by number; the first two take entries in.
  static constexpr int WALKS = 3;
  static constexpr int TAKING_IN = 2;
  static constexpr const char* NAMES[] = {"IndexDirAdd", "IndexDirUpdate", "IndexDirClean"};
  static constexpr const char* TOUCHES[] = {"Add ", "Upd ", "Del "};
  int Walk(int which, const std::string& path) {
    return which == 0   ? worker->IndexDirAdd(path)
           : which == 1 ? worker->IndexDirUpdate(path, Flags())
                        : worker->IndexDirClean(path);
  }

  int descriptors = 0;
};

TEST_F(WorkerWalksTest, AnAddTakesTheDirectoryAndAllBelow) {
  const std::string d = Dir("d");
  File("d/f");
  Dir("d/e/empty");
  File("d/e/g");

  EXPECT_EQ(worker->IndexDirAdd(d), 2);

  EXPECT_EQ(Touched().front(), "Add /d");
  EXPECT_THAT(Touched(), UnorderedElementsAre("Add /d", "Add /d/f", "Add /d/e", "Add /d/e/empty",
                                              "Add /d/e/g"));
  EXPECT_EQ(worker->op_count, 5 + 3);  // entries, and once for each directory
}

TEST_F(WorkerWalksTest, AnUpdateTakesTheSameEntriesWithItsData) {
  const std::string d = Dir("d");
  File("d/e/g");

  EXPECT_EQ(worker->IndexDirUpdate(d, Flags()), 2);

  EXPECT_THAT(Touched(), UnorderedElementsAre("Upd /d", "Upd /d/e", "Upd /d/e/g"));
  for (const std::string& call : Changes()) {
    EXPECT_TRUE(call.ends_with(" {\"document\":false} {\"audio\":true}")) << call;
  }
  EXPECT_EQ(worker->op_count, 3 + 2);
}

TEST_F(WorkerWalksTest, AFileIsOneEntryAndACompleteWalk) {
  TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_DEBUG;
  const std::string f = File("f");

  EXPECT_EQ(worker->IndexDirAdd(f), 2);

  EXPECT_THAT(Touched(), ElementsAre("Add /f"));
  EXPECT_EQ(Log().back(), "IndexDirAdd: " + f);
}

TEST_F(WorkerWalksTest, AMissingPathIsCountedAndNotWalked) {
  TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_DEBUG;

  EXPECT_EQ(worker->IndexDirAdd(In("gone")), 1);

  EXPECT_THAT(Touched(), IsEmpty());
  EXPECT_EQ(worker->op_count, 1);
  EXPECT_THAT(Log(), IsEmpty());

  EXPECT_EQ(worker->IndexDirUpdate(In("gone"), Flags()), 1);

  EXPECT_THAT(Touched(), ElementsAre("Upd /gone"));  // an update has no filters
  EXPECT_EQ(worker->op_count, 1 + 2);
  EXPECT_EQ(script.CountLines("IndexDir"), 0U);
}

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

TEST_F(WorkerWalksTest, ARefusedMountPointIsOneEntryAndTheWalksResult) {
  const std::string d = Dir("d");
  File("d/f");
  script.Say("CanFullPathBeIndexed", d, 0);
  script.Say("TALOFSDirIsMntPoint", d, 1);

  EXPECT_EQ(worker->IndexDirAdd(d), 2);
  EXPECT_EQ(worker->IndexDirUpdate(d, Flags()), 2);
  EXPECT_THAT(Touched(), ElementsAre("Add /d", "Upd /d"));

  script.Fail("AddFSDocument");
  script.Fail("UpdateFSDocument");
  EXPECT_EQ(worker->IndexDirAdd(d), 1);
  EXPECT_EQ(worker->IndexDirUpdate(d, Flags()), 1);
  EXPECT_EQ(worker->op_count, 2);  // no count of the walk's own
}

TEST_F(WorkerWalksTest, AMountPointThatMayBeAnEntryIsWalkedAndNotAskedAbout) {
  const std::string d = Dir("d");
  File("d/f");
  script.Say("TALOFSDirIsMntPoint", d, 1);

  for (int which = 0; which < TAKING_IN; ++which) {
    script.Forget();
    EXPECT_EQ(Walk(which, d), 2);
    const std::string touch = TOUCHES[which];
    EXPECT_THAT(Touched(), ElementsAre(touch + "/d", touch + "/d/f"));
  }
  EXPECT_EQ(script.CallCount("TALOFSDirIsMntPoint"), 0);
}

TEST_F(WorkerWalksTest, ARefusedMountPointThatIsNoDirectoryIsNoEntry) {
  const std::string d = Dir("d");
  script.Say("CanFullPathBeIndexed", d, 0);
  script.Say("TALOFSDirIsMntPoint", d, 1);
  script.Say("IsDirExist", d, 0);
  for (int which = 0; which < TAKING_IN; ++which) {
    worker->op_count = 0;
    EXPECT_EQ(Walk(which, d), 2) << which;
    EXPECT_EQ(worker->op_count, 1) << which;
  }
  EXPECT_THAT(Touched(), IsEmpty());
}

TEST_F(WorkerWalksTest, AnyOtherRefusedDirectoryIsWalkedWithoutItsOwnEntry) {
  const std::string d = Dir("d");
  File("d/f");
  script.Say("CanFullPathBeIndexed", d, 0);

  EXPECT_EQ(worker->IndexDirAdd(d), 2);
  EXPECT_EQ(worker->IndexDirUpdate(d, Flags()), 2);

  EXPECT_THAT(Touched(), ElementsAre("Add /d/f", "Upd /d/f"));
  EXPECT_EQ(worker->op_count, 4);
}

TEST_F(WorkerWalksTest, ARefusedMountPointBelowIsOneEntryToo) {
  const std::string d = Dir("d");
  const std::string inner = Dir("d/m");
  File("d/m/f");
  script.Say("CanFullPathBeIndexed", inner, 0);
  script.Say("TALOFSDirIsMntPoint", inner, 1);

  for (int which = 0; which < TAKING_IN; ++which) {
    script.Forget();
    EXPECT_EQ(Walk(which, d), 2);
    const std::string touch = TOUCHES[which];
    EXPECT_THAT(Touched(), ElementsAre(touch + "/d", touch + "/d/m"));
  }
}

TEST_F(WorkerWalksTest, AMountPointInASnapshotIsWalked) {
  const std::string d = Dir("#snapshot");
  File("#snapshot/f");
  script.Say("CanFullPathBeIndexed", d, 0);
  script.Say("TALOFSDirIsMntPoint", d, 1);
  script.Say("QLIBFhsPathInSnapshot", d, 1);

  for (int which = 0; which < TAKING_IN; ++which) {
    script.Forget();
    EXPECT_EQ(Walk(which, d), 2);
    EXPECT_THAT(Touched(), ElementsAre(TOUCHES[which] + std::string("/#snapshot/f")));
  }
}

TEST_F(WorkerWalksTest, PreservedNamesAreNeverTouchedAtAnyDepth) {
  Dir("d/keep/kept");
  File("d/keep/f");
  File("d/e/keep");
  File("d/e/g");
  script.Say("IsSystemPreservedFileName", "keep", 1);
  for (int which = 0; which < WALKS; ++which) {
    script.Forget();
    if (which == 2) {
      script.Fail("IsFullPathIndexed");  // so that a clean descends
    }
    Walk(which, In("d"));
    EXPECT_EQ(Touched().size(), 3U);
    for (const std::string& call : script.Calls()) {
      EXPECT_EQ(call.find("/keep"), std::string::npos) << call;
    }
    EXPECT_THAT(script.Calls(), Not(Contains("IsSystemPreservedFileName .")));
    EXPECT_THAT(script.Calls(), Not(Contains("IsSystemPreservedFileName ..")));
  }
}

TEST_F(WorkerWalksTest, OnlyTheRuleDecidesWhetherAnEntryIsADirectory) {
  const std::string d = Dir("d");
  const std::string inner = Dir("d/e");
  File("d/e/f");
  script.Say("IsDirExist", inner, 0);
  script.Say("IsFileExist", inner, 1);

  worker->IndexDirAdd(d);

  EXPECT_THAT(Touched(), ElementsAre("Add /d", "Add /d/e"));
}

TEST_F(WorkerWalksTest, AnUpdateLeavesConfiguredFoldersAloneAndAnAddDoesNot) {
  const std::string d = Dir("d");
  File("d/own/f");
  File("d/own2/f");
  AddFolder(In("d/own"));
  worker->state = WORKER_IDLE;
  worker->ReloadSetting();
  worker->state = WORKER_RUNNING;
  script.Forget();

  worker->IndexDirUpdate(d, Flags());
  EXPECT_THAT(Touched(), ElementsAre("Upd /d", "Upd /d/own2", "Upd /d/own2/f"));

  script.Forget();
  worker->IndexDirAdd(d);
  EXPECT_THAT(Touched(), Contains("Add /d/own/f"));
}

TEST_F(WorkerWalksTest, AnUpdateThatBeginsAtAConfiguredFolderTakesIt) {
  File("f");
  worker->IndexDirUpdate(share_path, Flags());
  EXPECT_THAT(Touched(), ElementsAre("Upd ", "Upd /f"));
}

TEST_F(WorkerWalksTest, ACleanOfWhatIsAllIndexedChangesNothing) {
  File("d/f");
  File("d/e/g");

  EXPECT_EQ(worker->IndexDirClean(In("d")), 2);

  EXPECT_THAT(Touched(), IsEmpty());
  EXPECT_EQ(script.CallCount("IsDirExist"), 0);  // an indexed directory is not descended into
  EXPECT_EQ(worker->op_count, 0);
}

TEST_F(WorkerWalksTest, ACleanDeletesWhatIsNotCoveredAnyMoreParentsFirst) {
  File("d/f");
  File("d/e/g");
  File("d/kept/h");
  script.folders.clear();
  AddFolder(In("d/kept"));
  worker->state = WORKER_IDLE;
  worker->ReloadSetting();
  worker->state = WORKER_RUNNING;

  EXPECT_EQ(worker->IndexDirClean(In("d")), 2);

  const auto touched = Touched();
  EXPECT_THAT(touched, UnorderedElementsAre("Del /d", "Del /d/f", "Del /d/e", "Del /d/e/g"));
  EXPECT_EQ(touched.front(), "Del /d");
  EXPECT_LT(std::find(touched.begin(), touched.end(), "Del /d/e"),
            std::find(touched.begin(), touched.end(), "Del /d/e/g"));
  EXPECT_EQ(worker->op_count, 4);
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

TEST_F(WorkerWalksTest, ATrailingSlashIsPassedOnUnchanged) {
  File("d/f");
  worker->IndexDirAdd(In("d/"));
  EXPECT_THAT(Touched(), ElementsAre("Add /d/", "Add /d//f"));
}

TEST_F(WorkerWalksTest, ALongWalkCommitsOnItsWay) {
  File("d/f");
  worker->op_count = 1998;
  worker->IndexDirAdd(In("d"));
  EXPECT_EQ(script.CallCount("Commit"), 1);
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
