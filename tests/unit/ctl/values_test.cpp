// SPDX-License-Identifier: GPL-2.0-or-later
#include "ctl/values.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <ctime>

namespace fileindexd {
namespace {

constexpr int64_t NEW_YEAR = 1767225600;  // 2026-01-01T00:00:00Z

// Local time is three and a half hours behind, the whole year.
class ParseTimeTest : public testing::Test {
 protected:
  void SetUp() override {
    setenv("TZ", "<-0330>3:30", 1);
    tzset();
  }
  void TearDown() override {
    unsetenv("TZ");
    tzset();
  }
};

TEST_F(ParseTimeTest, TakesSecondsSinceTheEpoch) {
  EXPECT_EQ(ParseTime("0"), 0);
  EXPECT_EQ(ParseTime("1767225600"), NEW_YEAR);
  EXPECT_EQ(ParseTime("-1"), -1);
  EXPECT_EQ(ParseTime("9223372036854775807"), INT64_MAX);
}

TEST_F(ParseTimeTest, TakesTimesWithAZone) {
  EXPECT_EQ(ParseTime("2026-01-01T00:00:00Z"), NEW_YEAR);
  EXPECT_EQ(ParseTime("2026-01-01 00:00Z"), NEW_YEAR);
  EXPECT_EQ(ParseTime("2026-01-01T01:30:00+01:30"), NEW_YEAR);
  EXPECT_EQ(ParseTime("2026-01-01T02:00:00+0200"), NEW_YEAR);
  EXPECT_EQ(ParseTime("2025-12-31T19:00:00-05"), NEW_YEAR);
  EXPECT_EQ(ParseTime("2026-01-01T00:00:00.999Z"), NEW_YEAR);
}

TEST_F(ParseTimeTest, TakesATimeWithoutAZoneAsLocal) {
  EXPECT_EQ(ParseTime("2025-12-31T20:30:00"), NEW_YEAR);
  EXPECT_EQ(ParseTime("2025-12-31 20:30"), NEW_YEAR);
  EXPECT_EQ(ParseTime("2026-01-01"), NEW_YEAR + 3 * 3600 + 1800);
}

TEST_F(ParseTimeTest, TakesAnHourAlone) {
  EXPECT_EQ(ParseTime("2026-01-01T00Z"), NEW_YEAR);
  EXPECT_EQ(ParseTime("2026-01-01T02+02"), NEW_YEAR);
  EXPECT_EQ(ParseTime("2026-01-01T01"), NEW_YEAR + 4 * 3600 + 1800);
}

TEST_F(ParseTimeTest, TakesTimesWithoutSeparators) {
  EXPECT_EQ(ParseTime("20260101T000000Z"), NEW_YEAR);
  EXPECT_EQ(ParseTime("20260101T000000.5Z"), NEW_YEAR);
  EXPECT_EQ(ParseTime("20260101T0200+0200"), NEW_YEAR);
  EXPECT_EQ(ParseTime("20260101T00Z"), NEW_YEAR);
  EXPECT_EQ(ParseTime("20251231T203000"), NEW_YEAR);
  EXPECT_EQ(ParseTime("20300101"), 20300101);  // seconds
}

TEST_F(ParseTimeTest, TakesFractionsBehindAComma) {
  EXPECT_EQ(ParseTime("2026-01-01T00:00:00,999Z"), NEW_YEAR);
  EXPECT_EQ(ParseTime("20260101T000000,1Z"), NEW_YEAR);
}

TEST_F(ParseTimeTest, TakesTheEndOfADay) {
  EXPECT_EQ(ParseTime("2025-12-31T24:00:00Z"), NEW_YEAR);
  EXPECT_EQ(ParseTime("2025-12-31T24:00:00.00Z"), NEW_YEAR);
  EXPECT_EQ(ParseTime("20251231T24Z"), NEW_YEAR);
  EXPECT_EQ(ParseTime("2025-12-30T24:00"), NEW_YEAR - 20 * 3600 - 1800);
}

TEST_F(ParseTimeTest, KnowsLeapYears) {
  EXPECT_EQ(ParseTime("2028-02-29T00:00Z"), 1835395200);
  EXPECT_FALSE(ParseTime("2027-02-29T00:00Z").has_value());
  EXPECT_FALSE(ParseTime("2100-02-29T00:00Z").has_value());
}

TEST_F(ParseTimeTest, RefusesEverythingElse) {
  const char* const bad[] = {"",
                             " ",
                             "now",
                             "12x",
                             "+5",
                             "1.5",
                             " 5",
                             "9223372036854775808",
                             "2026-1-1x",
                             "2026-13-01",
                             "2026-00-01",
                             "2026-01-00",
                             "2026-04-31",
                             "0000-01-01",
                             "2026-01-01T",
                             "2026-01-01T25",
                             "2026-01-01T24:01",
                             "2026-01-01T24:00:01",
                             "2026-01-01T24:00:00.5",
                             "2026-01-01T12,5",
                             "2026-01-01T12:",
                             "2026-01-01T1200",
                             "20260101T",
                             "20260101T1",
                             "20260101T12:00",
                             "20260101T120",
                             "20260101T12000",
                             "20260131T120000.",
                             "20260431T120000",
                             "2026-0101T120000",
                             "202601-01T120000",
                             "20260101 ",
                             "2026-01-01T12:60",
                             "2026-01-01T12:00:61",
                             "2026-01-01T12:00:00.",
                             "2026-01-01T12:00:00.Z",
                             "2026-01-01T12:00:00ZZ",
                             "2026-01-01T12:00:00+",
                             "2026-01-01T12:00:00+1",
                             "2026-01-01T12:00:00+24:00",
                             "2026-01-01T12:00:00+01:",
                             "2026-01-01T12:00:00+01:60",
                             "2026-01-01T12:00:00 Z",
                             "2026-01-01x12:00"};
  for (const char* text : bad) {
    EXPECT_FALSE(ParseTime(text).has_value()) << '"' << text << '"';
  }
}

TEST(ParseDurationTest, TakesEveryUnit) {
  EXPECT_EQ(ParseDuration("90s"), 90);
  EXPECT_EQ(ParseDuration("15m"), 900);
  EXPECT_EQ(ParseDuration("2h"), 7200);
  EXPECT_EQ(ParseDuration("1d"), 86400);
  EXPECT_EQ(ParseDuration("2w"), 1209600);
  EXPECT_EQ(ParseDuration("1y"), 31536000);
  EXPECT_EQ(ParseDuration("1h30m"), 5400);
  EXPECT_EQ(ParseDuration("5S"), 5);
  EXPECT_EQ(ParseDuration("0s"), 0);
  EXPECT_EQ(ParseDuration("100000d"), int64_t{8640000000});
}

TEST(ParseDurationTest, RefusesEverythingElse) {
  const char* const bad[] = {
      "",     "s",      "90",  "90x", "-5s",     "+5s",       "1.5h",
      "1h30", "1h 30m", " 5s", "5 s", "100001d", "99999d25h", "99999999999999999999s",
      "0x5s"};
  for (const char* text : bad) {
    EXPECT_FALSE(ParseDuration(text).has_value()) << '"' << text << '"';
  }
}

TEST(ParseCountTest, TakesDigitsAlone) {
  EXPECT_EQ(ParseCount("0"), 0u);
  EXPECT_EQ(ParseCount("18446744073709551615"), UINT64_MAX);
  for (const char* text : {"", "-1", "+1", "1 ", "x", "0x5", "18446744073709551616"}) {
    EXPECT_FALSE(ParseCount(text).has_value()) << '"' << text << '"';
  }
}

}  // namespace
}  // namespace fileindexd
