// SPDX-License-Identifier: GPL-2.0-or-later
// What statistics are made of: sums, groups and their names.
#include <gtest/gtest.h>

#include <algorithm>
#include <string>
#include <utility>

#include "index/statistics_scan.h"

namespace fileindexd {
namespace {

constexpr int64_t SECOND = 1'000'000'000;
constexpr int64_t DAY = 24 * 60 * 60 * SECOND;
constexpr int64_t NOW = 2'000'000'000 * SECOND;

TEST(BytesTest, StopAtTheirEnds) {
  EXPECT_EQ(AddedBytes(1, 2), 3);
  EXPECT_EQ(AddedBytes(INT64_MAX, 1), INT64_MAX);
  EXPECT_EQ(AddedBytes(INT64_MIN, -1), INT64_MIN);
  EXPECT_EQ(AddedBytes(INT64_MAX, -1), INT64_MAX - 1);
  EXPECT_EQ(ManifoldBytes(3, 4), 12);
  EXPECT_EQ(ManifoldBytes(INT64_MAX / 2, 3), INT64_MAX);
  EXPECT_EQ(ManifoldBytes(-5, UINT64_MAX), INT64_MIN);
  EXPECT_EQ((AlikeFiles{INT64_MAX / 2, 9, {}}).Spare(), INT64_MAX);
}

TEST(GroupCountsTest, NamesBeyondALimitCountTogetherAndTheGreatestStay) {
  GroupCounts counts;
  CountedEntry entry;
  const auto add_all = [&] {
    for (size_t i = 0; i < 3 * MOST_GROUPS; ++i) {
      entry.size = static_cast<int64_t>(i);
      counts.Add("name" + std::to_string(i), entry);
    }
    counts.Add(OTHER_NAMES, entry);  // an ending may be called so
    entry.size = 5;
    counts.Add("name0", entry);
  };

  add_all();
  ASSERT_TRUE(counts.Settle());
  add_all();

  EXPECT_EQ(counts.groups.size(), MOST_GROUPS + 1);
  EXPECT_EQ(counts.groups.at(OTHER_NAMES).entries, 1U);
  const auto others = std::find_if(counts.groups.begin(), counts.groups.end(),
                                   [](const auto& group) { return group.second.is_others; });
  ASSERT_NE(others, counts.groups.end());
  EXPECT_EQ(others->second.name, OTHER_NAMES);
  EXPECT_EQ(others->second.entries, 2 * MOST_GROUPS + 2);
  EXPECT_FALSE(counts.groups.contains("name0"));
  const int64_t last = 3 * int64_t{MOST_GROUPS} - 1;
  EXPECT_EQ(counts.groups.at("name" + std::to_string(last)).bytes, last);
}

TEST(GroupCountsTest, FewNamesAreCountedOnce) {
  GroupCounts counts;
  CountedEntry entry;
  entry.size = 7;
  counts.Add("name", entry);

  EXPECT_FALSE(counts.Settle());
  EXPECT_EQ(counts.groups.at("name").bytes, 7);
}

TEST(ExtensionTest, IsWhatStandsBehindTheLastDot) {
  const std::pair<const char*, const char*> cases[] = {
      {"/a.b/c.PDF", "pdf"},
      {"/x.tar.gz", "gz"},
      {"/x", ""},
      {"/.hidden", ""},
      {"/.hidden.txt", "txt"},
      {"/x.", ""},
      {"/a.b/c", ""},
      {"/No. 5 is alive", ""},
      {"/x.\xff", "\xff"},
      {"/x.1234567890123456", "1234567890123456"},
      {"/", ""},
      {"/x.12345678901234567", ""},
  };
  for (const auto& [path, extension] : cases) {
    EXPECT_EQ(ExtensionOf(path), extension) << path;
  }
}

TEST(AgeTest, AClassHoldsItsLastMoment) {
  const std::pair<int64_t, const char*> cases[] = {
      {-1, "future"},
      {INT64_MIN / 4, "future"},
      {0, "day"},
      {DAY, "day"},
      {DAY + 1, "week"},
      {7 * DAY, "week"},
      {30 * DAY, "month"},
      {91 * DAY, "quarter"},
      {365 * DAY, "year"},
      {730 * DAY, "2 years"},
      {1826 * DAY, "5 years"},
      {3652 * DAY, "10 years"},
      {3652 * DAY + 1, "older"},
      {INT64_MAX / 2, "older"},
  };
  for (const auto& [age, name] : cases) {
    EXPECT_STREQ(AgeName(NOW - age, NOW), name) << age;
  }
  EXPECT_STREQ(AgeName(INT64_MIN, NOW), "older");
  EXPECT_STREQ(AgeName(INT64_MAX, NOW), "future");
}

}  // namespace
}  // namespace fileindexd
