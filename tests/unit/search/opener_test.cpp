// SPDX-License-Identifier: GPL-2.0-or-later
#include "search/opener.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sched.h>
#include <unistd.h>

#include <csignal>
#include <future>
#include <memory>
#include <string>
#include <thread>

namespace fileindexd {
namespace {

using Clock = std::chrono::steady_clock;
using std::chrono::seconds;

class OpenerTest : public testing::Test {
 protected:
  void Ask(const std::string& word) {
    const auto question = [this, word]() -> Opener::Answer {
      return [this, word] { heard += word; };
    };
    ASSERT_TRUE(opener->Ask(question, now));
  }
  // Answers when the gate is opened.
  void AskAndHang(const std::string& word) {
    const auto question = [this, word, opened = gate.get_future().share()]() -> Opener::Answer {
      begun.set_value();
      opened.wait();
      return [this, word] { heard += word; };
    };
    ASSERT_TRUE(opener->Ask(question, now));
  }
  void Await() {
    while (opener->IsWaiting()) {
      std::vector<pollfd> polled;
      opener->AddPolled(polled);
      ASSERT_EQ(poll(polled.data(), polled.size(), 60'000), 1);
      opener->Take(now);
    }
  }

  std::unique_ptr<Opener> opener = std::make_unique<Opener>();
  std::promise<void> begun;  // what hangs
  std::promise<void> gate;
  // Shared with who sets it, and may still be at that when the test is gone.
  std::shared_ptr<std::promise<void>> gone = std::make_shared<std::promise<void>>();
  Clock::time_point now = Clock::time_point(std::chrono::hours(1));
  std::string heard;
};

TEST_F(OpenerTest, AnswersComeInOrderToWhoTakesThem) {
  Ask("a");
  Ask("b");
  Await();
  Ask("c");
  Await();
  EXPECT_EQ(heard, "abc");
}

TEST_F(OpenerTest, WhatIsNotTakenIsStillTold) {
  AskAndHang("a");
  Ask("b");
  Ask("c");
  gate.set_value();
  std::vector<pollfd> polled;
  opener->AddPolled(polled);
  while (heard.size() < 2) {
    ASSERT_EQ(poll(polled.data(), polled.size(), 60'000), 1);
    opener->Take(now, 2 - heard.size());
  }
  EXPECT_EQ(heard, "ab");
  EXPECT_TRUE(opener->IsWaiting());
  Await();
  EXPECT_EQ(heard, "abc");
}

TEST_F(OpenerTest, WorkBehindAnAnswerMayTakeAsLongAsItTakes) {
  const auto question = [this]() -> Opener::Answer { return [this] { heard += "a"; }; };
  const auto work = [this, opened = gate.get_future().share()] {
    begun.set_value();
    opened.wait();
  };
  ASSERT_TRUE(opener->Ask(question, now, work));
  begun.get_future().wait();
  EXPECT_EQ(opener->Deadline(), Clock::time_point::max());
  EXPECT_EQ(heard, "");

  gate.set_value();
  Await();
  EXPECT_EQ(heard, "a");
}

TEST_F(OpenerTest, NobodyWaitsForWhatHangsAndItsAnswerIsDropped) {
  AskAndHang("a");
  begun.get_future().wait();
  opener->Take(now);
  EXPECT_EQ(opener->Deadline(), now + seconds(10));
  Ask("b");

  opener->Drop();
  EXPECT_FALSE(opener->IsWaiting());
  EXPECT_EQ(opener->Deadline(), Clock::time_point::max());
  Ask("c");
  opener->Take(now);
  EXPECT_EQ(heard, "") << "one thread";
  gate.set_value();
  Await();
  EXPECT_EQ(heard, "c");
}

TEST_F(OpenerTest, EachAnswerMovesTheDeadline) {
  Ask("a");
  AskAndHang("b");
  now += seconds(5);
  while (heard.empty()) {
    std::vector<pollfd> polled;
    opener->AddPolled(polled);
    ASSERT_EQ(poll(polled.data(), polled.size(), 60'000), 1);
    opener->Take(now);
  }
  EXPECT_EQ(opener->Deadline(), now + seconds(10));
  gate.set_value();
  Await();
}

TEST_F(OpenerTest, AnotherQuestionDoesNotMoveTheDeadline) {
  const Clock::time_point first = now;
  AskAndHang("a");
  now += seconds(5);
  Ask("b");
  EXPECT_EQ(opener->Deadline(), first + seconds(10));
  gate.set_value();
  Await();
}

TEST_F(OpenerTest, WhatWasTakenIsNotToldAgain) {
  Ask("a");
  AskAndHang("b");
  begun.get_future().wait();
  opener->Take(now);
  EXPECT_EQ(heard, "a");

  std::vector<pollfd> polled;
  opener->AddPolled(polled);
  EXPECT_EQ(poll(polled.data(), polled.size(), 0), 0);
  gate.set_value();
  Await();
}

// What is freed where closing hangs: tells when it is, and then waits for the gate.
class OpenerWasteTest : public OpenerTest {
 protected:
  std::shared_ptr<void> Held() {
    return {nullptr, [this, freed = gone, opened = gate.get_future().share()](void*) {
              freed_by = std::this_thread::get_id();
              begun.set_value();
              if (freed_by != own) {
                opened.wait();
              }
              freed->set_value();
            }};
  }
  void ExpectFreedElsewhere() {
    begun.get_future().wait();
    EXPECT_NE(freed_by, own);
    gate.set_value();
    gone->get_future().wait();
  }

  std::thread::id own = std::this_thread::get_id();
  std::thread::id freed_by;
};

TEST_F(OpenerWasteTest, AnAnswerThatNobodyTakesIsFreedByTheThread) {
  std::shared_ptr<void> file = Held();
  ASSERT_TRUE(
      opener->Ask([&file]() -> Opener::Answer { return [kept = std::move(file)] {}; }, now));
  std::vector<pollfd> polled;
  opener->AddPolled(polled);
  ASSERT_EQ(poll(polled.data(), polled.size(), 60'000), 1);

  opener->Drop();
  ExpectFreedElsewhere();
}

TEST_F(OpenerWasteTest, AQuestionThatIsNotRunIsFreedByTheThread) {
  std::promise<void> let_go;
  std::promise<void> hangs;
  const auto hang = [&, opened = let_go.get_future().share()]() -> Opener::Answer {
    hangs.set_value();
    opened.wait();
    return [] {};
  };
  ASSERT_TRUE(opener->Ask(hang, now));
  hangs.get_future().wait();
  ASSERT_TRUE(opener->Ask([file = Held()]() -> Opener::Answer { return [] {}; }, now));

  opener->Drop();
  opener.reset();
  let_go.set_value();
  ExpectFreedElsewhere();
}

// Both ends of a pipe: of the one, the other tells when it is closed.
class OpenerFileTest : public OpenerTest {
 protected:
  void SetUp() override {
    int ends[2] = {-1, -1};
    ASSERT_EQ(pipe2(ends, O_CLOEXEC), 0);
    reading.fd = ends[0];
    ScopedFd writing(ends[1]);
    file = opener->Keep(writing);
    EXPECT_EQ(writing.fd, -1);
  }
  // Its number.
  pid_t Thread() {
    pid_t number = 0;
    const auto question = [&number]() -> Opener::Answer {
      number = gettid();
      return [] {};
    };
    EXPECT_TRUE(opener->Ask(question, now));
    Await();
    return number;
  }
  bool IsClosed(int timeout_ms) const {
    pollfd closed = {reading.fd, 0, 0};
    return poll(&closed, 1, timeout_ms) == 1 && closed.revents == POLLHUP;
  }

  ScopedFd reading;
  std::shared_ptr<ScopedFd> file;
};

TEST_F(OpenerFileTest, AFileIsClosedByTheThreadWhenItsTurnComes) {
  AskAndHang("a");
  begun.get_future().wait();
  std::shared_ptr<ScopedFd> other = file;
  file.reset();
  other.reset();
  EXPECT_FALSE(IsClosed(0)) << "the thread hangs";
  opener->Drop();
  EXPECT_FALSE(IsClosed(0));

  gate.set_value();
  EXPECT_TRUE(IsClosed(60'000));
}

TEST_F(OpenerFileTest, AFileMayOutliveTheOpenerAndItsThreadStaysForIt) {
  const pid_t thread = Thread();
  opener->Drop();
  EXPECT_EQ(Thread(), thread) << "one thread";
  opener.reset();
  EXPECT_FALSE(IsClosed(0));
  for (int time = 0; time < 1000; ++time) {
    ASSERT_EQ(tgkill(getpid(), thread, 0), 0);
    sched_yield();
  }

  file.reset();
  EXPECT_TRUE(IsClosed(60'000));
  while (tgkill(getpid(), thread, 0) == 0) {  // for ever, if it does not end
    sched_yield();
  }
}

TEST_F(OpenerTest, WhoGoesWhileItHangsIsNotHeldUp) {
  const auto question = [this, freed = gone,
                         opened = gate.get_future().share()]() -> Opener::Answer {
    begun.set_value();
    opened.wait();
    return [file = std::shared_ptr<void>(nullptr, [freed](void*) { freed->set_value(); })] {};
  };
  ASSERT_TRUE(opener->Ask(question, now));
  begun.get_future().wait();

  opener.reset();
  gate.set_value();
  gone->get_future().wait();
}

}  // namespace
}  // namespace fileindexd
