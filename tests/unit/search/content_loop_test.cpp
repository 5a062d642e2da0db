// SPDX-License-Identifier: GPL-2.0-or-later
// The loop with a daemon that only seems to be one, a scripted pool and scripted contents.
#include "search/content_loop.h"

#include <gmock/gmock.h>
#include <poll.h>
#include <sched.h>
#include <signal.h>
#include <spawn.h>
#include <sys/wait.h>

#include <ctime>
#include <filesystem>

#include "state/daemon_socket.h"
#include "state/left_out.h"
#include "tests/unit/search/scripted.h"
#include "tests/unit/state/mounts.h"

namespace fileindexd {
namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;
using testing::ElementsAre;
using Result = ExtractOutcome::Result;

constexpr int LIMIT_MS = 60000;

// The folder of pid files is the test's own.
class ContentLoopTest : public MountTest {
 protected:
  void SetUp() override {
    MountTest::SetUp();
    if (IsSkipped()) {
      return;
    }
    MountOwnRun();
    ForgetScripted();
    Pool().running.clear();
    Pool() = ScriptedPool();
    std::filesystem::copy_file("/bin/sleep", folder + "/" + DAEMON_PROGRAM);
    store = OpenStore();
    loop = std::make_unique<ContentLoop>(PoolOptions());
    std::string error;
    ASSERT_TRUE(loop->Start(error)) << error;
  }
  void TearDown() override {
    loop.reset();
    KillDaemon();
  }

  void StartDaemon() {
    const std::string path = folder + "/" + DAEMON_PROGRAM;
    std::string name = path;
    std::string time = "1000";
    char* const arguments[] = {name.data(), time.data(), nullptr};
    ASSERT_EQ(posix_spawn(&daemon, path.c_str(), nullptr, nullptr, arguments, environ), 0);
    // Its pid file is believed once it is that program, a moment after the call has returned.
    const std::string link = "/proc/" + std::to_string(daemon) + "/exe";
    while (std::filesystem::read_symlink(link) != path) {
      sched_yield();
    }
    WriteFile(DAEMON_PID_FILE, std::to_string(daemon) + "\n");
  }
  void KillDaemon() {
    if (daemon > 0) {
      kill(daemon, SIGKILL);
      waitpid(daemon, nullptr, 0);
      daemon = 0;
    }
  }

  // A share with an indexed folder and as many files that are to be read.
  std::string AddShare(const std::string& name, int64_t files) {
    std::string path = folder + "/" + name;
    std::filesystem::create_directory(path);
    EXPECT_TRUE(store->AddShare({name, path, ""})) << store->Error();
    for (int64_t row = 1; row <= files; ++row) {
      AddFile(name, row);
    }
    EXPECT_TRUE(store->AddFolder(path, {.document = true})) << store->Error();
    return path;
  }
  void AddFile(const std::string& share, int64_t row) {
    const std::string path = folder + "/" + share + "/" + share + std::to_string(row);
    WriteFile(path, "text");
    ScriptedFile& entry = Scripted(share).entries[row];
    entry.job.identity = IdentityOf(path);
    entry.job.paths = {path};
  }

  // What is ready now is taken in, and what is due now is done.
  void Settle() {
    for (int steps = 0; steps < 200; ++steps) {
      std::vector<pollfd> polled;
      loop->AddPolled(polled, now);
      const int ready = poll(polled.data(), polled.size(), 0);
      if (ready == 0 && loop->Due(now) > now && steps > 0) {
        return;
      }
      loop->Step(polled, now, time(nullptr));
      now += milliseconds(30);  // beyond the pause between two readings of events
    }
    FAIL() << "it never comes to rest";
  }
  void Pass(milliseconds time) {
    now += time;
    Settle();
  }
  // Until a descriptor is ready.
  void Await() {
    std::vector<pollfd> polled;
    loop->AddPolled(polled, now);
    ASSERT_GT(poll(polled.data(), polled.size(), LIMIT_MS), 0);
    loop->Step(polled, now, time(nullptr));
  }

  static std::vector<std::string> Running() {
    std::vector<std::string> names;
    for (const ExtractJob& job : Pool().running) {
      names.push_back(job.name);
    }
    return names;
  }

  std::unique_ptr<StateStore> store;
  std::unique_ptr<ContentLoop> loop;
  Time now = Time(std::chrono::hours(1));
  pid_t daemon = 0;
};

TEST_F(ContentLoopTest, WithoutADaemonItOpensAndReadsNothing) {
  AddShare("a", 1);
  Settle();
  EXPECT_THAT(Scripted("a").calls, ElementsAre());

  StartDaemon();
  Settle();

  EXPECT_THAT(Running(), ElementsAre("a1"));
}

TEST_F(ContentLoopTest, TheEndOfTheDaemonStopsItInTheMiddle) {
  StartDaemon();
  AddShare("a", 1);
  Settle();
  ASSERT_THAT(Running(), ElementsAre("a1"));
  EXPECT_EQ(Scripted("a").kept[1].tries, 1);

  KillDaemon();
  Await();

  EXPECT_EQ(Pool().aborts, 1U);
  EXPECT_EQ(Scripted("a").kept[1].tries, 0);
  Settle();
  EXPECT_THAT(Running(), ElementsAre());

  StartDaemon();
  Settle();
  EXPECT_THAT(Running(), ElementsAre("a1"));
}

TEST_F(ContentLoopTest, APidFileThatCannotBeReadStopsNothingAndIsLookedAtAgain) {
  StartDaemon();
  AddShare("a", 1);
  Settle();
  ASSERT_THAT(Running(), ElementsAre("a1"));

  std::filesystem::remove(DAEMON_PID_FILE);
  std::filesystem::create_directory(DAEMON_PID_FILE);
  Settle();
  Pass(seconds(5));
  EXPECT_THAT(Running(), ElementsAre("a1"));
  EXPECT_EQ(Pool().aborts, 0U);
  EXPECT_LE(loop->Due(now), now + seconds(1));

  KillDaemon();
  Await();
  EXPECT_THAT(Running(), ElementsAre());
}

TEST_F(ContentLoopTest, APauseStopsItAndItsEndLetsItGoOn) {
  StartDaemon();
  AddShare("a", 1);
  Settle();
  ASSERT_THAT(Running(), ElementsAre("a1"));

  ASSERT_TRUE(store->SetPause(0));
  Settle();
  EXPECT_THAT(Running(), ElementsAre());
  EXPECT_EQ(Scripted("a").kept[1].tries, 0);
  EXPECT_THAT(Scripted("a").calls, testing::Contains("CutLog"));

  ASSERT_TRUE(store->ClearPause(0));
  Settle();
  EXPECT_THAT(Running(), ElementsAre("a1"));
}

TEST_F(ContentLoopTest, APauseThatRunsOutWakesIt) {
  StartDaemon();
  AddShare("a", 1);
  ASSERT_TRUE(store->SetPause(time(nullptr) + 3600));
  Settle();
  EXPECT_THAT(Running(), ElementsAre());

  ASSERT_TRUE(store->SetPause(time(nullptr) + 1));
  while (Running().empty()) {
    ASSERT_NO_FATAL_FAILURE(Await());  // the state has changed, and then it is the clock
    Settle();
  }
  EXPECT_THAT(Running(), ElementsAre("a1"));
}

TEST_F(ContentLoopTest, SharesTakeTurns) {
  StartDaemon();
  ASSERT_TRUE(store->SetPause(0));
  AddShare("a", 3);
  AddShare("b", 1);
  Pool().room = 4;
  ASSERT_TRUE(store->ClearPause(0));
  Settle();

  EXPECT_THAT(Running(), testing::UnorderedElementsAre("a1", "a2", "a3", "b1"));
  EXPECT_THAT(Running(), testing::Not(ElementsAre("a1", "a2", "a3", "b1")));
}

TEST_F(ContentLoopTest, WhatIsReadAgainWaitsForWhatIsNewInAnyShare) {
  StartDaemon();
  ASSERT_TRUE(store->SetPause(0));
  AddShare("a", 3);
  for (auto& [row, file] : Scripted("a").entries) {
    file.is_old = true;
  }
  AddShare("b", 2);
  Pool().room = 1;
  ASSERT_TRUE(store->ClearPause(0));
  Settle();

  std::vector<std::string> read;
  while (!Running().empty()) {
    read.push_back(Running().front());
    Pool().End(Result::DONE, "words");
    Settle();
  }
  EXPECT_EQ(read, (std::vector<std::string>{"b1", "b2", "a1", "a2", "a3"}));
}

TEST_F(ContentLoopTest, WhatIsReadAgainLeavesHelpersToWhatIsNew) {
  StartDaemon();
  AddShare("a", 3);
  for (auto& [row, file] : Scripted("a").entries) {
    file.is_old = true;
  }
  Settle();
  EXPECT_THAT(Running(), ElementsAre("a1"));

  AddShare("b", 1);
  Settle();
  EXPECT_THAT(Running(), ElementsAre("a1", "b1"));
}

TEST_F(ContentLoopTest, SharesWhoseFilesAreBeingReadHaveTheirPartOfTheRoom) {
  StartDaemon();
  Pool().room = 1000;
  for (const char* name : {"a", "b", "c", "d", "e", "f", "g"}) {
    AddShare(name, 1);
  }
  Settle();
  ASSERT_EQ(Running().size(), 7U);

  AddShare("h", 300);
  Settle();

  EXPECT_EQ(Running().size(), 307U);
  EXPECT_THAT(Scripted("h").calls, testing::Contains("NextJobs 16"));
  EXPECT_THAT(Scripted("h").calls, testing::Not(testing::Contains("NextJobs 32")));
}

TEST_F(ContentLoopTest, WhatIsReadIsWrittenDownAndTheNextIsGivenOut) {
  StartDaemon();
  AddShare("a", 3);
  Settle();
  ASSERT_THAT(Running(), ElementsAre("a1", "a2"));

  Pool().left_out = "some formats";
  Pool().End(Result::DONE, "words");
  Settle();

  EXPECT_THAT(Running(), ElementsAre("a2", "a3"));
  Pass(seconds(1));
  EXPECT_EQ(Scripted("a").kept[1].state, ScriptedFile::State::DONE);
  EXPECT_EQ(ReadLeftOut(), "some formats");
}

TEST_F(ContentLoopTest, AHostWithoutProcessesIsTriedAgainLater) {
  StartDaemon();
  AddShare("a", 1);
  Settle();
  ASSERT_THAT(Running(), ElementsAre("a1"));

  Pool().End(Result::LOST, "");
  AddFile("a", 2);
  Settle();
  EXPECT_THAT(Running(), ElementsAre());

  Pass(seconds(5));
  EXPECT_THAT(Running(), testing::Contains("a1"));
}

TEST_F(ContentLoopTest, ADiskThatDoesNotGiveAFileHoldsNobodyUp) {
  StartDaemon();
  Pool().room = 1;
  AddShare("a", 2);
  Settle();
  ASSERT_THAT(Running(), ElementsAre("a1"));

  Pool().End(Result::UNREAD, "");
  Settle();
  EXPECT_THAT(Running(), ElementsAre("a2"));

  Pool().End(Result::DONE, "words");
  Settle();
  Pass(seconds(5));
  EXPECT_THAT(Running(), ElementsAre());
  EXPECT_EQ(Scripted("a").kept[1].state, ScriptedFile::State::UNREAD);
}

TEST_F(ContentLoopTest, AMissingHelperIsTriedAgainLater) {
  Pool().opening_error = "it is not there";
  StartDaemon();
  AddShare("a", 1);
  Settle();
  EXPECT_THAT(Running(), ElementsAre());

  Pool().opening_error = "";
  Pass(seconds(2));

  EXPECT_THAT(Running(), ElementsAre("a1"));
}

TEST_F(ContentLoopTest, AShareThatFailsDoesNotHoldTheOthers) {
  StartDaemon();
  Scripted("a").failing["Open"] = IndexError::IO;
  AddShare("a", 1);
  AddShare("b", 1);
  Settle();
  EXPECT_THAT(Running(), ElementsAre("b1"));

  Scripted("a").failing.clear();
  Pass(seconds(2));
  EXPECT_THAT(Running(), testing::UnorderedElementsAre("a1", "b1"));
}

TEST_F(ContentLoopTest, AShareThatIsRemovedIsForgotten) {
  StartDaemon();
  AddShare("a", 1);
  Settle();
  ASSERT_THAT(Running(), ElementsAre("a1"));

  ASSERT_TRUE(store->RemoveShare("a"));
  Settle();
  Scripted("a").calls.clear();
  Pool().End(Result::DONE, "words");
  Settle();

  EXPECT_THAT(Scripted("a").calls, ElementsAre());
}

TEST_F(ContentLoopTest, AWishToRetryIsTakenOffTheRecord) {
  StartDaemon();
  AddShare("a", 1);
  Scripted("a").kept = Scripted("a").entries;
  Scripted("a").kept[1].state = ScriptedFile::State::FAILED;
  Settle();
  EXPECT_THAT(Running(), ElementsAre());

  ASSERT_TRUE(store->UpdateStatus("a", [](ShareStatus& it) { it.retry_contents = true; }));
  Settle();

  EXPECT_THAT(Running(), ElementsAre("a1"));
  ShareStatus status;
  ASSERT_TRUE(store->GetStatus("a", status));
  EXPECT_FALSE(status.retry_contents);
}

TEST_F(ContentLoopTest, AtItsEndItTakesBackWhatRuns) {
  StartDaemon();
  AddShare("a", 2);
  Settle();
  ASSERT_EQ(Running().size(), 2U);

  loop->End();

  EXPECT_EQ(Scripted("a").kept[1].tries + Scripted("a").kept[2].tries, 0);
  EXPECT_EQ(Running().size(), 0U);
}

}  // namespace
}  // namespace fileindexd
