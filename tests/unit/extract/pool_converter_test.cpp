// SPDX-License-Identifier: GPL-2.0-or-later
// Documents that another program has to make readable.
#include <chrono>
#include <string>
#include <vector>

#include "scripted_pool_fixture.h"

namespace fileindexd {

namespace {

class PoolConverterTest : public ScriptedPoolFixture {
 public:
  // However long it takes, as if no time passed: until a converter runs beside its helper and who
  // starts both, or only these are left.
  void AwaitConverter() { AwaitPolled(4); }
  void AwaitConverted() {
    AwaitConverter();
    AwaitPolled(3);
  }
  void AwaitPolled(size_t count) {
    const auto begin = std::chrono::steady_clock::now();
    std::vector<pollfd> polled;
    pool->AddPolled(polled);
    while (polled.size() != count) {
      Wait(begin + LIMIT);
      EXPECT_TRUE(pool->Work(begin).empty());
      polled.clear();
      pool->AddPolled(polled);
    }
  }
};

TEST_F(PoolConverterTest, AConverterThatMakesNothingLeavesTheFields) {
  const ExtractOutcome outcome = Run("convert catdoc");
  EXPECT_EQ(Told(outcome), "failed: catdoc: code 9");
  ASSERT_EQ(outcome.content.texts.size(), 1u);
  EXPECT_EQ(outcome.content.texts[0].text, "kept");
}

TEST_F(PoolConverterTest, WhatAConverterMakesIsReadAndHowItEndsIsTold) {
  const struct {
    const char* document;
    const char* told;
    const char* text;
  } rows[] = {{"say text some words", "done", "some words"},
              {"say fail no words", "failed: catdoc: no words", "no words"},
              {"say never", "lost: the helper ended before it began, with code 5", ""},
              {"say unread it is gone", "unread: it is gone", ""},
              {"say crash", "killed: the helper ended with SIGSEGV", ""},
              {"part text some", "failed: catdoc: code 9", "some"},
              {"doors", "lost: catdoc: the doors cannot be closed", ""},
              {"program", "failed: catdoc: cannot be started", ""},
              {"killed", "done", "late"},
              {"kill", "failed: catdoc: SIGKILL", ""}};
  for (const auto& row : rows) {
    const ExtractOutcome outcome = Run("convert catdoc", row.document);
    EXPECT_EQ(Told(outcome), row.told) << row.document;
    EXPECT_EQ(outcome.content.text, row.text) << row.document;
    // The title that was found first goes with what is stored.
    const bool is_stored = Told(outcome) == "done" || Told(outcome).starts_with("failed");
    EXPECT_EQ(outcome.content.texts.size(), is_stored ? 1u : 0u) << row.document;
  }
}

TEST_F(PoolConverterTest, AConverterThatUsesItsTimeIsKilledAtTheFirstDeadline) {
  OpenWith(1, std::chrono::milliseconds(300));
  Submit(1, "convert catdoc", "spin");
  AwaitConverter();
  (void)AwaitStop();  // with more time used than the document has
  const auto ended = pool->Work(pool->Due());
  ASSERT_EQ(ended.size(), 1u);
  EXPECT_EQ(Told(ended[0]), "failed: catdoc: took longer than 300 ms");
  EXPECT_EQ(ended[0].content.texts.size(), 1u);
}

TEST_F(PoolConverterTest, AConverterThatGotNoProcessorTimeIsStartedAgain) {
  OpenWith(1, LIMIT);
  Submit(1, "convert catdoc", "starve");
  AwaitConverter();
  (void)AwaitStop();
  EXPECT_TRUE(PassDeadline().empty());
  const ExtractOutcome outcome = std::move(Await(1)[1]);
  EXPECT_EQ(Told(outcome), "done");
  EXPECT_EQ(outcome.content.text, "late");
}

TEST_F(PoolConverterTest, AConverterThatWaitsForEverFailsInTheEnd) {
  OpenWith(1, LIMIT);
  Submit(1, "convert catdoc", "slow");
  AwaitConverter();
  EXPECT_TRUE(PassDeadline().empty());
  EXPECT_TRUE(PassDeadline().empty());
  const auto ended = PassDeadline();
  ASSERT_EQ(ended.size(), 1u);
  EXPECT_EQ(Told(ended[0]), "failed: catdoc: took longer than 1200 s");
  EXPECT_EQ(Run("count").content.text, "2") << "its helper is not to blame";
}

TEST_F(PoolConverterTest, WhatAConverterMadeHasItsDeadline) {
  OpenWith(1, LIMIT);
  Submit(1, "convert catdoc", "say stop");
  AwaitConverted();
  EXPECT_EQ(ToldAfterThreeDeadlines(), "failed: catdoc: took longer than 1200 s");
}

TEST_F(PoolConverterTest, WhatAConverterMadeAndNoHelperBeginsIsNotTheFilesFault) {
  OpenWith(1, LIMIT);
  Submit(1, "convert catdoc", "say mute");
  AwaitConverted();
  const auto ended = PassDeadline();
  ASSERT_EQ(ended.size(), 1u);
  EXPECT_EQ(Told(ended[0]), std::string("lost: ") + SCRIPTED_HELPER + ": does not start in time");
}

}  // namespace

}  // namespace fileindexd
