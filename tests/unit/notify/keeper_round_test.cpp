// SPDX-License-Identifier: GPL-2.0-or-later
#include "notify/keeper_round.h"

#include <fcntl.h>
#include <gmock/gmock.h>
#include <sys/inotify.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <memory>
#include <vector>

#include "base/scoped_fd.h"
#include "state/filesystem.h"
#include "state/layout.h"
#include "state/progress.h"
#include "state/queue_writer.h"
#include "tests/unit/state/mounts.h"

namespace fileindexd {

using testing::ElementsAre;
using testing::IsEmpty;

// The daemon is a record of commands and an answer. Time is a number; file times are set.
class KeeperRoundTest : public MountTest {
 protected:
  static constexpr int64_t NOW = 1000000;
  static constexpr int64_t ROUND = 15;

  void SetUp() override {
    MountTest::SetUp();
    if (IsSkipped()) {
      return;
    }
    store = OpenStore();
    ASSERT_NE(store, nullptr);
    ASSERT_TRUE(store->AddShare({"s", root, FilesystemIdentity(root)})) << store->Error();
    ASSERT_TRUE(store->AddFolder(root, {})) << store->Error();
    std::string error;
    ASSERT_TRUE(MakeShareFolder("s", error)) << error;
    round =
        std::make_unique<KeeperRound>(*store, DaemonLink{[this] { return lives; },
                                                         [this](const std::string& command) {
                                                           sent.push_back(command);
                                                           if (during_send) {
                                                             during_send();
                                                           }
                                                           return answer;
                                                         },
                                                         [this](std::chrono::milliseconds time) {
                                                           waited += time;
                                                           return !stopping;
                                                         }});
  }

  // A file of a line whose last change is `age` seconds old at `time`.
  void MakeOld(const std::string& path, int64_t age, int64_t time = NOW) {
    WriteFile(path, "{\"event\":8,\"path\":\"" + root + "/f\"}\n");
    SetTime(path, time - age);
  }
  void SetTime(const std::string& path, int64_t time) {
    const timespec times[] = {{time, 0}, {time, 0}};
    ASSERT_EQ(utimensat(AT_FDCWD, path.c_str(), times, 0), 0) << path;
  }
  void Change(const std::function<void(ShareStatus&)>& change) {
    ASSERT_TRUE(store->UpdateStatus("s", change)) << store->Error();
  }
  int64_t Pause() {
    int64_t resume_time = 0;
    EXPECT_TRUE(store->GetPause(resume_time));
    return resume_time;
  }

  bool HasNoSpaceFlag() {
    ShareStatus status;
    EXPECT_TRUE(store->GetStatus("s", status));
    return status.no_space;
  }

  // Whether the queue was closed after it was open for writing, which is what the daemon sees.
  bool IsTouchedBy(const std::function<void()>& act) {
    const ScopedFd watch(inotify_init1(IN_CLOEXEC | IN_NONBLOCK));
    EXPECT_GE(inotify_add_watch(watch.fd, ShareFolder("s").c_str(), IN_CLOSE_WRITE), 0);
    act();
    alignas(inotify_event) char event[4096];
    if (read(watch.fd, event, sizeof(event)) < static_cast<ssize_t>(sizeof(inotify_event))) {
      return false;
    }
    return std::string(reinterpret_cast<inotify_event*>(event)->name) == QUEUE_NAME;
  }

  // The share on a small file system that is full of one file, whose path is returned.
  std::string MountSmall() {
    MakeFolder(root);
    EXPECT_EQ(mount("none", root.c_str(), "tmpfs", 0, "size=4m"), 0);
    mounted.push_back(root);
    EXPECT_TRUE(store->SetShareFilesystem("s", FilesystemIdentity(root)));
    WriteFile(root + "/filler", std::string(3584 << 10, 'x'));
    return root + "/filler";
  }

  std::string Upsert() {
    return R"({"type":"upsert_folder_setting","data":{"folder_path":")" + root + "\"}}";
  }

  const std::string RESUME = R"({"type":"resume","data":{}})";
  bool lives = true;
  bool stopping = false;
  Reply answer = Reply::DONE;
  std::function<void()> during_send;
  std::vector<std::string> sent;
  std::chrono::milliseconds waited{};
  std::unique_ptr<StateStore> store;
  std::unique_ptr<KeeperRound> round;
};

TEST_F(KeeperRoundTest, QueueIsTouchedOnlyOnceItIsOld) {
  MakeOld(QueuePath("s"), 9);
  EXPECT_FALSE(IsTouchedBy([&] { round->Run(NOW); }));
  EXPECT_TRUE(IsTouchedBy([&] { round->Run(NOW + 2); }));
  EXPECT_TRUE(IsTouchedBy([&] { round->Run(NOW - 100); })) << "the clock was set back";
}

TEST_F(KeeperRoundTest, DrainedCopyWithoutAQueueIsTouchedOnlyOnceItIsOld) {
  MakeOld(DrainedPath("s"), 9);
  round->Run(NOW);
  EXPECT_FALSE(Exists(QueuePath("s")));

  EXPECT_TRUE(IsTouchedBy([&] { round->Run(NOW + 2); }));
  EXPECT_EQ(ReadFile(QueuePath("s")), "");
}

TEST_F(KeeperRoundTest, FlagsOfAReindexMakeAQueue) {
  for (bool ShareStatus::*flag : {&ShareStatus::needs_reindex, &ShareStatus::reindex_begun}) {
    round->Run(NOW);
    EXPECT_FALSE(Exists(QueuePath("s")));
    Change([&](ShareStatus& status) { status.*flag = true; });
    round->Run(NOW);
    EXPECT_TRUE(Exists(QueuePath("s")));
    Change([&](ShareStatus& status) { status.*flag = false; });
    ASSERT_EQ(unlink(QueuePath("s").c_str()), 0);
  }
}

TEST_F(KeeperRoundTest, ShareWithoutFoldersOrWithoutItsOwnFolderIsLeftAlone) {
  Change([](ShareStatus& status) { status.needs_reindex = true; });
  ASSERT_EQ(rmdir(ShareFolder("s").c_str()), 0);
  round->Run(NOW);
  round->Appear("s", NOW);
  EXPECT_FALSE(Exists(ShareFolder("s")));

  std::string error;
  ASSERT_TRUE(MakeShareFolder("s", error));
  ASSERT_TRUE(store->RemoveFolder(root));
  round->Run(NOW);
  round->Appear("s", NOW);
  EXPECT_FALSE(Exists(QueuePath("s")));
  EXPECT_THAT(sent, IsEmpty());
}

TEST_F(KeeperRoundTest, FullShareIsLeftAloneUntilItHasSpace) {
  const std::string filler = MountSmall();
  Change([](ShareStatus& status) { status.no_space = true; });
  MakeOld(QueuePath("s"), 100);
  EXPECT_FALSE(IsTouchedBy([&] { round->Run(NOW); }));
  EXPECT_TRUE(HasNoSpaceFlag());

  ASSERT_EQ(unlink(filler.c_str()), 0);
  EXPECT_TRUE(IsTouchedBy([&] { round->Run(NOW + ROUND); }));
  EXPECT_FALSE(HasNoSpaceFlag());
  EXPECT_THAT(sent, ElementsAre(Upsert()));
}

TEST_F(KeeperRoundTest, QueueThatStaysGetsAWorkerOnceAMinute) {
  MakeOld(QueuePath("s"), 100);
  std::vector<size_t> asked;
  for (int i = 0; i < 8; ++i) {
    EXPECT_TRUE(IsTouchedBy([&] { round->Run(NOW + i * ROUND); })) << i;
    asked.push_back(sent.size());
  }

  EXPECT_THAT(asked, ElementsAre(0, 0, 1, 1, 1, 1, 2, 2));
  EXPECT_EQ(sent[0], Upsert());
}

TEST_F(KeeperRoundTest, QueueThatGrowsAndIsNeverTakenGetsAWorkerToo) {
  for (int i = 0; i < 3; ++i) {
    std::string error;
    ASSERT_TRUE(AppendToQueue("s", {"{}"}, error)) << error;
    SetTime(QueuePath("s"), NOW + i * ROUND);
    round->Run(NOW + i * ROUND);
  }
  EXPECT_THAT(sent, ElementsAre(Upsert()));
}

TEST_F(KeeperRoundTest, QueueThatIsTakenAndWrittenAnewNeedsNoWorker) {
  std::vector<std::unique_ptr<ScopedFd>> held;  // whose inodes are given to no other file
  for (int i = 0; i < 6; ++i) {
    MakeOld(QueuePath("s"), 100);
    held.push_back(std::make_unique<ScopedFd>(open(QueuePath("s").c_str(), O_RDONLY | O_CLOEXEC)));
    round->Run(NOW + i * ROUND);
    ASSERT_EQ(unlink(QueuePath("s").c_str()), 0);
  }
  EXPECT_THAT(sent, IsEmpty());
}

TEST_F(KeeperRoundTest, DrainedCopyThatNobodyWorksOnGetsAWorker) {
  MakeOld(DrainedPath("s"), 100);
  for (int i = 0; i < 3; ++i) {
    round->Run(NOW + i * ROUND);
  }
  EXPECT_THAT(sent, ElementsAre(Upsert()));
}

TEST_F(KeeperRoundTest, QueueThatWaitsForAReasonNeedsNoWorker) {
  const auto run = [this] {
    for (int i = 0; i < 6; ++i) {
      round->Run(NOW + i * ROUND);
    }
  };
  MakeOld(QueuePath("s"), 100);
  lives = false;
  run();
  lives = true;
  ASSERT_TRUE(store->SetPause(0));
  run();
  ASSERT_TRUE(store->SetPause(NOW + 1000));
  run();
  ASSERT_TRUE(store->SetPause(-1));
  for (int i = 0; i < 6; ++i) {
    MakeOld(DrainedPath("s"), 1);
    round->Run(NOW + i * ROUND);
    ASSERT_EQ(unlink(DrainedPath("s").c_str()), 0);
  }
  ProgressWriter pass(WorkerProgressPath("s"));
  pass.Begin(Work::REINDEX, std::nullopt);
  pass.Write();
  run();

  EXPECT_THAT(sent, IsEmpty());
}

TEST_F(KeeperRoundTest, ShareThatAppearsGetsAWorkerAndALookAtOnce) {
  EXPECT_TRUE(IsTouchedBy([&] { round->Appear("s", NOW); }));
  EXPECT_THAT(sent, ElementsAre(Upsert()));
  round->Appear("unknown", NOW);
  EXPECT_EQ(sent.size(), 1U);

  lives = false;
  EXPECT_TRUE(IsTouchedBy([&] { round->Appear("s", NOW); }));
  EXPECT_EQ(sent.size(), 1U);
}

TEST_F(KeeperRoundTest, ShareWhoseDiskIsAwayGetsNoWorker) {
  ASSERT_EQ(rmdir(root.c_str()), 0);
  round->Appear("s", NOW);
  EXPECT_THAT(sent, IsEmpty());
}

TEST_F(KeeperRoundTest, PauseThatHasPassedIsEndedTwiceASecondApart) {
  ASSERT_TRUE(store->SetPause(NOW - 1));
  round->Run(NOW);
  EXPECT_THAT(sent, ElementsAre(RESUME, RESUME));
  EXPECT_EQ(waited, std::chrono::seconds(1));
  EXPECT_EQ(Pause(), -1);

  round->Run(NOW + ROUND);
  EXPECT_EQ(sent.size(), 2U);
}

TEST_F(KeeperRoundTest, PauseThatHasNotPassedStays) {
  for (const int64_t resume_time : {int64_t{0}, int64_t{-1}, NOW, NOW + 1}) {
    ASSERT_TRUE(store->SetPause(resume_time));
    round->Run(NOW);
    EXPECT_EQ(Pause(), resume_time);
  }
  EXPECT_THAT(sent, IsEmpty());
}

TEST_F(KeeperRoundTest, PauseIsClearedWithoutADaemonAndKeptWhenItDoesNotAnswer) {
  ASSERT_TRUE(store->SetPause(NOW - 1));
  answer = Reply::NO_ANSWER;
  round->Run(NOW);
  EXPECT_EQ(Pause(), NOW - 1);
  EXPECT_EQ(sent.size(), 1U);

  lives = false;
  round->Run(NOW);
  EXPECT_EQ(Pause(), -1);
  EXPECT_EQ(sent.size(), 1U);
}

TEST_F(KeeperRoundTest, StopBetweenTheTwoLeavesThePauseStored) {
  ASSERT_TRUE(store->SetPause(NOW - 1));
  stopping = true;
  round->Run(NOW);
  EXPECT_THAT(sent, ElementsAre(RESUME));
  EXPECT_EQ(Pause(), NOW - 1);
}

TEST_F(KeeperRoundTest, PauseThatIsMadeMeanwhileIsToldAgainAndStays) {
  ASSERT_TRUE(store->SetPause(NOW - 1));
  during_send = [this] { ASSERT_TRUE(store->SetPause(0)); };
  round->Run(NOW);
  EXPECT_THAT(sent, ElementsAre(RESUME, R"({"type":"pause","data":{"resume_time":0}})"));
  EXPECT_EQ(Pause(), 0);
}

}  // namespace fileindexd
