// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/iso_date.h"

#include <gtest/gtest.h>

namespace fileindexd {

TEST(IsoDateTest, DatesOfEveryLengthAreRead) {
  EXPECT_EQ(ParseIsoDate("1970-01-02"), 86400);
  EXPECT_EQ(ParseIsoDate("1971"), 31536000);
  EXPECT_EQ(ParseIsoDate("1970-02"), 31 * 86400);
  EXPECT_EQ(ParseIsoDate("2020-01-02T03:04:05Z"), 1577934245);
  EXPECT_EQ(ParseIsoDate(" 2020-01-02T03:04:05.123456789"), 1577934245);
  EXPECT_EQ(ParseIsoDate("2020-01-02T05:04:05+02:00"), 1577934245);
  EXPECT_EQ(ParseIsoDate("2020-01-01T22:34:05-0430"), 1577934245);
  EXPECT_EQ(ParseIsoDate("2020-01-02T03:04"), 1577934240);
}

TEST(IsoDateTest, WhatIsNoDateIsNone) {
  for (const char* text : {"", "-", "20", "soon", "2020-13-01", "2020-02-30", "2020-1-1", "2020-",
                           "2020-00-00", "02.01.2020x"}) {
    EXPECT_EQ(ParseIsoDate(text), std::nullopt) << text;
  }
}

TEST(IsoDateTest, OfABadTimeTheDayIsLeft) {
  EXPECT_EQ(ParseIsoDate("1970-01-02T99:00:00Z"), 86400);
  EXPECT_EQ(ParseIsoDate("1970-01-02Tnoon"), 86400);
}

}  // namespace fileindexd
