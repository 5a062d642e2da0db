// SPDX-License-Identifier: GPL-2.0-or-later
#include "ctl/stats_output.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace fileindexd {
namespace {

using testing::ElementsAre;

class StatisticsLinesTest : public testing::Test {
 protected:
  void AddDuplicates(uint64_t left_out) {
    wish.duplicates = true;
    statistics.duplicates.sets = {{10, 2, {{"s", "/s/a"}, {"s", "/s/b"}}}};
    statistics.duplicates.set_count = 1 + left_out;
    statistics.duplicates.files = 2 + 2 * left_out;
    statistics.duplicates.spare = 10;
  }
  std::vector<std::string> Lines(const std::optional<Screen>& screen) {
    return StatisticsLines(wish, statistics, screen);
  }

  StatisticsWish wish;
  Statistics statistics;
};

TEST_F(StatisticsLinesTest, PartsAreSeparatedThroughAPipeToo) {
  wish.totals = true;
  wish.by = GroupBy::KIND;
  statistics.totals = {{"s", 1, 2, 0, 300}};
  statistics.groups = {{"", "document", 1, 300}};

  EXPECT_THAT(Lines(std::nullopt), ElementsAre("300\t1\t2\t0\ts", "", "300\t1\tdocument"));
}

}  // namespace
}  // namespace fileindexd
