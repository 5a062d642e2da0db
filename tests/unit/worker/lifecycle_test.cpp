// SPDX-License-Identifier: GPL-2.0-or-later
#include <cerrno>

#include "base/mutex_guard.h"
#include "platform/log.h"
#include "unit/worker/worker_fixture.h"

namespace fileindexd {
namespace {

using scripted::EVERY_CALL;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;

using WorkerLifecycleTest = WorkerFixture;

TEST_F(WorkerLifecycleTest, ANewWorkerIsIdleAndKnowsItsShare) {
  const time_t before = time(nullptr);
  ASSERT_NE(Create(), nullptr);

  EXPECT_EQ(worker->state, WORKER_IDLE);
  EXPECT_EQ(worker->wd, -1);
  EXPECT_EQ(worker->op_count, 0);
  EXPECT_GE(worker->last_commit, before);
  EXPECT_EQ(worker->share_name, "s");
  EXPECT_EQ(worker->share_path, share_path);
  EXPECT_EQ(worker->queue_path, queue_path);
  EXPECT_EQ(worker->db_path, db_path);
  EXPECT_EQ(worker->folders.size(), 1U);
  EXPECT_TRUE(worker->indexer->IsOpen());
}

TEST_F(WorkerLifecycleTest, TheHostIsAskedInAFixedOrder) {
  Create();

  EXPECT_THAT(
      script.Calls(),
      ElementsAre("Folders::Load", "Folders::List s", "IsShareSpaceEnough s", "FILEIDXDBPathGet s",
                  "FILEIDXQueuePathGet s", "TALOShareGet s", "Indexer " + db_path + " 0"));
  EXPECT_THAT(Log(), IsEmpty());
}

TEST_F(WorkerLifecycleTest, WithoutADaemonThereIsNoWorker) {
  EXPECT_THROW(Worker("s", nullptr), int);
  EXPECT_THAT(Log(), ElementsAre("pDaemon is NULL"));
  EXPECT_THAT(script.Calls(), IsEmpty());
}

TEST_F(WorkerLifecycleTest, EachFailingStepEndsTheConstructionWithItsLines) {
  const struct {
    const char* operation;
    int error;
    std::vector<std::string> lines;
  } TABLE[] = {
      {"Folders::Load", 0, {"ReloadSetting failed"}},
      {"Folders::List", 0, {"ReloadSetting failed"}},
      {"pthread_mutex_init",
       EAGAIN,
       {"pthread_mutex_init failed, reason=Resource temporarily unavailable"}},
      {"IsShareSpaceEnough", 0, {"Share[s] is running out space"}},
      {"FILEIDXDBPathGet", -1, {"FILEIDXDBPathGet failed, share=s"}},
      {"FILEIDXQueuePathGet", -1, {"FILEIDXQueuePathGet failed, share=s"}},
      {"TALOShareGet", -1, {"TALOShareGet failed, share=s"}},
      {"operator new", ENOMEM, {"Failed to initiate indexer, dbpath=" + db_path}},
      {"Indexer", 0, {"Failed to initiate indexer, dbpath=" + db_path}},
  };
  for (const auto& row : TABLE) {
    script.Forget();
    script.Answer(row.operation, script.CallCount(row.operation) + 1, row.error);
    EXPECT_EQ(Create(), nullptr) << row.operation;
    EXPECT_EQ(Log(), row.lines) << row.operation;
  }
}

TEST_F(WorkerLifecycleTest, AShareWithoutSpaceIsFlaggedAndGetsNoWorker) {
  script.Fail("IsShareSpaceEnough");

  EXPECT_EQ(Create(), nullptr);

  EXPECT_TRUE(script.no_space.contains("s"));
  EXPECT_THAT(script.CallsOf({"ShareSetNoSpace"}), ElementsAre("ShareSetNoSpace s true"));
}

TEST_F(WorkerLifecycleTest, AFlagThatCannotBeStoredIsTold) {
  script.Fail("IsShareSpaceEnough");
  script.Fail("ShareSetNoSpace");

  EXPECT_EQ(Create(), nullptr);
  EXPECT_THAT(Log(), ElementsAre("Share[s] is running out space", "ShareSetNoSpace failed"));
}

TEST_F(WorkerLifecycleTest, AnAbsentDatabaseIsMadeAnewAndAReindexQueued) {
  folder.Write("db/old", "rest");
  script.Fail("Indexer", 1);
  script.index_error = 3;

  ASSERT_NE(Create(), nullptr);

  EXPECT_THAT(
      script.CallsOf({"Indexer", "QLIBCExec", "AddCustomEvent"}),
      ElementsAre("Indexer " + db_path + " 0", "QLIBCExec /bin/rm -rf " + db_path,
                  "AddCustomEvent 65536 " + share_path + " null", "Indexer " + db_path + " 0"));
  EXPECT_FALSE(folder.Exists("db"));
  EXPECT_TRUE(worker->indexer->IsOpen());
  EXPECT_THAT(Log(), ElementsAre("Failed to initiate indexer due to path not found, try re-create "
                                 "db"));
}

TEST_F(WorkerLifecycleTest, ASecondFailureToOpenIsFinal) {
  script.Fail("Indexer");
  script.index_error = 3;

  EXPECT_EQ(Create(), nullptr);

  EXPECT_EQ(script.CallCount("Indexer"), 2);
  EXPECT_THAT(Log(), ElementsAre(HasSubstr("path not found"),
                                 "Failed to initiate indexer, dbpath=" + db_path));
}

TEST_F(WorkerLifecycleTest, AnyOtherErrorLeavesTheDatabaseAlone) {
  for (const int error : {0, 1, 2, 4, -1}) {
    script.Forget();
    script.index_error = error;
    script.Fail("Indexer");
    EXPECT_EQ(Create(), nullptr) << error;
    EXPECT_THAT(script.CallsOf({"QLIBCExec", "AddCustomEvent"}), IsEmpty()) << error;
  }
}

TEST_F(WorkerLifecycleTest, ThePathBufferHolds4095Characters) {
  script.shares[0].queue_path = "/" + std::string(4095, 'q');
  EXPECT_EQ(Create(), nullptr);

  script.shares[0].queue_path.pop_back();
  ASSERT_NE(Create(), nullptr);
  EXPECT_EQ(worker->queue_path.size(), 4095U);
}

TEST_F(WorkerLifecycleTest, TheCreatedBlockIsWrittenAtDebugLevelWithALineForEachFolder) {
  AddFolder(In("sub"));
  TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_DEBUG;
  Create();

  EXPECT_THAT(Log(),
              ElementsAre("Worker[s] reload setting", "Worker[s] created:",
                          "    queue path: " + queue_path, "    db path:    " + db_path,
                          "    folder:     {\"document\":false,\"path\":\"" + share_path + "\"}",
                          "    folder:     {\"document\":false,\"path\":\"" + In("sub") + "\"}",
                          "--------------------------------------"));
}

TEST_F(WorkerLifecycleTest, TheCreatedBlockNamesNoFolderWhenThereIsNone) {
  script.folders.clear();
  TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_DEBUG;
  Create();

  EXPECT_EQ(script.CountLines("    folder:"), 0U);
  EXPECT_EQ(script.CountLines("Worker[s] created:"), 1U);
}

TEST_F(WorkerLifecycleTest, TheDestructorReleasesTheIndexerWithoutCommit) {
  Create();
  Delete();

  EXPECT_EQ(script.live_indexers, indexers_before);
  EXPECT_EQ(script.CallCount("Commit"), 0);
}

TEST_F(WorkerLifecycleTest, RunStartsNothingUnlessTheWorkerIsIdle) {
  Create();
  script.Answer("pthread_create", EVERY_CALL, EAGAIN);
  for (const int state : {1, 2, 3}) {
    worker->state = state;
    EXPECT_TRUE(worker->Run());
    EXPECT_TRUE(worker->Respawn());
    ExpectMutexesFree();
  }
  EXPECT_EQ(script.CallCount("pthread_create"), 0);
}

TEST_F(WorkerLifecycleTest, AThreadThatCannotBeMadeLeavesTheWorkerIdle) {
  Create();
  script.Answer("pthread_create", 1, EAGAIN);

  EXPECT_FALSE(worker->Run());

  EXPECT_EQ(worker->state, WORKER_IDLE);
  EXPECT_THAT(Log(), ElementsAre("pthread_create failed, share=s"));
  ExpectMutexesFree();
  RunThread();
  EXPECT_EQ(worker->state, WORKER_FINISHED);
}

TEST_F(WorkerLifecycleTest, RespawnIsToldAtDebugLevelOnly) {
  Create();
  worker->state = WORKER_RUNNING;
  worker->Respawn();
  EXPECT_THAT(Log(), IsEmpty());

  TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_DEBUG;
  worker->Respawn();
  EXPECT_THAT(Log(), ElementsAre("Worker[s] respawned"));
}

TEST_F(WorkerLifecycleTest, AwaitStartReturnsOnlyWhenTheThreadHasMarkedItselfRunning) {
  Create();
  script.Block("ShareIsNeedReindex");
  ASSERT_TRUE(worker->Run());
  running = true;

  worker->AwaitStart();

  EXPECT_EQ(worker->state, WORKER_RUNNING);
}

TEST_F(WorkerLifecycleTest, SettingsAreReadAnewAtOnceWithoutAThread) {
  Create();
  AddFolder(In("sub"));

  EXPECT_TRUE(worker->ReloadSetting());

  EXPECT_EQ(worker->folders.size(), 2U);
}

TEST_F(WorkerLifecycleTest, SettingsThatCannotBeReadLeaveTheOldOnes) {
  Create();
  AddFolder(In("sub"));
  for (const char* operation : {"Folders::Load", "Folders::List"}) {
    script.Fail(operation, script.CallCount(operation) + 1);
    EXPECT_FALSE(worker->ReloadSetting()) << operation;
    EXPECT_EQ(worker->folders.size(), 1U) << operation;
  }
}

TEST_F(WorkerLifecycleTest, ARunningThreadPutsNewSettingsInAtItsNextOperation) {
  Create();
  AddFolder(In("sub"));
  worker->state = WORKER_RUNNING;

  EXPECT_TRUE(worker->ReloadSetting());
  EXPECT_EQ(worker->folders.size(), 1U);
  AddFolder(In("sub2"));
  EXPECT_TRUE(worker->ReloadSetting());  // the last one counts, the one before is freed

  worker->DelDocument(In("x"));
  EXPECT_EQ(worker->folders.size(), 3U);
}

TEST_F(WorkerLifecycleTest, SettingsThatNobodyTookAreFreedWithTheWorker) {
  Create();
  worker->state = WORKER_RUNNING;
  EXPECT_TRUE(worker->ReloadSetting());
  Delete();  // a leak shows in the sanitizer's report
}

TEST_F(WorkerLifecycleTest, AReloadWithoutThreadIsNotUndoneByAnOlderOneOnItsWay) {
  Create();
  worker->state = WORKER_FINISHED;
  EXPECT_TRUE(worker->ReloadSetting());
  worker->state = WORKER_IDLE;
  AddFolder(In("sub"));
  EXPECT_TRUE(worker->ReloadSetting());

  worker->DelDocument(In("x"));
  EXPECT_EQ(worker->folders.size(), 2U);
}

TEST_F(WorkerLifecycleTest, WithoutAPauseTheMutexIsNotTouched) {
  Create();
  const MutexGuard held(&daemon.pause_mutex);

  worker->WaitWhilePaused();  // would hang
  daemon.resume_time = 1;     // a pause that has passed
  worker->WaitWhilePaused();

  EXPECT_THAT(Log(), IsEmpty());
}

TEST_F(WorkerLifecycleTest, APauseHoldsTheThreadBeforeItReadsTheQueueAndItsEndIsTold) {
  Create();
  daemon.resume_time = 0;
  script.Run("pthread_cond_wait", EVERY_CALL, [] {});  // counted from now on
  Queue({Event(64, In("x"))});
  ASSERT_TRUE(worker->Run());
  running = true;

  ASSERT_TRUE(script.AwaitCount("pthread_cond_wait", 1));
  {
    const MutexGuard guard(&daemon.pause_mutex);
    EXPECT_TRUE(folder.Exists("queue/TALO@file_index_queue"));
    pthread_cond_broadcast(&daemon.pause_cond);  // the pause holds: it waits again
  }
  ASSERT_TRUE(script.AwaitCount("pthread_cond_wait", 2));
  {
    const MutexGuard guard(&daemon.pause_mutex);
    EXPECT_THAT(Log(), IsEmpty());
    daemon.resume_time = -1;
    pthread_cond_broadcast(&daemon.pause_cond);
  }
  JoinThread(false);

  EXPECT_THAT(Log(), ElementsAre("In cleaner"));
  EXPECT_FALSE(folder.Exists("queue/TALO@file_index_queue"));
  ExpectMutexesFree();
}

}  // namespace
}  // namespace fileindexd
