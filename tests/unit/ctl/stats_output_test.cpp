// SPDX-License-Identifier: GPL-2.0-or-later
#include "ctl/stats_output.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace fileindexd {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;
using testing::StartsWith;

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

TEST_F(StatisticsLinesTest, SetsOfDuplicatesHaveNoHeading) {
  AddDuplicates(0);

  EXPECT_THAT(Lines(Screen{200, false}),
              ElementsAre(StartsWith("1 sets, 2 files, 10B to spare; probably alike"), "",
                          "10B  /s/a", "10B  /s/b"));
  EXPECT_THAT(Lines(std::nullopt),
              ElementsAre(StartsWith("1 sets, 2 files, 10 bytes to spare; probably alike"), "",
                          "10\t/s/a", "10\t/s/b"));
}

TEST_F(StatisticsLinesTest, SetsThatAreLeftOutAreTold) {
  AddDuplicates(7);

  EXPECT_THAT(Lines(std::nullopt)[0], HasSubstr("to spare; 7 sets with less to spare left out; "));
  EXPECT_EQ(StatisticsObject(wish, statistics)["duplicates"]["sets_left_out"].asUInt(), 7u);
}

TEST_F(StatisticsLinesTest, PartsAreSeparatedThroughAPipeToo) {
  wish.totals = true;
  wish.by = GroupBy::KIND;
  statistics.totals = {{"s", 1, 2, 0, 300}};
  statistics.groups = {{"", "document", 1, 300}};

  EXPECT_THAT(Lines(std::nullopt), ElementsAre("300\t1\t2\t0\ts", "", "300\t1\tdocument"));
}

TEST_F(StatisticsLinesTest, OthersAreNoGroupOfThatName) {
  EntryGroup others;
  others.share = "s";
  others.name = OTHER_NAMES;
  others.is_others = true;
  EntryGroup named = others;
  named.is_others = false;
  statistics.groups = {others, named};
  wish.by = GroupBy::FOLDER;
  const Json::Value folders = StatisticsObject(wish, statistics)["groups"];
  wish.by = GroupBy::EXTENSION;
  const Json::Value endings = StatisticsObject(wish, statistics)["groups"];

  for (const Json::Value& groups : {folders, endings}) {
    EXPECT_TRUE(groups[0]["others"].asBool());
    EXPECT_FALSE(groups[0].isMember("path") || groups[0].isMember("name"));
    EXPECT_FALSE(groups[1].isMember("others"));
  }
  EXPECT_EQ(folders[0]["share"].asString(), "s");
  EXPECT_EQ(folders[1]["path"].asString(), OTHER_NAMES);
  EXPECT_EQ(endings[1]["name"].asString(), OTHER_NAMES);
}

}  // namespace
}  // namespace fileindexd
