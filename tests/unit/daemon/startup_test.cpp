// SPDX-License-Identifier: GPL-2.0-or-later
// The whole run inside the test's process: daemon() is told to do nothing, and the start of the
// content service brings the signal that ends the loop.
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <utility>
#include <vector>

#include "base/mutex_guard.h"
#include "unit/daemon/daemon_fixture.h"

namespace fileindexd {
namespace {

using scripted::EVERY_CALL;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

class StartupTest : public DaemonFixture {
 protected:
  StartupTest() : mask(umask(022)) {
    AddFolder("a", SharePath("a"));
    AddFolder("b", SharePath("b"));
    ArmSignal(SIGTERM);
    script.Answer("daemon", EVERY_CALL, 0);
  }
  ~StartupTest() override { umask(mask); }

  static void ArmSignal(int number) {
    script.Run("QLIBServiceStart", 1, [number] { raise(number); });
  }

  static bool HasHandler(int number, sighandler_t handler) {
    struct sigaction now = {};
    sigaction(number, nullptr, &now);
    return now.sa_handler == handler;
  }

  static bool Exists(const char* path) { return access(path, F_OK) == 0; }

  // The parts of the host that start-up and clean-up use, in order.
  static std::vector<std::string> Steps() {
    return script.CallsOf({"QLIBCProcAliveByPidFile", "QLIBCProcPidFileCreate", "IsUpdated",
                           "Updater_hvx60_beta2", "SetUpdated", "IndexMgr::List", "GetPauseInfo",
                           "QLIBServiceStart", "QLIBServiceStop"});
  }

  mode_t mask;
};

TEST_F(StartupTest, ARunGoesThroughAllStepsAndLeavesNothingBehind) {
  const int descriptors = scripted::OpenDescriptors();

  daemon.Run();

  EXPECT_THAT(Steps(), ElementsAre("QLIBCProcAliveByPidFile /var/run/fileindexd.pid",
                                   "QLIBCProcPidFileCreate /var/run/fileindexd.pid",
                                   "IsUpdated updater_hvx_60_meta2", "Updater_hvx60_beta2",
                                   "SetUpdated updater_hvx_60_meta2", "IndexMgr::List",
                                   "GetPauseInfo", "QLIBServiceStart talocontentsearchd 1",
                                   "QLIBServiceStop talocontentsearchd 1"));
  EXPECT_FALSE(Exists(PID_PATH));
  EXPECT_FALSE(Exists(SOCKET_PATH));
  EXPECT_EQ(scripted::OpenDescriptors(), descriptors);
  EXPECT_EQ(script.live_indexers, 0);
  EXPECT_TRUE(daemon.workers.empty());
  EXPECT_EQ(umask(0), 0U);
}

TEST_F(StartupTest, EachStepIsToldAtDebugLevel) {
  TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_DEBUG;
  script.folders.clear();

  daemon.Run();

  EXPECT_THAT(Log(), ElementsAre("Daemonized ...", "Signal handler set ...", "Update done ...",
                                 "Domain socket setup done ...", "inotify setup done ...",
                                 "Worker setup done ...", "Workers start to run ...",
                                 "Search daemon launched ...", "In kill handler(15)",
                                 "Daemon Leaving main loop", "Cleaning resource"));
}

TEST_F(StartupTest, AtErrorLevelOnlyTheEndIsTold) {
  script.folders.clear();
  daemon.Run();
  EXPECT_THAT(Log(), ElementsAre("In kill handler(15)", "Daemon Leaving main loop"));
}

TEST_F(StartupTest, AnInterruptEndsTheRunToo) {
  script.Run("QLIBServiceStart", 1, [] {
    sigset_t pending;
    sigpending(&pending);
    EXPECT_EQ(sigismember(&pending, SIGTERM), 1);
  });
  ArmSignal(SIGINT);
  daemon.Run();
  EXPECT_THAT(Log(), Contains("In kill handler(2)"));
}

TEST_F(StartupTest, BesideALiveInstanceNothingIsTouched) {
  TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_DEBUG;
  script.Answer("QLIBCProcAliveByPidFile", 1, 1);
  close(creat(PID_PATH, 0600));
  close(creat(SOCKET_PATH, 0600));

  EXPECT_EQ(daemon.Run(), 2);

  EXPECT_TRUE(Exists(PID_PATH));
  EXPECT_TRUE(Exists(SOCKET_PATH));
  EXPECT_EQ(script.Calls().size(), 1U);
  EXPECT_EQ(script.CallCount("daemon"), 0);
  EXPECT_THAT(Log(), ElementsAre("Daemon alive. No need to start"));
}

TEST_F(StartupTest, AnAliveCheckThatFailsDoesNotHinderTheStart) {
  script.Fail("QLIBCProcAliveByPidFile");
  daemon.Run();
  EXPECT_EQ(script.CallCount("QLIBServiceStart"), 1);
}

TEST_F(StartupTest, EachFailingStepHasItsLinesAndIsFollowedByTheCleanUp) {
  const struct {
    const char* operation;
    int answer;
    std::vector<std::string> lines;
  } TABLE[] = {
      {"daemon", EAGAIN, {"Failed to become a daemon, reason=Resource temporarily unavailable"}},
      {"QLIBCProcPidFileCreate", -1, {"Failed to create daemon file"}},
      {"Updater_hvx60_beta2", 0, {"Updater_hvx60_beta2 failed", "DoUpdate failed"}},
      {"SetUpdated", 0, {"Updater_hvx60_beta2 failed", "DoUpdate failed"}},
      {"socket", EMFILE, {"socket failed, reason=Too many open files", "SetupDomainSocket failed"}},
      {"bind",
       EADDRINUSE,
       {"bind failed, reason=Address already in use", "SetupDomainSocket failed"}},
      {"listen",
       EADDRINUSE,
       {"listen failed, reason=Address already in use", "SetupDomainSocket failed"}},
      {"inotify_init",
       EMFILE,
       {"inotify_init failed, reason=Too many open files", "SetupInotify failed"}},
      {"IndexMgr::List", 0, {"Failed to list folders", "SetupWorkers failed"}},
      {"GetPauseInfo", 0, {"Failed to get pause status", "SetupWorkers failed"}},
      {"pthread_cond_init", ENOMEM, {"pthread_cond_init failed", "SetupWorkers failed"}},
  };
  const int descriptors = scripted::OpenDescriptors();
  for (const auto& row : TABLE) {
    script.Forget();
    script.markers.clear();
    script.Answer(row.operation, script.CallCount(row.operation) + 1, row.answer);

    daemon.Run();

    EXPECT_EQ(Log(), row.lines) << row.operation;
    EXPECT_EQ(Steps().back(), "QLIBServiceStop talocontentsearchd 1") << row.operation;
    EXPECT_FALSE(Exists(PID_PATH)) << row.operation;
    EXPECT_FALSE(Exists(SOCKET_PATH)) << row.operation;
    EXPECT_EQ(scripted::OpenDescriptors(), descriptors) << row.operation;
    EXPECT_EQ(script.live_indexers, 0) << row.operation;
  }
}

TEST_F(StartupTest, AnUpdateThatRanIsNotRunAgain) {
  script.markers.insert("updater_hvx_60_meta2");
  EXPECT_TRUE(daemon.DoUpdate());
  EXPECT_THAT(script.Calls(), ElementsAre("IsUpdated updater_hvx_60_meta2"));
}

TEST_F(StartupTest, AFailedUpdateIsNotRecorded) {
  script.Fail("Updater_hvx60_beta2", 1);
  EXPECT_FALSE(daemon.DoUpdate());
  EXPECT_TRUE(script.markers.empty());
  EXPECT_TRUE(daemon.DoUpdate());
  EXPECT_TRUE(script.markers.contains("updater_hvx_60_meta2"));
}

TEST_F(StartupTest, AServiceThatDoesNotStartOrStopIsToldOnly) {
  script.Reset();
  script.system_error = 0x1A;
  script.Fail("QLIBServiceStart");
  script.Fail("QLIBServiceStop");

  daemon.StartSearchService();
  daemon.StopSearchService();

  EXPECT_THAT(Log(), ElementsAre("QLIBServiceStart failed: err=[0x001A service.c:42]",
                                 "QLIBServiceStop failed: err=[0x001A service.c:42]"));
}

TEST_F(StartupTest, TheServiceIsStoppedOnlyWhenEveryWorkerIsGone) {
  ASSERT_TRUE(daemon.SetupInotify());
  ASSERT_TRUE(daemon.SetupWorkers());
  int left = -1;
  script.Run("QLIBServiceStop", 1, [&] { left = script.live_indexers; });

  daemon.CleanResource();

  EXPECT_EQ(left, 0);
}

TEST_F(StartupTest, CleanUpEndsTheWaitOfWorkersInAPauseWithoutALine) {
  ASSERT_TRUE(daemon.SetupInotify());
  ASSERT_TRUE(daemon.SetupWorkers());
  script.Run("pthread_cond_wait", EVERY_CALL, [] {});
  daemon.resume_time = 0;
  daemon.RunWorkers();
  ASSERT_TRUE(script.AwaitCount("pthread_cond_wait", 2));

  daemon.CleanResource();

  EXPECT_EQ(script.CountLines("SetPaused"), 0U);
  EXPECT_EQ(script.CountLines("In cleaner"), 2U);
  EXPECT_EQ(daemon.resume_time, 0);
}

TEST_F(StartupTest, WhetherThereIsAPauseIsLeftToTheWorkersToAsk) {
  ASSERT_TRUE(daemon.SetupInotify());
  ASSERT_TRUE(daemon.SetupWorkers());
  daemon.resume_time = time(nullptr) + 1000;
  script.Run("time", EVERY_CALL, [] {});
  const int before = script.CallCount("time");

  daemon.CleanResource();

  EXPECT_EQ(script.CallCount("time"), before);
}

TEST_F(StartupTest, CleanUpInAPauseLeavesTheQueuesAsTheyAre) {
  ASSERT_TRUE(daemon.SetupInotify());
  ASSERT_TRUE(daemon.SetupWorkers());
  script.Run("pthread_cond_wait", EVERY_CALL, [] {});
  daemon.resume_time = 0;
  for (const char* share : {"a", "b"}) {
    WriteQueue(share, SharePath(share) + "/gone");
  }
  daemon.RunWorkers();
  ASSERT_TRUE(script.AwaitCount("pthread_cond_wait", 2));

  daemon.CleanResource();

  for (const char* share : {"a", "b"}) {
    EXPECT_TRUE(Exists(QueuePath(share).c_str())) << share;
  }
  EXPECT_EQ(script.CallCount("DelFSDocument"), 0);
}

TEST_F(StartupTest, CleanUpInAPauseThatHoldsABatchLeavesTheRestInItsDrainedCopy) {
  ASSERT_TRUE(daemon.SetupInotify());
  ASSERT_TRUE(daemon.SetupWorkers());
  script.Run("pthread_cond_wait", EVERY_CALL, [] {});
  script.Run("DelFSDocument", 1, [this] { daemon.resume_time = 0; });
  for (const char* name : {"/1", "/2", "/3"}) {
    WriteQueue("a", SharePath("a") + name);
  }
  daemon.RunWorkers();
  ASSERT_TRUE(script.AwaitCount("pthread_cond_wait", 1));

  daemon.CleanResource();

  EXPECT_EQ(script.CallCount("DelFSDocument"), 1);
  EXPECT_TRUE(Exists((QueuePath("a") + ".tmp").c_str()));
  EXPECT_EQ(script.CountLines("Failed to wait thread"), 0U);
}

TEST_F(StartupTest, NumbersAreSeededOnceBeforeTheHandlersAreSet) {
  script.Run("srand", 1, [] {
    EXPECT_EQ(script.CallCount("daemon"), 1);
    EXPECT_TRUE(HasHandler(SIGTERM, SIG_DFL));
  });
  const time_t before = time(nullptr);

  daemon.Run();

  EXPECT_EQ(script.CallCount("srand"), 1);
  const int drawn = rand();
  bool seeded_by_time = false;
  for (time_t seed = before; seed <= time(nullptr); ++seed) {
    srand(static_cast<unsigned>(seed));
    seeded_by_time = seeded_by_time || rand() == drawn;
  }
  EXPECT_TRUE(seeded_by_time);
}

TEST_F(StartupTest, CleanUpClosesTheDescriptorsThenStopsTheWorkersByNameThenTheService) {
  TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_DEBUG;
  ASSERT_TRUE(daemon.SetupDomainSocket());
  ASSERT_TRUE(daemon.SetupInotify());
  ASSERT_TRUE(daemon.SetupWorkers());
  daemon.RunWorkers();
  AwaitFinished("a");
  AwaitFinished("b");
  script.Forget();
  std::vector<std::pair<int, int>> at_joins;
  for (const int call : {1, 2}) {
    script.Run("pthread_timedjoin_np", call,
               [&] { at_joins.emplace_back(daemon.socket_fd, daemon.inotify_fd); });
  }
  script.Run("QLIBServiceStop", 1, [] { FI_LOG("service"); });

  daemon.CleanResource();

  EXPECT_THAT(at_joins, ElementsAre(std::pair(-1, -1), std::pair(-1, -1)));
  EXPECT_THAT(Log(), ElementsAre("Cleaning resource", "Worker[a] deleted", "Worker[a] cancelled",
                                 "Worker[b] deleted", "Worker[b] cancelled", "service"));
}

TEST_F(StartupTest, CleanUpRestoresTheSignalsAndThenRemovesTheFilesOnceTheServiceHasStopped) {
  close(creat(PID_PATH, 0600));
  close(creat(SOCKET_PATH, 0600));
  signal(SIGTERM, HandleKill);
  signal(SIGINT, HandleKill);
  signal(SIGPIPE, SIG_IGN);
  script.Run("QLIBServiceStop", 1, [] {
    EXPECT_TRUE(HasHandler(SIGTERM, HandleKill));
    EXPECT_TRUE(HasHandler(SIGINT, HandleKill));
    EXPECT_TRUE(HasHandler(SIGPIPE, SIG_IGN));
    EXPECT_TRUE(Exists(PID_PATH));
    EXPECT_TRUE(Exists(SOCKET_PATH));
  });
  std::vector<std::pair<bool, bool>> at_removals;
  for (const int call : {1, 2}) {
    script.Run("unlink", call, [&] {
      EXPECT_TRUE(HasHandler(SIGTERM, SIG_DFL));
      at_removals.emplace_back(Exists(PID_PATH), Exists(SOCKET_PATH));
    });
  }

  EXPECT_EQ(daemon.CleanResource(), 0);

  EXPECT_THAT(at_removals, ElementsAre(std::pair(true, true), std::pair(false, true)));
  EXPECT_FALSE(Exists(SOCKET_PATH));
}

TEST_F(StartupTest, ARunEndsWithTheResultOfRemovingTheSocket) {
  script.Say("unlink", PID_PATH, EBUSY);
  EXPECT_EQ(daemon.Run(), 0);

  script.Say("unlink", SOCKET_PATH, EBUSY);
  script.Answer("daemon", EVERY_CALL, EAGAIN);
  EXPECT_EQ(daemon.Run(), -1);
}

TEST_F(StartupTest, CleanUpRestoresTheSignals) {
  signal(SIGTERM, HandleKill);
  signal(SIGINT, HandleKill);
  signal(SIGPIPE, SIG_IGN);

  daemon.CleanResource();

  for (const int number : {SIGTERM, SIGINT, SIGPIPE}) {
    EXPECT_EQ(signal(number, SIG_DFL), SIG_DFL) << number;
  }
}

TEST_F(StartupTest, TheKillHandlerTellsAndSetsTheFlag) {
  HandleKill(15);
  EXPECT_EQ(stop_requested, 1);
  EXPECT_THAT(Log(), ElementsAre("In kill handler(15)"));
}

}  // namespace
}  // namespace fileindexd
