// SPDX-License-Identifier: GPL-2.0-or-later
#include "search/opener.h"

#include <gtest/gtest.h>

#include <future>
#include <memory>
#include <string>

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

TEST_F(OpenerTest, WhoGoesWhileItHangsIsNotHeldUp) {
  std::promise<void> gone;
  const auto question = [this, &gone, opened = gate.get_future().share()]() -> Opener::Answer {
    begun.set_value();
    opened.wait();
    const std::shared_ptr<void> file(nullptr, [&gone](void*) { gone.set_value(); });
    return [file] {};
  };
  ASSERT_TRUE(opener->Ask(question, now));
  begun.get_future().wait();

  opener.reset();
  gate.set_value();
  gone.get_future().wait();
}

}  // namespace
}  // namespace fileindexd
