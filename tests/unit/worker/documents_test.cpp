// SPDX-License-Identifier: GPL-2.0-or-later
#include <cerrno>
#include <iterator>
#include <thread>

#include "base/mutex_guard.h"
#include "platform/log.h"
#include "unit/worker/worker_fixture.h"

namespace fileindexd {
namespace {

using scripted::EVERY_CALL;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::StartsWith;

class WorkerDocumentsTest : public WorkerFixture {
 protected:
  WorkerDocumentsTest() {
    path = folder.Write("share/f", "");
    Create();
    script.Forget();
  }

  void DropIndexer() {
    delete worker->indexer;
    worker->indexer = nullptr;
    script.Forget();
  }

  static Json::Value Flags() {
    Json::Value flags(Json::objectValue);
    flags["photo"] = true;
    return flags;
  }

  static constexpr int OPERATIONS = 8;

  void Operate(int nth) {
    worker->state = WORKER_RUNNING;  // or a walk ends at once
    switch (nth) {
      case 0:
        worker->AddDocument(path);
        break;
      case 1:
        worker->UpdateDocument(path, Flags());
        break;
      case 2:
        worker->DelDocument(path);
        break;
      case 3:
        worker->DelDirectory(path, false);
        break;
      case 4:
        worker->ReindexDirectory(path);
        break;
      case 5:
        worker->IndexDirAdd(path);
        break;
      case 6:
        worker->IndexDirUpdate(path, Flags());
        break;
      default:
        script.Fail("IsFullPathIndexed");
        worker->IndexDirClean(path);
        break;
    }
  }

  std::string path;
};

TEST_F(WorkerDocumentsTest, AnAdditionAsksItsFiltersInOrderAndIsCountedOnce) {
  EXPECT_EQ(worker->AddDocument(path), 2);

  EXPECT_THAT(script.Calls(),
              ElementsAre("IsDirExist " + path, "IsFileExist " + path, "IsFullPathIndexed " + path,
                          "IsSkipIndex " + path, "GetMostSuitableCfg " + path,
                          "AddFSDocument " + path + " {\"document\":false}"));
  EXPECT_EQ(worker->op_count, 1);
  EXPECT_THAT(Log(), IsEmpty());
}

TEST_F(WorkerDocumentsTest, ADirectoryIsAddedLikeAFile) {
  EXPECT_EQ(worker->AddDocument(folder.MakeDir("share/d")), 2);
  EXPECT_EQ(script.CallCount("IsFileExist"), 0);
}

TEST_F(WorkerDocumentsTest, WhatIsFilteredOutIsNotAddedAndNotTold) {
  const struct {
    const char* operation;
    int answer;
  } TABLE[] = {{"IsFileExist", 0}, {"IsFullPathIndexed", 0}, {"IsSkipIndex", 1}};
  for (const auto& row : TABLE) {
    script.Forget();
    script.Answer(row.operation, script.CallCount(row.operation) + 1, row.answer);
    EXPECT_EQ(worker->AddDocument(path), 1) << row.operation;
    EXPECT_THAT(Changes(), IsEmpty()) << row.operation;
  }
  EXPECT_EQ(worker->op_count, 0);
  EXPECT_THAT(Log(), IsEmpty());
}

TEST_F(WorkerDocumentsTest, APathThatIsGoneIsNotAdded) {
  EXPECT_EQ(worker->AddDocument(In("gone")), 1);
  EXPECT_THAT(script.Calls(), ElementsAre("IsDirExist " + In("gone"), "IsFileExist " + In("gone")));
  EXPECT_THAT(Log(), IsEmpty());
}

TEST_F(WorkerDocumentsTest, AnUpdateHasNoFiltersAndPassesItsDataOn) {
  EXPECT_EQ(worker->UpdateDocument(In("gone"), Flags()), 2);

  EXPECT_THAT(script.Calls(), ElementsAre("GetMostSuitableCfg " + In("gone"),
                                          "UpdateFSDocument " + In("gone") +
                                              " {\"document\":false} {\"photo\":true}"));
  EXPECT_EQ(worker->op_count, 1);
}

TEST_F(WorkerDocumentsTest, DeletionsPassTheirMode) {
  EXPECT_EQ(worker->DelDocument("/nowhere"), 2);
  EXPECT_EQ(worker->DelDirectory(path, false), 2);
  EXPECT_EQ(worker->DelDirectory(path, true), 2);

  EXPECT_THAT(script.Calls(),
              ElementsAre("DelFSDocument /nowhere 0", "DelFSDocument " + path + " 1",
                          "DelFSDocument " + path + " 2"));
  EXPECT_EQ(worker->op_count, 3);
}

TEST_F(WorkerDocumentsTest, AFailureIsToldWithItsCodeButNotThatOfAnUpdate) {
  script.index_error = 7;
  for (const char* operation : {"AddFSDocument", "UpdateFSDocument", "DelFSDocument"}) {
    script.Fail(operation);
  }

  EXPECT_EQ(worker->AddDocument(path), 1);
  EXPECT_EQ(worker->UpdateDocument(path, Flags()), 1);
  EXPECT_EQ(worker->DelDocument(path), 1);
  EXPECT_EQ(worker->DelDirectory(path, false), 1);
  EXPECT_EQ(worker->DelDirectory(path, true), 1);

  EXPECT_THAT(Log(), ElementsAre("AddFSDocument failed, path=" + path + ", code=7",
                                 "DelFSDocument failed, path=" + path + ", code=7",
                                 "DelDocument failed, mode=1, path=" + path + ", code=7",
                                 "DelDocument failed, mode=2, path=" + path + ", code=7"));
  EXPECT_EQ(worker->op_count, 0);
  EXPECT_EQ(worker->state, WORKER_IDLE);
}

TEST_F(WorkerDocumentsTest, WithoutAnIndexerNothingIsDoneOrTold) {
  DropIndexer();

  EXPECT_EQ(worker->AddDocument(path), 1);
  EXPECT_EQ(worker->UpdateDocument(path, Flags()), 1);
  EXPECT_EQ(worker->DelDocument(path), 1);
  EXPECT_EQ(worker->DelDirectory(path, false), 1);

  EXPECT_EQ(script.CallCount("GetMostSuitableCfg"), 0);
  EXPECT_THAT(Log(), IsEmpty());
}

TEST_F(WorkerDocumentsTest, SuccessIsToldAtDebugLevelOnly) {
  TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_DEBUG;
  worker->AddDocument(path);
  worker->UpdateDocument(path, Flags());
  worker->DelDocument(path);
  worker->DelDirectory(path, false);
  worker->DelDirectory(path, true);

  EXPECT_THAT(Log(),
              ElementsAre("[s] Document[" + path + "] added", "[s] Document[" + path + "] updated",
                          "[s] Document[" + path + "] deleted",
                          "[s] Directory[" + path + "] deleted, mode=1",
                          "[s] Directory[" + path + "] deleted, mode=2"));
}

TEST_F(WorkerDocumentsTest, AChangeIsCountedBetweenTheIndexersCallAndItsLine) {
  TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_DEBUG;
  const struct {
    const char* call;
    const char* told;
  } TABLE[] = {{"AddFSDocument ", "[s] Document[%] added"},
               {"UpdateFSDocument ", "[s] Document[%] updated"},
               {"DelFSDocument ", "[s] Document[%] deleted"},
               {"DelFSDocument ", "[s] Directory[%] deleted, mode=1"}};
  for (int nth = 0; nth < static_cast<int>(std::size(TABLE)); ++nth) {
    std::string told = TABLE[nth].told;
    told.replace(told.find('%'), 1, path);
    worker->op_count = 1999;  // so that it commits
    script.Forget();

    Operate(nth);

    EXPECT_THAT(Changes(), ElementsAre(StartsWith(TABLE[nth].call), "Commit"));
    EXPECT_THAT(Log(), ElementsAre("Worker[s] fileindex db committed", told));
  }
}

TEST_F(WorkerDocumentsTest, TheFolderThatCoversBestGivesTheConfiguration) {
  AddFolder(In("sub"));
  script.folders.back().document = true;
  worker->ReloadSetting();
  script.Forget();
  const std::string inner = folder.Write("share/sub/f", "");

  worker->AddDocument(inner);

  EXPECT_THAT(Changes(), ElementsAre("AddFSDocument " + inner + " {\"document\":true}"));
}

TEST_F(WorkerDocumentsTest, OnlyANameOfASnapshotIsAskedAbout) {
  const struct {
    const char* path;
    int answer;
    bool expected;
    int asked;
  } TABLE[] = {
      {"/v/s/plain", 1, false, 0},
      {"/v/s/snapshot/f", 1, false, 0},
      {"/v/s/#Snapshot/f", 1, false, 0},
      {"/v/s/#snapshot/f", 1, true, 1},
      {"/v/s/a#snapshotb", 1, true, 1},
      {"#snapshot", 1, true, 1},
      {"/v/s/#snapshot/outside", 0, false, 1},
      {"/v/s/#snapshot/error", -1, false, 1},
  };
  for (const auto& row : TABLE) {
    script.Forget();
    script.Say("QLIBFhsPathInSnapshot", row.path, row.answer);
    EXPECT_EQ(worker->IsSnapshotPath(row.path), row.expected) << row.path;
    EXPECT_EQ(static_cast<int>(script.Calls().size()), row.asked) << row.path;
  }
}

TEST_F(WorkerDocumentsTest, OnlyOneIsAMountPoint) {
  const std::vector<std::pair<int, bool>> TABLE = {{1, true}, {0, false}, {-1, false}, {2, false}};
  for (const auto& [answer, expected] : TABLE) {
    script.Say("TALOFSDirIsMntPoint", "/v/s/m", answer);
    EXPECT_EQ(worker->IsMountPoint("/v/s/m"), expected) << answer;
  }
}

// Taken by another, the mutex of the filters keeps each of them from its call.
TEST_F(WorkerDocumentsTest, EachFilterHoldsThePlatformMutexDuringItsCall) {
  int error = 0;
  const auto try_lock = [&] { error = pthread_mutex_trylock(&daemon.platform_mutex); };
  for (const char* operation : {"IsSkipIndex", "TALOFSDirIsMntPoint", "QLIBFhsPathInSnapshot"}) {
    script.Run(operation, 1, try_lock);
  }

  worker->IsSkipPath("/p");
  EXPECT_EQ(error, EBUSY);
  error = 0;
  worker->IsMountPoint("/p");
  EXPECT_EQ(error, EBUSY);
  error = 0;
  worker->IsSnapshotPath("/#snapshot");
  EXPECT_EQ(error, EBUSY);
  ExpectMutexesFree();
}

TEST_F(WorkerDocumentsTest, NoLockIsHeldDuringAnIndexerCall) {
  for (const char* operation : {"AddFSDocument", "UpdateFSDocument", "DelFSDocument", "Commit"}) {
    script.Run(operation, EVERY_CALL, [&] { ExpectMutexesFree(); });
  }

  worker->AddDocument(path);
  worker->UpdateDocument(path, Flags());
  worker->DelDocument(path);
  worker->CommitIndex();

  EXPECT_EQ(Changes().size(), 4U);
}

TEST_F(WorkerDocumentsTest, APauseHoldsEachOperationBeforeItsFirstFilter) {
  script.Run("pthread_cond_wait", EVERY_CALL, [] {});  // counted from now on
  for (int nth = 0; nth < OPERATIONS; ++nth) {
    script.Forget();
    daemon.resume_time = 0;
    const int waits = script.CallCount("pthread_cond_wait");
    std::thread waiting([&] { Operate(nth); });
    ASSERT_TRUE(script.AwaitCount("pthread_cond_wait", waits + 1));
    {
      const MutexGuard guard(&daemon.pause_mutex);  // free: the thread waits
      EXPECT_THAT(script.Calls(), IsEmpty()) << nth;
      daemon.resume_time = -1;
      pthread_cond_broadcast(&daemon.pause_cond);
    }
    waiting.join();
    EXPECT_FALSE(script.Calls().empty()) << nth;
    EXPECT_THAT(Log(), ElementsAre("In cleaner")) << nth;
  }
}

}  // namespace
}  // namespace fileindexd
