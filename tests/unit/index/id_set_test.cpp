// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/id_set.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <iterator>
#include <random>
#include <set>
#include <vector>

#include "index/text_marks.h"

namespace fileindexd {

namespace {

using Numbers = std::vector<int64_t>;

IdSet SetOf(const Numbers& ids) {
  IdSet set;
  for (const int64_t id : ids) {
    set.Add(id);
  }
  return set;
}

}  // namespace

TEST(IdSetTest, HoldsWhatWasAddedAndNothingElse) {
  const Numbers ids = {0, 1, 63, 64, 4095, 4096, 1'000'000, MOST_ROWS};
  const IdSet set = SetOf({MOST_ROWS, 64, 0, 1, 4096, 63, 1'000'000, 4095, 64});

  EXPECT_EQ(set.Ids(), ids);
  EXPECT_EQ(set.Count(), ids.size());
  for (const int64_t id : ids) {
    EXPECT_TRUE(set.Has(id)) << id;
  }
  for (const int64_t id : {int64_t{2}, int64_t{62}, int64_t{4097}, MOST_ROWS - 1}) {
    EXPECT_FALSE(set.Has(id)) << id;
  }
  EXPECT_TRUE(IdSet().IsEmpty());
  EXPECT_EQ(IdSet().Ids(), Numbers());
}

TEST(IdSetTest, NextIsTheLeastOfThoseBehind) {
  const IdSet set = SetOf({5, 64, 20'000});

  EXPECT_EQ(set.Next(-1), 5);
  EXPECT_EQ(set.Next(4), 5);
  EXPECT_EQ(set.Next(5), 64);
  EXPECT_EQ(set.Next(63), 64);
  EXPECT_EQ(set.Next(64), 20'000);
  EXPECT_EQ(set.Next(20'000), -1);
  EXPECT_EQ(set.Next(1'000'000), -1);
}

TEST(IdSetTest, PreviousIsTheGreatestOfThoseInFront) {
  IdSet set = SetOf({0, 64, 4095, 20'000});

  EXPECT_EQ(set.Previous(INT64_MAX), 20'000);
  EXPECT_EQ(set.Previous(20'001), 20'000);
  EXPECT_EQ(set.Previous(20'000), 4095);
  EXPECT_EQ(set.Previous(4095), 64);
  EXPECT_EQ(set.Previous(64), 0);
  EXPECT_EQ(set.Previous(0), -1);
  EXPECT_EQ(IdSet().Previous(INT64_MAX), -1);

  set.Remove(4095);
  set.Remove(4095);
  set.Remove(7);
  EXPECT_EQ(set.Ids(), Numbers({0, 64, 20'000}));
  EXPECT_EQ(set.Count(), 3U);
  EXPECT_EQ(set.Previous(20'000), 64);
}

TEST(IdSetTest, JoinsAsSetsOfNumbersDo) {
  std::mt19937 random(17);
  for (int round = 0; round < 50; ++round) {
    const int64_t widest = int64_t{1} << (round % 20 + 1);
    std::set<int64_t> a;
    std::set<int64_t> b;
    for (int i = 0; i < 200; ++i) {
      a.insert(static_cast<int64_t>(random()) % widest);
      b.insert(static_cast<int64_t>(random()) % (widest * (round % 3 + 1)));
    }
    const IdSet first = SetOf({a.begin(), a.end()});
    const IdSet second = SetOf({b.begin(), b.end()});
    Numbers both;
    Numbers either;
    Numbers rest;
    std::set_intersection(a.begin(), a.end(), b.begin(), b.end(), std::back_inserter(both));
    std::set_union(a.begin(), a.end(), b.begin(), b.end(), std::back_inserter(either));
    std::set_difference(a.begin(), a.end(), b.begin(), b.end(), std::back_inserter(rest));

    IdSet joined = first;
    joined.Intersect(second);
    EXPECT_EQ(joined.Ids(), both);
    EXPECT_EQ(joined.Count(), both.size());
    joined = first;
    joined.Unite(second);
    EXPECT_EQ(joined.Ids(), either);
    EXPECT_EQ(joined.Count(), either.size());
    joined = first;
    joined.Subtract(second);
    EXPECT_EQ(joined.Ids(), rest);
    EXPECT_EQ(joined.IsEmpty(), rest.empty());
  }
}

TEST(TextMarksTest, EachTextHasItsOwn) {
  TextMarks marks;
  marks.Set(7, 200);
  marks.Set(MOST_ROWS, 1);
  EXPECT_EQ(marks.Of(7), 200);
  EXPECT_EQ(marks.Of(MOST_ROWS), 1);
  EXPECT_EQ(marks.Of(8), 0);
  EXPECT_EQ(marks.Of(MOST_ROWS - 1), 0);
}

TEST(TextMarksTest, WhereItStandsCountsMoreThanHowOften) {
  const auto score = [](TextMark::Where where, uint32_t hits, double length) {
    return TextMark::Score(TextMark::Of(where, hits), length);
  };
  EXPECT_EQ(TextMark::Score(0, USUAL_LENGTH), 0);
  EXPECT_GT(score(TextMark::TEXT, 1, 1e9), 0);
  EXPECT_GT(score(TextMark::TEXT, 2, USUAL_LENGTH), score(TextMark::TEXT, 1, USUAL_LENGTH));
  EXPECT_GT(score(TextMark::TEXT, 1, 100), score(TextMark::TEXT, 1, USUAL_LENGTH));
  EXPECT_GT(score(TextMark::FIELDS, 1, 1e9), score(TextMark::TEXT, 1'000'000, 1));
  EXPECT_GT(score(TextMark::TITLE, 1, 1e9), score(TextMark::FIELDS, 1'000'000, 1));
  EXPECT_LE(score(TextMark::TITLE, 1'000'000, 0), 1);
}

}  // namespace fileindexd
