// SPDX-License-Identifier: GPL-2.0-or-later
#include <cerrno>
#include <ctime>
#include <filesystem>
#include <thread>

#include "base/mutex_guard.h"
#include "unit/daemon/daemon_fixture.h"

namespace fileindexd {
namespace {

using scripted::EVERY_CALL;
using ::testing::AllOf;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::Ge;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Le;

class RegistryTest : public DaemonFixture {
 protected:
  std::vector<std::string> Names() {
    std::vector<std::string> names;
    for (const auto& entry : daemon.workers) {
      names.push_back(entry.first);
    }
    return names;
  }

  static int64_t Now() {
    timespec now = {};
    clock_gettime(CLOCK_REALTIME, &now);
    return now.tv_sec;
  }
};

TEST_F(RegistryTest, EachShareWithFoldersGetsOneWorkerInOrderOfNames) {
  AddFolder("b", SharePath("b"));
  AddFolder("a", SharePath("a") + "/x");
  AddFolder("a", SharePath("a") + "/y");
  ASSERT_TRUE(daemon.SetupInotify());
  script.resume_time = 77;

  EXPECT_TRUE(daemon.SetupWorkers());

  EXPECT_THAT(Names(), ElementsAre("a", "b"));
  EXPECT_THAT(
      script.CallsOf({"IndexMgr::List", "CanShareBeIndexed", "GetPauseInfo"}),
      ElementsAre("IndexMgr::List", "CanShareBeIndexed a", "CanShareBeIndexed b", "GetPauseInfo"));
  EXPECT_EQ(daemon.resume_time, 77);
  EXPECT_EQ(daemon.workers["a"]->state, WORKER_IDLE);
  EXPECT_GE(daemon.workers["a"]->wd, 0);
  EXPECT_NE(daemon.workers["a"]->wd, daemon.workers["b"]->wd);
  EXPECT_EQ(daemon.workers["a"]->platform_mutex, &daemon.platform_mutex);
  EXPECT_EQ(daemon.workers["a"]->pause_mutex, &daemon.pause_mutex);
  EXPECT_EQ(daemon.workers["a"]->pause_cond, &daemon.pause_cond);
}

TEST_F(RegistryTest, OneBadFolderOrShareDoesNotStopTheOthers) {
  AddFolder("x", "/nowhere");
  AddFolder("a", SharePath("a"));
  AddFolder("b", SharePath("b"));
  script.Say("CanShareBeIndexed", "a", 0);

  EXPECT_TRUE(daemon.SetupWorkers());

  EXPECT_THAT(Names(), ElementsAre("b"));
  EXPECT_THAT(Log(),
              ElementsAre("Failed to get share name from path: /nowhere",
                          "Skip share[a] which cannot be indexed", "CreateWorker failed, share=a"));
}

TEST_F(RegistryTest, SetUpFailsWhereItMust) {
  const struct {
    const char* operation;
    int nth;
    int answer;
    const char* line;
  } TABLE[] = {
      {"pthread_mutex_init", 1, ENOMEM, "pthread_mutex_init failed"},
      {"pthread_mutex_init", 2, ENOMEM, "pthread_mutex_init failed"},
      {"pthread_cond_init", 1, ENOMEM, "pthread_cond_init failed"},
      {"IndexMgr::List", 1, 0, "Failed to list folders"},
      {"GetPauseInfo", 1, 0, "Failed to get pause status"},
  };
  for (const auto& row : TABLE) {
    script.Reset();
    script.Answer(row.operation, row.nth, row.answer);
    Daemon other;
    EXPECT_FALSE(other.SetupWorkers()) << row.operation;
    EXPECT_THAT(Log(), ElementsAre(row.line));
    other.CleanResource();
  }
}

TEST_F(RegistryTest, CreatingARegisteredWorkerChangesNothing) {
  SetUpShares({"a"});
  Worker* before = daemon.workers["a"];

  EXPECT_TRUE(daemon.CreateWorker("a", true));

  EXPECT_EQ(daemon.workers["a"], before);
  EXPECT_EQ(before->state, WORKER_IDLE);
  EXPECT_THAT(script.Calls(), IsEmpty());
}

TEST_F(RegistryTest, EachFailureOfACreationHasItsLineAndReleasesTheRecord) {
  SetUpShares({});
  const struct {
    const char* operation;
    std::vector<std::string> lines;
  } TABLE[] = {
      {"TALOShareGet", {"TALOShareGet failed, share=a"}},
      {"CanShareBeIndexed", {"Skip share[a] which cannot be indexed"}},
      {"Folders::Load", {"ReloadSetting failed", "Failed to initiate worker for share=a"}},
  };
  for (const auto& row : TABLE) {
    script.Forget();
    script.Fail(row.operation, script.CallCount(row.operation) + 1);
    EXPECT_FALSE(daemon.CreateWorker("a", true)) << row.operation;
    EXPECT_EQ(Log(), row.lines);
    EXPECT_EQ(script.live_records, 0);
  }
  EXPECT_TRUE(daemon.workers.empty());
}

TEST_F(RegistryTest, AConstructionThatThrowsAnythingIsAFailedCreation) {
  SetUpShares({});
  script.Run("IsShareSpaceEnough", 1, [] { throw std::runtime_error("host"); });

  EXPECT_FALSE(daemon.CreateWorker("a", false));
  EXPECT_THAT(Log(), ElementsAre("Failed to initiate worker for share=a"));
  EXPECT_EQ(script.live_records, 0);
}

TEST_F(RegistryTest, AWorkerThatDoesNotRunStaysRegistered) {
  SetUpShares({});
  script.Answer("pthread_create", 1, EAGAIN);

  EXPECT_FALSE(daemon.CreateWorker("a", true));

  EXPECT_THAT(Log(), ElementsAre("pthread_create failed, share=a", "Failed to run worker[a]"));
  EXPECT_EQ(daemon.workers["a"]->state, WORKER_IDLE);
}

TEST_F(RegistryTest, AFolderThatCannotBeWatchedLeavesMinusOne) {
  SetUpShares({});
  script.shares[0].queue_path = "/nowhere/TALO@file_index_queue";

  EXPECT_TRUE(daemon.CreateWorker("a", false));
  EXPECT_EQ(daemon.workers["a"]->wd, -1);
}

TEST_F(RegistryTest, WorkersThatDoNotRunAreToldAndTheOthersRun) {
  SetUpShares({"a", "b"});
  daemon.workers["0"] = nullptr;
  script.Answer("pthread_create", 1, EAGAIN);

  daemon.RunWorkers();
  AwaitFinished("b");

  EXPECT_THAT(Log(), ElementsAre("Run worker[0] failed", "pthread_create failed, share=a",
                                 "Run worker[a] failed"));
  daemon.workers.erase("0");
}

TEST_F(RegistryTest, StoppingJoinsAThreadThatEndsByItself) {
  TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_DEBUG;
  SetUpShares({"a"});
  daemon.RunWorkers();
  AwaitFinished("a");

  EXPECT_TRUE(daemon.StopWorkerThread(daemon.workers["a"]));

  EXPECT_EQ(daemon.workers["a"]->state, WORKER_IDLE);
  EXPECT_EQ(Log().back(), "Worker[a] cancelled");
}

// The wait of 50 s is cut short: the thread has not ended then. Its waits end at a time of day.
TEST_F(RegistryTest, AThreadThatDoesNotEndIsCancelledAndItsWorkerDeleted) {
  SetUpShares({"a"});
  WriteQueue("a", "/x");
  script.Block("DelFSDocument");
  daemon.RunWorkers();
  ASSERT_TRUE(script.AwaitBlocked());
  script.Answer("pthread_timedjoin_np", 1, 0);
  TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_DEBUG;
  const int64_t before = Now();

  daemon.DeleteWorker("a");

  const int64_t after = Now();
  EXPECT_TRUE(daemon.workers.empty());
  EXPECT_THAT(Log(), ElementsAre("Worker[a] deleted",
                                 "Failed to wait thread[a], reason=Connection timed out",
                                 "Worker[a] cancelled"));
  EXPECT_THAT(
      script.waits["pthread_timedjoin_np"],
      ElementsAre(AllOf(Ge(before + 50), Le(after + 50)), AllOf(Ge(before + 2), Le(after + 2))));
}

TEST_F(RegistryTest, AThreadThatOutlivesBothWaitsLosesItsWorkerWhichIsNeverFreed) {
  SetUpShares({"a"});
  WriteQueue("a", "/x");
  script.Block("~Indexer", script.CallCount("~Indexer") + 1);  // no cancellation there
  daemon.RunWorkers();
  ASSERT_TRUE(script.AwaitBlocked());
  Worker* lost = daemon.workers["a"];
  script.Answer("pthread_timedjoin_np", EVERY_CALL, 0);

  daemon.DeleteWorker("a");

  EXPECT_TRUE(daemon.workers.empty());
  EXPECT_TRUE(lost->abandoned);
  script.Release();  // the thread goes on in what must still be there, and is cancelled
  pthread_join(lost->thread, nullptr);
  delete lost;
}

TEST_F(RegistryTest, DeletingAnUnknownWorkerIsNoError) {
  daemon.DeleteWorker("x");
  daemon.workers["y"] = nullptr;
  daemon.DeleteWorker("y");
  EXPECT_THAT(Log(), IsEmpty());
  daemon.workers.clear();
}

TEST_F(RegistryTest, DeletingDirectlyAfterTheStartStillStopsTheThread) {
  for (int round = 0; round < 200; ++round) {
    if (round == 0) {
      SetUpShares({"a"});
    } else {
      ASSERT_TRUE(daemon.CreateWorker("a", false));
    }
    ASSERT_TRUE(daemon.workers["a"]->Run());
    daemon.DeleteWorker("a");
    ASSERT_TRUE(daemon.workers.empty());
    ASSERT_EQ(script.live_indexers, 0);
  }
}

TEST_F(RegistryTest, DeletionIsToldAtDebugLevel) {
  SetUpShares({"a"});
  TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_DEBUG;
  daemon.DeleteWorker("a");
  EXPECT_THAT(Log(), ElementsAre("Worker[a] deleted"));
  EXPECT_EQ(script.CallCount("Commit"), 0);
}

TEST_F(RegistryTest, AFolderOfANewShareMakesAndRunsAWorker) {
  SetUpShares({});
  AddFolder("a", SharePath("a"));

  EXPECT_TRUE(daemon.UpsertFolderSetting(SharePath("a") + "/x"));

  AwaitFinished("a");
  EXPECT_THAT(Names(), ElementsAre("a"));
}

TEST_F(RegistryTest, AFolderOfAKnownShareReloadsItsSettings) {
  SetUpShares({"a"});
  AddFolder("a", SharePath("a") + "/x");

  EXPECT_TRUE(daemon.UpsertFolderSetting(SharePath("a") + "/x"));

  EXPECT_EQ(daemon.workers["a"]->folders.size(), 2U);
  EXPECT_EQ(daemon.workers["a"]->state, WORKER_IDLE);
}

TEST_F(RegistryTest, AReloadKeepsTheWatchThatStands) {
  SetUpShares({"a"});
  const int before = daemon.workers["a"]->wd;

  EXPECT_TRUE(daemon.UpsertFolderSetting(SharePath("a")));

  EXPECT_EQ(daemon.workers["a"]->wd, before);
}

TEST_F(RegistryTest, AReloadWatchesAQueueFolderThatWasMadeAnew) {
  SetUpShares({"a"});
  std::filesystem::remove_all(folder.Path("queue-a"));
  EXPECT_TRUE(daemon.UpsertFolderSetting(SharePath("a")));  // nothing to watch
  folder.MakeDir("queue-a");

  EXPECT_TRUE(daemon.UpsertFolderSetting(SharePath("a")));

  WriteQueue("a", "/x");
  daemon.HandleQueueEvents();
  AwaitFinished("a");
  EXPECT_THAT(Log(), IsEmpty());
}

TEST_F(RegistryTest, AReloadWatchesAQueueFolderOnlyWhereItLiesNow) {
  SetUpShares({"a"});
  std::filesystem::rename(folder.Path("queue-a"), folder.Path("away"));
  folder.MakeDir("queue-a");

  EXPECT_TRUE(daemon.UpsertFolderSetting(SharePath("a")));

  folder.Write("away/TALO@file_index_queue", "");
  WriteQueue("a", "/x");
  daemon.HandleQueueEvents();
  AwaitFinished("a");
  EXPECT_THAT(Log(), IsEmpty());
}

TEST_F(RegistryTest, AReloadMakesUpForAWatchThatFailed) {
  SetUpShares({});
  std::filesystem::remove_all(folder.Path("queue-a"));
  ASSERT_TRUE(daemon.CreateWorker("a", false));
  ASSERT_EQ(daemon.workers["a"]->wd, -1);
  folder.MakeDir("queue-a");

  EXPECT_TRUE(daemon.UpsertFolderSetting(SharePath("a")));

  EXPECT_GE(daemon.workers["a"]->wd, 0);
}

TEST_F(RegistryTest, FailedUpsertsHaveTheirLines) {
  SetUpShares({"a"});
  EXPECT_FALSE(daemon.UpsertFolderSetting("/nowhere"));
  script.Fail("Folders::Load");
  EXPECT_FALSE(daemon.UpsertFolderSetting(SharePath("a")));
  script.Fail("TALOShareGet");
  EXPECT_FALSE(daemon.UpsertFolderSetting(SharePath("b")));
  EXPECT_FALSE(daemon.ReloadFolder("x"));

  EXPECT_THAT(
      Log(),
      ElementsAre("GetShareNameByPath failed, path=/nowhere", "ReloadFolder failed, worker=a",
                  "ReloadWorkerSetting failed, share=a", "TALOShareGet failed, share=b",
                  "CreateWorker failed, share=b", "No such worker: x"));
}

TEST_F(RegistryTest, RemovingAFolderReloadsWhatIsLeftAndTheLastOneDeletesTheWorker) {
  SetUpShares({"a"});
  AddFolder("a", SharePath("a") + "/x");
  EXPECT_TRUE(daemon.DeleteFolderSetting(SharePath("a") + "/y"));
  EXPECT_EQ(daemon.workers["a"]->folders.size(), 2U);

  script.folders.clear();
  EXPECT_TRUE(daemon.DeleteFolderSetting(SharePath("a")));
  EXPECT_TRUE(daemon.workers.empty());
}

TEST_F(RegistryTest, FailedRemovalsHaveTheirLines) {
  SetUpShares({"a"});
  EXPECT_FALSE(daemon.DeleteFolderSetting("/nowhere"));
  EXPECT_FALSE(daemon.DeleteFolderSetting(SharePath("b")));
  EXPECT_THAT(Log(),
              ElementsAre("GetShareNameByPath failed, path=/nowhere", "Cannot find worker:b"));

  script.Forget();
  for (const char* operation : {"Folders::Load", "Folders::List"}) {
    script.Fail(operation, script.CallCount(operation) + 1);
    EXPECT_FALSE(daemon.DeleteFolderSetting(SharePath("a")));
  }
  EXPECT_THAT(Log(), IsEmpty());

  script.Fail("Folders::Load", script.CallCount("Folders::Load") + 2);
  EXPECT_FALSE(daemon.DeleteFolderSetting(SharePath("a")));
  EXPECT_THAT(Log(),
              ElementsAre("ReloadFolder failed, worker=a", "ReloadWorkerSetting failed, share=a"));
  EXPECT_THAT(Names(), ElementsAre("a"));
}

TEST_F(RegistryTest, APauseWakesNobodyAndItsEndWakesAll) {
  SetUpShares({"a", "b"});
  script.Run("pthread_cond_wait", EVERY_CALL, [] {});
  daemon.SetPaused(0);
  daemon.RunWorkers();
  ASSERT_TRUE(script.AwaitCount("pthread_cond_wait", 2));
  { const MutexGuard waiting(&daemon.pause_mutex); }
  EXPECT_THAT(Log(), ElementsAre("SetPaused: true"));

  daemon.SetPaused(time(nullptr) + 100000);
  daemon.SetPaused(1);

  AwaitFinished("a");
  AwaitFinished("b");
  EXPECT_EQ(script.CallCount("pthread_cond_wait"), 2);  // nobody was woken in between
  EXPECT_EQ(daemon.resume_time, 1);
  EXPECT_EQ(script.CountLines("In cleaner"), 2U);
  EXPECT_EQ(script.CountLines("SetPaused: false"), 1U);
}

TEST_F(RegistryTest, ResumeTimeTellsWhetherThereIsAPause) {
  const time_t now = time(nullptr);
  for (const auto& [resume_time, paused] :
       std::vector<std::pair<int64_t, bool>>{{0, true},
                                             {-1, false},
                                             {1, false},
                                             {now - 1, false},
                                             {now + 1000, true},
                                             {int64_t{1} << 40, true},
                                             {INT64_MIN, false}}) {
    daemon.resume_time = resume_time;
    EXPECT_EQ(daemon.IsPaused(), paused) << resume_time;
  }
}

TEST_F(RegistryTest, APauseThatBecomesOneWithoutEndIsAPauseAllTheTime) {
  daemon.resume_time = time(nullptr) + 1000;
  script.Run("time", 1, [this] { daemon.resume_time = 0; });

  EXPECT_TRUE(daemon.IsPaused());

  EXPECT_EQ(daemon.resume_time, 0);
}

}  // namespace
}  // namespace fileindexd
