// SPDX-License-Identifier: GPL-2.0-or-later
#include "ctl/status_report.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace fileindexd {
namespace {

using testing::HasSubstr;
using testing::Not;

constexpr int64_t BEGAN = 1'900'000'000'000;  // milliseconds since the epoch

ProgressRecord Record(Work what, uint64_t done, std::optional<uint64_t> total, int64_t elapsed) {
  return {what, done, total, BEGAN, BEGAN + elapsed};
}

class ProgressReportTest : public testing::Test {
 protected:
  ProgressReportTest() { report.shares.resize(1); }

  void SetWork(const ProgressRecord& work) { report.shares[0].work = work; }
  Json::Value Shown() const { return ReportObject(report)["shares"][0]["progress"]; }
  std::string Text() const { return ReportText(report); }

  StatusReport report;
};

TEST_F(ProgressReportTest, RateAndTimeLeftAreThoseOfTheWorkSoFar) {
  SetWork(Record(Work::REINDEX, 3000, 10'000, 2000));

  EXPECT_EQ(Shown()["what"], "reindex");
  EXPECT_EQ(Shown()["done"].asUInt64(), 3000U);
  EXPECT_EQ(Shown()["total"], 10'000);
  EXPECT_EQ(Shown()["rate"], 1500);
  EXPECT_EQ(Shown()["seconds_left"], 5);  // 4.67
  EXPECT_THAT(Text(), HasSubstr(" reindex, 3000 of about 10000 entries, 1500 a second, "
                                "about 5 s left\n"));
}

TEST_F(ProgressReportTest, TimeLeftIsToldInUnitsThatFitIt) {
  const std::pair<uint64_t, const char*> cases[] = {
      {0, "about 0 s left"},          {1, "about 1 s left"},        {119, "about 119 s left"},
      {120, "about 2 min left"},      {7199, "about 119 min left"}, {7200, "about 2 h 0 min left"},
      {9000, "about 2 h 30 min left"}};
  for (const auto& [left, text] : cases) {
    SetWork(Record(Work::FIRST_INDEX, 100, 100 + left * 100, 1000));  // 100 a second

    EXPECT_EQ(Shown()["seconds_left"].asUInt64(), left);
    EXPECT_THAT(Text(), HasSubstr(std::string(", 100 a second, ") + text + "\n"));
  }
}

TEST_F(ProgressReportTest, OfLittleWorkNoRateIsTold) {
  const ProgressRecord cases[] = {
      Record(Work::REINDEX, 500, 1000, 499), Record(Work::REINDEX, 0, 1000, 60'000),
      Record(Work::REINDEX, 500, 1000, -3'600'000)};  // the clock was set back
  for (const ProgressRecord& work : cases) {
    SetWork(work);

    EXPECT_EQ(Shown()["rate"], Json::Value());
    EXPECT_EQ(Shown()["seconds_left"], Json::Value());
    EXPECT_THAT(Text(), HasSubstr(std::to_string(work.done) + " of about 1000 entries\n"));
  }

  SetWork(Record(Work::REINDEX, 500, 1000, 500));
  EXPECT_EQ(Shown()["rate"], 1000);
}

TEST_F(ProgressReportTest, SlowWorkHasATimeLeftThoughItsRateIsRoundedToNothing) {
  SetWork(Record(Work::COMPARISON, 1, 11, 10'000));

  EXPECT_EQ(Shown()["rate"], 0);
  EXPECT_EQ(Shown()["seconds_left"], 100);
}

TEST_F(ProgressReportTest, WithoutATotalThereIsARateAlone) {
  SetWork(Record(Work::FIRST_INDEX, 3000, std::nullopt, 2000));

  EXPECT_EQ(Shown()["total"], Json::Value());
  EXPECT_EQ(Shown()["rate"], 1500);
  EXPECT_EQ(Shown()["seconds_left"], Json::Value());
  EXPECT_THAT(Text(), HasSubstr(" first index, 3000 entries, 1500 a second\n"));
}

TEST_F(ProgressReportTest, TotalThatWasTooLowEndsTheEstimate) {
  SetWork(Record(Work::REINDEX, 3000, 2000, 2000));

  EXPECT_EQ(Shown()["total"], 2000);
  EXPECT_EQ(Shown()["seconds_left"], Json::Value());
  EXPECT_THAT(Text(), HasSubstr(" reindex, 3000 of about 3000 entries, 1500 a second\n"));
}

TEST_F(ProgressReportTest, WorkOfTheDaemonGoesBeforeAComparison) {
  report.shares[0].comparison = Record(Work::COMPARISON, 10, 20, 1000);
  EXPECT_EQ(Shown()["what"], "comparison");

  SetWork(Record(Work::UPDATE, 40, std::nullopt, 1000));

  EXPECT_EQ(Shown()["what"], "update");
  EXPECT_THAT(Text(), HasSubstr(" update, 40 changes, 40 a second\n"));
  EXPECT_THAT(Text(), HasSubstr(" comparison, 10 of about 20 entries, 10 a second, "));
}

TEST_F(ProgressReportTest, WithoutWorkNothingIsShown) {
  EXPECT_EQ(Shown(), Json::Value());
  EXPECT_THAT(Text(), Not(HasSubstr("in progress")));
}

}  // namespace
}  // namespace fileindexd
