// SPDX-License-Identifier: GPL-2.0-or-later
// A Worker whose thread is cancelled while it is held inside one operation of the host: the process
// lives, nothing leaks, every lock is free, and the Worker runs again.
#include <filesystem>

#include "base/mutex_guard.h"
#include "platform/log.h"
#include "unit/worker/worker_fixture.h"

namespace fileindexd {
namespace {

using scripted::EVERY_CALL;
using ::testing::ElementsAre;

class WorkerCancelTest : public WorkerFixture {
 protected:
  WorkerCancelTest() {
    folder.Write("share/d/f", "");
    const std::string mount = folder.MakeDir("share/d/#snapshot");
    script.Say("CanFullPathBeIndexed", mount, 0);
    script.Say("TALOFSDirIsMntPoint", mount, 1);
    folder.MakeDir("share/d/own");
    AddFolder(In("d/own"));
    const std::string flags = R"("data":{"photo":true})";
    Queue({Event(64, In("d/f")), Event(128, In("x")), Event(131072, In("d"), flags),
           Event(131072, In("d"), flags), Event(256, In("d"), "\"path_old\":\"/old\""),
           "malformed"});
    Create();
    descriptors = scripted::OpenDescriptors();
  }

  void CancelInside(const std::string& operation) {
    script.Block(operation, script.CallCount(operation) + 1);
    ASSERT_TRUE(worker->Run());
    running = true;
    ASSERT_TRUE(script.AwaitBlocked());
    JoinThread(true);
  }

  // A second burst goes through to its end.
  void ExpectUsable() {
    ExpectMutexesFree();
    EXPECT_EQ(scripted::OpenDescriptors(), descriptors);
    EXPECT_EQ(script.live_indexers - indexers_before, worker->indexer == nullptr ? 0 : 1);
    script.Release();
    Queue({Event(128, In("y"))});
    RunThread();
    EXPECT_EQ(worker->state, WORKER_FINISHED);
    EXPECT_FALSE(folder.Exists("queue/TALO@file_index_queue.tmp"));
    Delete();
    EXPECT_EQ(script.live_indexers, indexers_before);
  }

  int descriptors = 0;
};

class WorkerCancelInTest : public WorkerCancelTest,
                           public ::testing::WithParamInterface<const char*> {};

TEST_P(WorkerCancelInTest, TheWorkerCanBeUsedAgain) {
  CancelInside(GetParam());
  ExpectUsable();
}

INSTANTIATE_TEST_SUITE_P(
    EveryOperation, WorkerCancelInTest,
    ::testing::Values("ShareIsNeedReindex", "StringStartWith", "RetrieveBoolFromJsonObj",
                      "IsDirExist", "IsFileExist", "IsFullPathIndexed", "IsSkipIndex",
                      "GetMostSuitableCfg", "GetFullPath", "CanFullPathBeIndexed",
                      "IsSystemPreservedFileName", "TALOFSDirIsMntPoint", "QLIBFhsPathInSnapshot",
                      "AddFSDocument", "UpdateFSDocument", "DelFSDocument", "Commit", "Indexer",
                      "IsShareSpaceEnough", "QLIBCExec", "WriteLog", "opendir", "readdir64_r"),
    [](const auto& tested) { return std::string(tested.param); });

TEST_F(WorkerCancelTest, InsideTheReindexOfAShare) {
  script.need_reindex.insert("s");
  CancelInside("ShareSetNeedReindex");
  ExpectUsable();
}

TEST_F(WorkerCancelTest, InsideTheFlagOfAShareWithoutSpace) {
  script.Fail("IsShareSpaceEnough", 2);
  CancelInside("ShareSetNoSpace");
  worker->state = WORKER_IDLE;
  ExpectUsable();
}

TEST_F(WorkerCancelTest, InsideAFailedOperationsErrorCode) {
  script.Fail("DelFSDocument", 1);
  CancelInside("GetError");
  ExpectUsable();
}

TEST_F(WorkerCancelTest, InsideAnyLogLineOfADebugRun) {
  TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_DEBUG;
  constexpr int LINES = 20;  // each run below writes more
  for (int nth = 1; nth <= LINES; ++nth) {
    script.Block("WriteLog", script.CallCount("WriteLog") + nth);
    std::filesystem::remove(queue_path + ".tmp");
    Queue({Event(64, In("d/f")), Event(65536, In("d")), Event(128, In("x")), "malformed"});
    ASSERT_TRUE(worker->Run());
    running = true;
    ASSERT_TRUE(script.AwaitBlocked());
    JoinThread(true);
    script.Release();
    ExpectMutexesFree();
    ASSERT_EQ(scripted::OpenDescriptors(), descriptors) << nth;
    ASSERT_EQ(script.live_indexers - indexers_before, worker->indexer == nullptr ? 0 : 1) << nth;
  }
  TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_ERROR;
  ExpectUsable();
}

TEST_F(WorkerCancelTest, InAPauseTheCleanUpHandlerIsToldAndFreesTheMutex) {
  daemon.resume_time = 0;
  script.Run("pthread_cond_wait", EVERY_CALL, [] {});
  ASSERT_TRUE(worker->Run());
  running = true;
  ASSERT_TRUE(script.AwaitCount("pthread_cond_wait", 1));
  { const MutexGuard waits(&daemon.pause_mutex); }

  JoinThread(true);

  EXPECT_THAT(Log(), ElementsAre("In cleaner"));
  daemon.resume_time = -1;
  ExpectUsable();
}

TEST_F(WorkerCancelTest, AtTheEndOfAPauseInsideItsLogLine) {
  daemon.resume_time = 0;
  script.Run("pthread_cond_wait", EVERY_CALL, [] {});
  script.Block("WriteLog", 1);
  ASSERT_TRUE(worker->Run());
  running = true;
  ASSERT_TRUE(script.AwaitCount("pthread_cond_wait", 1));
  {
    const MutexGuard guard(&daemon.pause_mutex);
    daemon.resume_time = -1;
    pthread_cond_broadcast(&daemon.pause_cond);
  }
  ASSERT_TRUE(script.AwaitBlocked());

  JoinThread(true);

  ExpectUsable();
}

}  // namespace
}  // namespace fileindexd
