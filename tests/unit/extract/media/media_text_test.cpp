// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/media_text.h"

#include <gtest/gtest.h>

namespace fileindexd {

namespace {

TEST(MediaTextTest, ClocksAreReadInTheFormsOfTags) {
  constexpr int64_t TIME = 1041502272;  // 2003-01-02 10:11:12 UTC
  const std::pair<const char*, int64_t> cases[] = {
      {"2003:01:02 10:11:12", TIME},       {"2003-01-02T10:11:12.75Z", TIME},
      {"2003-01-02T12:11:12+02:00", TIME}, {"2003-01-02T06:41:12-0330", TIME},
      {"2003-01-02 10:11:12 UTC", TIME},   {"UTC 2003-01-02 10:11:12", TIME},
      {"2003-01-02 10:11", TIME - 12},     {"2003-01-02", TIME - 36672},
      {"1969-12-31 23:59:59", -1},
  };
  for (const auto& [text, clock] : cases) {
    EXPECT_EQ(ClockOf(text), clock) << text;
  }
}

TEST(MediaTextTest, WhatWasWrittenNeedsNoZone) {
  for (const char* text : {"2003:01:02 10:11:12", "2003-01-02T10:11:12+02:00",
                           "2003-01-02T10:11:12.5-0330", "2003-01-02 10:11:12 UTC"}) {
    EXPECT_EQ(WrittenClockOf(text), 1041502272) << text;
  }
  EXPECT_EQ(WrittenClockOf("yesterday"), std::nullopt);
}

TEST(MediaTextTest, WhatIsNoClockIsNone) {
  for (const char* text : {"", "yesterday", "2003", "2003-1-2", "0000-00-00 00:00:00", "2003-02-30",
                           "12003-01-02", "    :  :  "}) {
    EXPECT_EQ(ClockOf(text), std::nullopt) << text;
  }
}

TEST(MediaTextTest, AWrongTimeLeavesTheDay) {
  EXPECT_EQ(ClockOf("2003-01-02 99:11:12"), ClockOf("2003-01-02"));
}

TEST(MediaTextTest, WhatIsNoZoneIsPassedOver) {
  for (const char* zone : {"", " CET", "+", "+2", "+99:00", "+02:77", "+02:x"}) {
    EXPECT_EQ(ClockOf(std::string("2003-01-02 10:11:12") + zone), 1041502272) << zone;
  }
}

TEST(MediaTextTest, TextIsMadeUtf8) {
  EXPECT_EQ(Utf8Of("Grüße"), "Grüße");
  EXPECT_EQ(Utf8Of("Gr\xfc\xdf"
                   "e"),
            "Grüße");
  EXPECT_EQ(Utf8Of("5 \x80"), "5 €");
}

TEST(MediaTextTest, LeadingNumbersAreTaken) {
  EXPECT_EQ(LeadingNumber(" 3/12"), 3);
  EXPECT_EQ(LeadingNumber("1234567890"), std::nullopt);
  EXPECT_EQ(LeadingNumber("x3"), std::nullopt);
}

TEST(MediaTextTest, EndingsAreComparedWithoutCase) {
  EXPECT_TRUE(HasEnding("a.b.MP3", "mp2 mp3"));
  EXPECT_FALSE(HasEnding("mp3", "mp2 mp3"));
  EXPECT_FALSE(HasEnding("a.mp", "mp2 mp3"));
  EXPECT_FALSE(HasEnding("a.", "mp2 mp3"));
}

}  // namespace

}  // namespace fileindexd
