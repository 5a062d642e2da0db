// SPDX-License-Identifier: GPL-2.0-or-later
// The loop is driven one iteration at a time. A signal that is pending ends a wait at once, so that
// no test waits out the ten seconds of a quiet one.
#include <fcntl.h>
#include <sys/inotify.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>

#include "base/scoped_fd.h"
#include "unit/daemon/daemon_fixture.h"

namespace fileindexd {
namespace {

using scripted::EVERY_CALL;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

class MainLoopTest : public DaemonFixture {
 protected:
  MainLoopTest() {
    EXPECT_TRUE(daemon.SetupDomainSocket());
    SetUpShares({"a", "b"});
    sigset_t blocked;
    sigemptyset(&blocked);
    sigaddset(&blocked, SIGTERM);
    pthread_sigmask(SIG_BLOCK, &blocked, nullptr);
    signal(SIGTERM, HandleKill);
  }

  // An iteration whose wait is interrupted.
  void QuietIteration() {
    raise(SIGTERM);
    daemon.LoopOnce();
  }

  bool IsReadable(int fd) {
    fd_set set;
    FD_ZERO(&set);
    FD_SET(fd, &set);
    timeval none = {};
    return select(fd + 1, &set, nullptr, nullptr, &none) == 1;
  }
};

TEST_F(MainLoopTest, TheSocketIsOpenToAll) {
  struct stat found = {};
  const mode_t before = umask(0);
  close(daemon.socket_fd);
  ASSERT_TRUE(daemon.SetupDomainSocket());  // over the file that is there already
  umask(before);

  ASSERT_EQ(stat(SOCKET_PATH, &found), 0);
  EXPECT_TRUE(S_ISSOCK(found.st_mode));
  EXPECT_EQ(found.st_mode & 0777U, 0777U);
  EXPECT_GT(daemon.inotify_fd, 0);
}

TEST_F(MainLoopTest, EachFailureOfTheSetUpHasItsLine) {
  for (const std::string operation : {"socket", "bind", "listen", "inotify_init"}) {
    script.Forget();
    script.Answer(operation, script.CallCount(operation) + 1, EMFILE);
    Daemon other;
    EXPECT_FALSE(operation == "inotify_init" ? other.SetupInotify() : other.SetupDomainSocket());
    EXPECT_THAT(Log(), ElementsAre(operation + " failed, reason=Too many open files"));
    if (other.socket_fd >= 0) {
      close(other.socket_fd);
    }
  }
}

TEST_F(MainLoopTest, AWrittenQueueStartsItsWorkerAndNoOther) {
  WriteQueue("a", "/x");
  daemon.LoopOnce();
  AwaitFinished("a");

  EXPECT_EQ(daemon.workers["b"]->state, WORKER_IDLE);
  EXPECT_THAT(script.CallsOf({"DelFSDocument"}), ElementsAre("DelFSDocument /x 0"));
}

TEST_F(MainLoopTest, AFinishedThreadIsJoinedBeforeTheNextOneStarts) {
  WriteQueue("a", "/x");
  daemon.LoopOnce();
  AwaitFinished("a");
  script.Run("pthread_timedjoin_np", EVERY_CALL, [] {});  // counted from now on
  const int joins = script.CallCount("pthread_timedjoin_np");

  WriteQueue("a", "/y");
  daemon.LoopOnce();
  AwaitFinished("a", 2);

  EXPECT_EQ(script.CallCount("pthread_timedjoin_np") - joins, 1);
  EXPECT_EQ(script.CallsOf({"DelFSDocument"}).back(), "DelFSDocument /y 0");
}

TEST_F(MainLoopTest, ARunningOrFullWorkerIsLeftAlone) {
  TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_DEBUG;
  for (const int state : {WORKER_RUNNING, WORKER_OUT_OF_SPACE}) {
    daemon.workers["a"]->state = state;
    WriteQueue("a", "/x");
    daemon.LoopOnce();
    EXPECT_EQ(daemon.workers["a"]->state, state);
  }
  daemon.workers["a"]->state = WORKER_IDLE;
  EXPECT_THAT(script.Calls(), IsEmpty());
  EXPECT_THAT(Log(), IsEmpty());
}

TEST_F(MainLoopTest, OtherNamesAndOtherEventsStartNothing) {
  folder.Write("queue-a/TALO@file_index_queue.tmp", "x");
  folder.Write("queue-a/TALO@file_index_queu", "x");
  folder.Write("queue-a/other", "x");
  folder.Write("queue-a/talo@file_index_queue", "x");
  const ScopedFd open_queue(open(QueuePath("a").c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0600));
  EXPECT_EQ(write(open_queue.fd, "x", 1), 1);  // not closed yet

  daemon.LoopOnce();

  EXPECT_THAT(script.Calls(), IsEmpty());
  EXPECT_THAT(Log(), IsEmpty());
  EXPECT_FALSE(IsReadable(daemon.inotify_fd));
}

TEST_F(MainLoopTest, AnEventThatBelongsToNoWorkerIsToldAndTheNextIsServed) {
  const int wd = daemon.workers["a"]->wd;
  daemon.workers["a"]->wd = -1;
  WriteQueue("a", "/x");
  WriteQueue("b", "/y");

  daemon.HandleQueueEvents();
  AwaitFinished("b");

  EXPECT_THAT(Log(), Contains("Failed to get worker for wd=" + std::to_string(wd)));
  daemon.workers["a"]->wd = wd;
}

TEST_F(MainLoopTest, AnInotifyReadThatFailsHandlesNothing) {
  const int fd = daemon.inotify_fd;
  daemon.inotify_fd = -1;
  daemon.HandleQueueEvents();
  daemon.inotify_fd = fd;
  EXPECT_THAT(Log(), IsEmpty());
}

TEST_F(MainLoopTest, TheFirstWorkerWithTheDescriptorIsFound) {
  EXPECT_EQ(daemon.FindWorkerByWd(daemon.workers["b"]->wd), daemon.workers["b"]);
  EXPECT_EQ(daemon.FindWorkerByWd(12345), nullptr);
  daemon.workers["b"]->wd = daemon.workers["a"]->wd;
  EXPECT_EQ(daemon.FindWorkerByWd(daemon.workers["a"]->wd), daemon.workers["a"]);
}

TEST_F(MainLoopTest, AQuietIterationReapsFinishedThreadsAndEndsAPauseThatHasPassed) {
  WriteQueue("a", "/x");
  daemon.LoopOnce();
  AwaitFinished("a");
  daemon.resume_time = time(nullptr) - 1;
  TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_DEBUG;
  script.Forget();

  QuietIteration();

  EXPECT_EQ(daemon.workers["a"]->state, WORKER_IDLE);
  EXPECT_EQ(daemon.resume_time, -1);
  EXPECT_THAT(Log(), ElementsAre("In kill handler(15)", "Worker[a] cancelled", "SetPaused: false"));
}

TEST_F(MainLoopTest, AQuietIterationLeavesARunningOrFullWorkerAlone) {
  script.Run("pthread_timedjoin_np", EVERY_CALL, [] {});  // counted from now on
  for (const int state : {WORKER_RUNNING, WORKER_OUT_OF_SPACE}) {
    daemon.workers["a"]->state = state;
    QuietIteration();
    EXPECT_EQ(daemon.workers["a"]->state, state);
  }
  daemon.workers["a"]->state = WORKER_IDLE;
  EXPECT_EQ(script.CallCount("pthread_timedjoin_np"), 0);
}

TEST_F(MainLoopTest, AWaitForAnythingReadableLastsTenSeconds) {
  const ScopedFd client(Connect(""));
  daemon.resume_time = 1;
  script.Say("ppoll", "10.0", EINTR);

  daemon.LoopOnce();

  EXPECT_EQ(daemon.resume_time, -1);
  EXPECT_TRUE(IsReadable(daemon.socket_fd));
}

TEST_F(MainLoopTest, TenClientsMayWaitToBeAccepted) {
  Daemon other;
  script.Say("listen", "10", EADDRINUSE);

  EXPECT_FALSE(other.SetupDomainSocket());

  close(other.socket_fd);
}

TEST_F(MainLoopTest, OnlyATimeThatHasPassedIsResumed) {
  for (const int64_t resume_time : {int64_t{0}, int64_t{-1}, int64_t{time(nullptr) + 1000}}) {
    daemon.resume_time = resume_time;
    daemon.CheckResumeTime();
    EXPECT_EQ(daemon.resume_time, resume_time);
  }
  EXPECT_THAT(Log(), IsEmpty());
  daemon.resume_time = 1;
  daemon.CheckResumeTime();
  EXPECT_EQ(daemon.resume_time, -1);
}

TEST_F(MainLoopTest, ABusyIterationDoesNoHousekeeping) {
  WriteQueue("b", "/x");
  daemon.LoopOnce();
  AwaitFinished("b");
  daemon.resume_time = 1;
  WriteQueue("a", "/x");

  daemon.LoopOnce();

  EXPECT_EQ(daemon.workers["b"]->state, WORKER_FINISHED);
  EXPECT_EQ(daemon.resume_time, 1);
}

TEST_F(MainLoopTest, AnExceptionWhileQueuesAreServedLeavesTheSocketForTheNextIteration) {
  const ScopedFd client(Connect(""));
  TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_DEBUG;
  script.Run("WriteLog", 1, [] { throw 5; });  // "respawned"; anything may be thrown
  WriteQueue("a", "/x");

  daemon.LoopOnce();

  EXPECT_EQ(Log().back(), "MainLoop exception ...");
  EXPECT_TRUE(IsReadable(daemon.socket_fd));
  daemon.LoopOnce();
  EXPECT_EQ(Log().back(), "Replying socket: -1");
}

TEST_F(MainLoopTest, TheStopFlagEndsTheLoop) {
  raise(SIGTERM);

  daemon.MainLoop();

  EXPECT_THAT(Log(), ElementsAre("In kill handler(15)", "Daemon Leaving main loop"));
  EXPECT_EQ(stop_requested, 1);
}

TEST_F(MainLoopTest, TheSignalIsLetThroughOnlyInsideTheWait) {
  raise(SIGTERM);
  EXPECT_THAT(Log(), IsEmpty());
  daemon.LoopOnce();
  EXPECT_THAT(Log(), ElementsAre("In kill handler(15)"));
  sigset_t mask;
  pthread_sigmask(SIG_BLOCK, nullptr, &mask);
  EXPECT_EQ(sigismember(&mask, SIGTERM), 1);
}

}  // namespace
}  // namespace fileindexd
