// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/queue_appender.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/inotify.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <csignal>

#include "state/layout.h"
#include "state/queue_folding.h"
#include "state/queue_writer.h"
#include "tests/unit/state/fixture.h"

namespace fileindexd {
namespace {

using Texts = std::vector<std::string>;

class QueueAppenderTest : public StateTest {
 protected:
  QueueAppenderTest() : queue(QueuePath("s")) {}

  // Takes from `left` what it is asked for.
  Appended Append() {
    return appender.Append(
        [this](size_t most) {
          const auto taken = std::min(most, left.size());
          const Texts given(left.begin(), left.begin() + static_cast<std::ptrdiff_t>(taken));
          left.erase(left.begin(), left.begin() + static_cast<std::ptrdiff_t>(taken));
          return given;
        },
        error);
  }
  Appended Append(const Texts& lines) {
    left = lines;
    return Append();
  }

  uint64_t Lines() const {
    const std::string text = ReadFile(queue);
    return static_cast<uint64_t>(std::count(text.begin(), text.end(), '\n'));
  }

  std::string queue;
  std::string error;
  Texts left;
  QueueAppender appender{"s"};
};

TEST_F(QueueAppenderTest, LinesFollowEachOtherInAPrivateFile) {
  EXPECT_EQ(Append({"one", "two"}), Appended::DONE) << error;
  EXPECT_EQ(Append({"three"}), Appended::DONE) << error;

  EXPECT_EQ(ReadFile(queue), "one\ntwo\nthree\n");
  EXPECT_EQ(ModeOf(queue), 0600U);
}

TEST_F(QueueAppenderTest, AHeldLockIsNotWaitedForAndNothingIsAskedFor) {
  ASSERT_TRUE(AppendToQueue("s", {"one"}, error)) << error;
  ScopedFd holder(open(queue.c_str(), O_RDONLY | O_CLOEXEC));
  ASSERT_EQ(flock(holder.fd, LOCK_EX), 0);

  EXPECT_EQ(Append({"two"}), Appended::LOCKED);
  EXPECT_EQ(left, Texts({"two"}));

  holder.Close();
  EXPECT_EQ(Append(), Appended::DONE) << error;
  EXPECT_EQ(ReadFile(queue), "one\ntwo\n");
}

TEST_F(QueueAppenderTest, RefusedTriesTellTheDaemonNothing) {
  ASSERT_TRUE(AppendToQueue("s", {"one"}, error)) << error;
  const ScopedFd holder(open(queue.c_str(), O_RDONLY | O_CLOEXEC));
  ASSERT_EQ(flock(holder.fd, LOCK_EX), 0);
  const ScopedFd watch(inotify_init1(IN_CLOEXEC | IN_NONBLOCK));
  ASSERT_GE(inotify_add_watch(watch.fd, ShareFolder("s").c_str(), IN_CLOSE_WRITE), 0);

  for (int i = 0; i < 10; ++i) {
    EXPECT_EQ(Append({"two"}), Appended::LOCKED);
  }

  char events[4096];
  EXPECT_LT(read(watch.fd, events, sizeof events), 0);
}

TEST_F(QueueAppenderTest, AFileThatWasMovedAwayBeforeItsLockWasTakenIsLeft) {
  ASSERT_TRUE(AppendToQueue("s", {"one"}, error)) << error;
  ScopedFd holder(open(queue.c_str(), O_RDONLY | O_CLOEXEC));
  ASSERT_EQ(flock(holder.fd, LOCK_EX), 0);
  ASSERT_EQ(Append({"two"}), Appended::LOCKED);  // and the file stays open
  ASSERT_EQ(rename(queue.c_str(), DrainedPath("s").c_str()), 0);
  holder.Close();

  EXPECT_EQ(Append(), Appended::DONE) << error;

  EXPECT_EQ(ReadFile(DrainedPath("s")), "one\n");
  EXPECT_EQ(ReadFile(queue), "two\n");
}

TEST_F(QueueAppenderTest, TheFileNeverHoldsMoreThanTheLimit) {
  const Texts others(QUEUE_LINE_LIMIT - 10, "another's");
  ASSERT_TRUE(AppendToQueue("s", others, error)) << error;

  EXPECT_EQ(Append(Texts(7, "ours")), Appended::DONE);
  ASSERT_TRUE(AppendToQueue("s", {"another's"}, error)) << error;
  EXPECT_EQ(Append(Texts(7, "ours")), Appended::DONE);
  EXPECT_EQ(left.size(), 5U);
  EXPECT_EQ(Append(), Appended::FULL);
  EXPECT_EQ(left.size(), 5U);
  EXPECT_EQ(Lines(), QUEUE_LINE_LIMIT);

  ASSERT_EQ(rename(queue.c_str(), DrainedPath("s").c_str()), 0);
  EXPECT_EQ(Append(), Appended::DONE);
  EXPECT_EQ(Lines(), 5U);
}

TEST_F(QueueAppenderTest, AFileThatOthersFilledIsFull) {
  ASSERT_TRUE(AppendToQueue("s", Texts(QUEUE_LINE_LIMIT + 100, "x"), error)) << error;

  EXPECT_EQ(Append({"ours"}), Appended::FULL);
  EXPECT_EQ(Append({"ours"}), Appended::FULL);
  EXPECT_EQ(Lines(), QUEUE_LINE_LIMIT + 100);
}

TEST_F(QueueAppenderTest, ANewFileIsCountedAnewWhateverItsInode) {
  for (int round = 0; round < 20; ++round) {
    ASSERT_EQ(Append(Texts(QUEUE_LINE_LIMIT, "x")), Appended::DONE) << round << error;
    ASSERT_TRUE(left.empty());
    ASSERT_EQ(Append({"y"}), Appended::FULL);
    ASSERT_EQ(unlink(queue.c_str()), 0);
    ASSERT_TRUE(AppendToQueue("s", {"another's"}, error)) << error;
    ASSERT_EQ(Append(Texts(QUEUE_LINE_LIMIT, "x")), Appended::DONE) << round << error;
    ASSERT_EQ(left.size(), 1U);
    ASSERT_EQ(unlink(queue.c_str()), 0);
  }
}

TEST_F(QueueAppenderTest, LinesOfOthersAreMetBeforeThoseThatAreGiven) {
  Texts met;
  QueueAppender meeting("s", [&met](std::string_view line) { met.emplace_back(line); });
  const auto append = [&] {
    return meeting.Append(
        [&met](size_t) {
          met.emplace_back("given");
          return Texts{"ours"};
        },
        error);
  };
  ASSERT_TRUE(AppendToQueue("s", {"one", "two"}, error)) << error;
  ASSERT_EQ(append(), Appended::DONE);
  ASSERT_EQ(append(), Appended::DONE);
  ASSERT_TRUE(AppendToQueue("s", {"three"}, error)) << error;
  ASSERT_EQ(append(), Appended::DONE);
  EXPECT_EQ(met, Texts({"one", "two", "given", "given", "three", "given"}));
  EXPECT_EQ(meeting.FileNumber(), 1U);

  met.clear();
  WriteFile(queue, ReadFile(queue) + "ha");
  ASSERT_EQ(append(), Appended::DONE);
  EXPECT_EQ(met, Texts({"ha", "given"}));
  ASSERT_EQ(append(), Appended::DONE);
  EXPECT_EQ(met, Texts({"ha", "given", "ha", "ours", "given"}));

  met.clear();
  ASSERT_EQ(unlink(queue.c_str()), 0);
  ASSERT_TRUE(AppendToQueue("s", {"anew"}, error)) << error;
  ASSERT_EQ(append(), Appended::DONE);
  EXPECT_EQ(met, Texts({"anew", "given"}));
  EXPECT_EQ(meeting.FileNumber(), 2U);
}

TEST_F(QueueAppenderTest, LinesOfAFullFileAreMetOnceThereIsRoom) {
  Texts met;
  QueueAppender meeting("s", [&met](std::string_view line) { met.emplace_back(line); });
  const auto append = [&] { return meeting.Append([](size_t) { return Texts{"ours"}; }, error); };
  ASSERT_TRUE(AppendToQueue("s", Texts(QUEUE_LINE_LIMIT, "x"), error)) << error;
  EXPECT_EQ(append(), Appended::FULL);
  EXPECT_TRUE(met.empty());

  ASSERT_EQ(unlink(queue.c_str()), 0);
  ASSERT_TRUE(AppendToQueue("s", {"anew"}, error)) << error;
  EXPECT_EQ(append(), Appended::DONE);
  EXPECT_EQ(met, Texts({"anew"}));
}

TEST_F(QueueAppenderTest, HalfALineIsEndedAndCounted) {
  ASSERT_EQ(Append({"one"}), Appended::DONE);
  WriteFile(queue, "one\nha");

  EXPECT_EQ(Append(Texts(QUEUE_LINE_LIMIT, "x")), Appended::DONE);

  EXPECT_EQ(left.size(), 2U);
  EXPECT_TRUE(ReadFile(queue).starts_with("one\nha\nx\n"));
}

TEST_F(QueueAppenderTest, WhatDoesNotFitTheDiskIsTakenBack) {
  ASSERT_EQ(Append({"one"}), Appended::DONE);
  const int status = WaitFor(Fork([&] {
    signal(SIGXFSZ, SIG_IGN);
    const rlimit limit = {10, RLIM_INFINITY};
    setrlimit(RLIMIT_FSIZE, &limit);
    const bool failed = Append({"two", "a line that is too long"}) == Appended::FAILED;
    const rlimit more = {RLIM_INFINITY, RLIM_INFINITY};
    setrlimit(RLIMIT_FSIZE, &more);
    return failed && Append({"two"}) == Appended::DONE ? 0 : 1;
  }));

  EXPECT_EQ(status, 0);
  EXPECT_EQ(ReadFile(queue), "one\ntwo\n");
}

TEST_F(QueueAppenderTest, OnlyARegularFileIsWrittenTo) {
  ASSERT_TRUE(MakeShareFolder("s", error)) << error;
  ASSERT_EQ(mkfifo(queue.c_str(), 0600), 0);

  EXPECT_EQ(Append({"one"}), Appended::FAILED);
  EXPECT_NE(error.find(queue), std::string::npos) << error;
}

}  // namespace
}  // namespace fileindexd
