// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/queue_writer.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/inotify.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <csignal>
#include <filesystem>
#include <set>

#include "base/scoped_fd.h"
#include "state/layout.h"
#include "tests/unit/state/fixture.h"

namespace fileindexd {
namespace {

class QueueWriterTest : public StateTest {
 protected:
  QueueWriterTest() : queue(QueuePath("s")) {}

  bool Append(const std::vector<std::string>& lines) { return AppendToQueue("s", lines, error); }

  std::string queue;
  std::string error;
};

TEST_F(QueueWriterTest, LinesFollowEachOtherInAPrivateFile) {
  const mode_t before = umask(0);
  ASSERT_TRUE(Append({"one", "two"})) << error;
  ASSERT_TRUE(Append({"three"})) << error;
  umask(before);

  EXPECT_EQ(ReadFile(queue), "one\ntwo\nthree\n");
  EXPECT_EQ(ModeOf(queue), 0600U);
  EXPECT_EQ(WaitingLines("s"), 3U);
}

TEST_F(QueueWriterTest, NoLinesOnlyCreateAndCloseTheFile) {
  ASSERT_TRUE(MakeShareFolder("s", error)) << error;
  const ScopedFd watch(inotify_init1(IN_CLOEXEC | IN_NONBLOCK));
  ASSERT_GE(inotify_add_watch(watch.fd, ShareFolder("s").c_str(), IN_CLOSE_WRITE), 0);

  ASSERT_TRUE(Append({})) << error;

  char events[4096];
  EXPECT_GT(read(watch.fd, events, sizeof events), 0);
  EXPECT_EQ(ReadFile(queue), "");
  EXPECT_TRUE(Exists(queue));
}

TEST_F(QueueWriterTest, ATouchIsSeenAndWaitsForNobody) {
  ASSERT_TRUE(MakeShareFolder("s", error)) << error;
  const ScopedFd watch(inotify_init1(IN_CLOEXEC | IN_NONBLOCK));
  ASSERT_GE(inotify_add_watch(watch.fd, ShareFolder("s").c_str(), IN_CLOSE_WRITE), 0);
  char events[4096];

  ASSERT_TRUE(TouchQueue("s", error)) << error;
  EXPECT_GT(read(watch.fd, events, sizeof events), 0);
  EXPECT_EQ(ModeOf(queue), 0600U);

  const ScopedFd holder(open(queue.c_str(), O_RDONLY | O_CLOEXEC));
  ASSERT_EQ(flock(holder.fd, LOCK_EX), 0);
  EXPECT_TRUE(TouchQueue("s", error)) << error;
  EXPECT_GT(read(watch.fd, events, sizeof events), 0);
  EXPECT_EQ(ReadFile(queue), "");

  EXPECT_FALSE(TouchQueue("..", error));
}

TEST_F(QueueWriterTest, ALineThatWouldBeTwoIsRefused) {
  EXPECT_FALSE(Append({"good", "bad\nline"}));
  EXPECT_FALSE(Append({std::string("nul\0", 4)}));
  EXPECT_FALSE(Exists(queue));
}

TEST_F(QueueWriterTest, HalfALineLeftByAKilledWriterCostsOneLine) {
  ASSERT_TRUE(Append({"one"})) << error;
  WriteFile(queue, "one\nha");

  ASSERT_TRUE(Append({"two"})) << error;

  EXPECT_EQ(ReadFile(queue), "one\nha\ntwo\n");
}

TEST_F(QueueWriterTest, WhatDoesNotFitIsTakenBack) {
  ASSERT_TRUE(Append({"one"})) << error;
  const int status = WaitFor(Fork([&] {
    signal(SIGXFSZ, SIG_IGN);
    const rlimit limit = {10, 10};
    setrlimit(RLIMIT_FSIZE, &limit);
    std::string reason;
    return AppendToQueue("s", {"two", "a line that is too long"}, reason) ? 1 : 0;
  }));

  EXPECT_EQ(status, 0);
  EXPECT_EQ(ReadFile(queue), "one\n");
}

TEST_F(QueueWriterTest, OnlyARegularFileIsWrittenTo) {
  ASSERT_TRUE(MakeShareFolder("s", error)) << error;
  ASSERT_EQ(mkfifo(queue.c_str(), 0600), 0);

  EXPECT_FALSE(Append({"one"}));
  EXPECT_NE(error.find(queue), std::string::npos) << error;
  EXPECT_EQ(WaitingLines("s"), 0U);
}

TEST_F(QueueWriterTest, AnInvalidShareIsRefused) {
  for (const char* bad : {"", "..", ".s", "a/b", "a\n"}) {
    EXPECT_FALSE(AppendToQueue(bad, {"x"}, error)) << bad;
  }
}

TEST_F(QueueWriterTest, BothFilesCountAndAnOpenEndToo) {
  EXPECT_EQ(WaitingLines("s"), 0U);
  ASSERT_TRUE(Append({"one", "two"})) << error;
  WriteFile(DrainedPath("s"), std::string(200000, '\n') + "open end");

  EXPECT_EQ(WaitingLines("s"), 200003U);
}

// As it is between the two looks at a queue that the daemon is moving aside.
TEST_F(QueueWriterTest, FileUnderBothNamesCountsOnce) {
  ASSERT_TRUE(Append({"one", "two"})) << error;
  ASSERT_EQ(link(queue.c_str(), DrainedPath("s").c_str()), 0);

  EXPECT_EQ(WaitingLines("s"), 2U);
}

// The one test that waits: the limit itself is what it is about.
TEST_F(QueueWriterTest, AHeldLockIsWaitedForFiveSeconds) {
  ASSERT_TRUE(Append({"one"})) << error;
  const ScopedFd holder(open(queue.c_str(), O_RDONLY | O_CLOEXEC));
  ASSERT_EQ(flock(holder.fd, LOCK_EX), 0);
  const auto begin = std::chrono::steady_clock::now();

  EXPECT_FALSE(Append({"two"}));

  const auto waited = std::chrono::steady_clock::now() - begin;
  EXPECT_GE(waited, std::chrono::milliseconds(4900));
  EXPECT_LT(waited, std::chrono::seconds(60));  // on a machine that stands still now and then
  EXPECT_EQ(ReadFile(queue), "one\n");
}

TEST_F(QueueWriterTest, AReleasedLockIsTakenInTheSameCall) {
  ASSERT_TRUE(Append({})) << error;
  ScopedFd holder(open(queue.c_str(), O_RDONLY | O_CLOEXEC));
  ASSERT_EQ(flock(holder.fd, LOCK_EX), 0);
  const pid_t writer = Fork([&] {
    holder.Close();  // the lock belongs to the parent's descriptor as well, and stays
    std::string reason;
    return AppendToQueue("s", {"one"}, reason) ? 0 : 1;
  });
  // The file is moved away under the waiting writer, as a drain does.
  ASSERT_EQ(rename(queue.c_str(), DrainedPath("s").c_str()), 0);
  holder.Close();

  EXPECT_EQ(WaitFor(writer), 0);
  EXPECT_EQ(ReadFile(DrainedPath("s")), "");
  EXPECT_EQ(ReadFile(queue), "one\n");
}

// Moves the queue aside under its lock and collects its lines, as the daemon does.
void Drain(const std::string& queue, const std::string& drained,
           std::multiset<std::string>& lines) {
  const ScopedFd file(open(queue.c_str(), O_RDONLY | O_CLOEXEC));
  if (file.fd < 0 || flock(file.fd, LOCK_EX) != 0) {
    return;
  }
  ASSERT_EQ(rename(queue.c_str(), drained.c_str()), 0);
  const std::vector<std::string> taken = ReadLines(drained);
  lines.insert(taken.begin(), taken.end());
  ASSERT_EQ(unlink(drained.c_str()), 0);
}

TEST_F(QueueWriterTest, WritersThatRaceAMoverLoseNoLine) {
  constexpr int WRITERS = 4;
  constexpr int LINES = 1000;
  constexpr int MOST_TRIES = 100;
  for (int writer = 0; writer < WRITERS; ++writer) {
    const pid_t child = Fork([writer] {
      std::string reason;
      for (int i = 0; i < LINES; ++i) {
        // A machine that stands still uses the wait for the lock up; nothing is written then.
        int tries = 0;
        while (!AppendToQueue("s", {std::to_string(writer) + " " + std::to_string(i)}, reason)) {
          if (!reason.starts_with("cannot lock ") || ++tries == MOST_TRIES) {
            return 1;
          }
        }
      }
      return 0;
    });
    ASSERT_GT(child, 0);
  }

  std::multiset<std::string> lines;
  for (int left = WRITERS; left > 0;) {
    Drain(queue, DrainedPath("s"), lines);
    int status = 0;
    if (waitpid(-1, &status, WNOHANG) > 0) {
      EXPECT_EQ(status, 0);
      --left;
    }
  }
  Drain(queue, DrainedPath("s"), lines);

  EXPECT_EQ(lines.size(), static_cast<size_t>(WRITERS) * LINES);
  EXPECT_EQ(std::set<std::string>(lines.begin(), lines.end()).size(), lines.size());
}

}  // namespace
}  // namespace fileindexd
