// SPDX-License-Identifier: GPL-2.0-or-later
#include <dlfcn.h>
#include <gtest/gtest.h>
#include <pwd.h>

#include <cerrno>
#include <cstdlib>
#include <string>
#include <vector>

#include "index/query.h"

namespace {

std::vector<int> fail_lookups;  // codes of the next look-ups of users

}  // namespace

// In the place of the C library's.
extern "C" int getpwnam_r(const char* name, passwd* user, char* room, size_t size, passwd** found) {
  if (!fail_lookups.empty()) {
    const int code = fail_lookups.front();
    fail_lookups.erase(fail_lookups.begin());
    *found = nullptr;
    return code;
  }
  using Function = int (*)(const char*, passwd*, char*, size_t, passwd**);
  static const auto own = reinterpret_cast<Function>(dlsym(RTLD_NEXT, "getpwnam_r"));
  return own(name, user, room, size, found);
}

namespace fileindexd {

namespace {

constexpr time_t NOW = 1'705'320'000;  // 2024-01-15 12:00 UTC

// The tree as text, or "?" and the byte at which the question makes no sense.
std::string Parsed(const std::string& text) {
  QueryNode query;
  QueryError error;
  if (ParseQuery(text, NOW, query, error)) {
    EXPECT_TRUE(error.what.empty());
    return QueryText(query);
  }
  EXPECT_FALSE(error.what.empty()) << text;
  EXPECT_EQ(error.Line(text).find('\n'), std::string::npos);
  EXPECT_LE(error.at, text.size()) << text;
  return "?" + std::to_string(error.at);
}

struct Case {
  std::string text;
  std::string parsed;
};

void ExpectAll(const std::vector<Case>& cases) {
  for (const Case& one : cases) {
    EXPECT_EQ(Parsed(one.text), one.parsed) << one.text;
  }
}

class QueryParseTest : public testing::Test {
 protected:
  void SetUp() override { Zone("UTC"); }
  static void Zone(const char* name) {
    setenv("TZ", name, 1);
    tzset();
  }
};

}  // namespace

TEST_F(QueryParseTest, WordsPhrasesAndBeginnings) {
  ExpectAll({
      {"report", "report"},
      {"  annual \t report ", "(annual report)"},
      {"rep*", "rep*"},
      {"rep**", "rep**"},
      {"\"re*port\"", "\"re*port\""},
      {"\"rep*\"", "\"rep\""},
      {"\"rep*\"*", "\"rep\"*"},
      {"text:\"rep*\"", "text:\"rep\""},
      {"++*", "name:*++*"},
      {"\"annual report\"", "\"annual report\""},
      {"\"annual rep\"*", "\"annual rep\"*"},
      {"\"a b\"c", "(\"a b\" c)"},
      {"a\"b", "a\"b"},
      {"copy(1).txt", "copy(1).txt"},
      {"smile:)", "smile:)"},
      {"http://x/y", "http://x/y"},
      {"12:30", "12:30"},
      {"c++", "c++"},
      {"++", "name:*++*"},
      {"a - b", "(a name:*-* b)"},
      {"--a", "--a"},
      {"or", "or"},
      {"and not", "(and not)"},
      {"OR", "OR"},
      {" AND ", "AND"},
      {"NOT", "NOT"},
      {"\"OR\" \"AND\"", "(\"OR\" \"AND\")"},
      {"ORa aOR", "(ORa aOR)"},
  });
}

TEST_F(QueryParseTest, OperatorsBindAsWritten) {
  ExpectAll({
      {"a b OR c", "((a b) OR c)"},
      {"a OR b c", "(a OR (b c))"},
      {"a (b OR c)", "(a (b OR c))"},
      {"a AND b", "(a b)"},
      {"a OR b OR c", "(a OR b OR c)"},
      {"((a))", "a"},
      {"(a)(b)", "(a b)"},
      {"-a b", "(-a b)"},
      {"a -b", "(a -b)"},
      {"a NOT b", "(a -b)"},
      {"a -(b OR c)", "(a -(b OR c))"},
      {"a NOT NOT b", "(a --b)"},
      {"a -name:b", "(a -name:b)"},
      {"a -\"b c\"", "(a -\"b c\")"},
      {"(copy(1) OR x)", "(copy(1) OR x)"},
      {"NOT(a) b", "(-a b)"},
      {"a OR(b)", "(a OR b)"},
      {"kind:video -foo", "(kind:video -foo)"},
  });
}

TEST_F(QueryParseTest, FieldsAndTheirValues) {
  ExpectAll({
      {"name:report", "name:report"},
      {"NAME:Report", "name:Report"},
      {"name:rep*", "name:rep*"},
      {"name:\"a b\"", "name:\"a b\""},
      {"name:\"++\"", "name:\"++\""},
      {"name:\"a b\"*", "name:a b*"},
      {"name:\"*a b*\"", "name:*a b*"},
      {"path:old/2024", "path:*old/2024*"},
      {"path:\"a b*c\"", "path:*a b*c*"},
      {"share:a,b", "share:a,b"},
      {"has:content", "has:content"},
      {"name:*part*", "name:*part*"},
      {"name:*.pdf", "name:*.pdf"},
      {"name:a*b", "name:a*b"},
      {"text:whale", "text:whale"},
      {"author:\"a b\"", "author:\"a b\""},
      {"tag:sea", "keywords:sea"},
      {"colour:red", "colour:red"},
      {"C:\\x c:", "(C:\\x c:)"},
      {"texts://x", "texts://x"},
      {"sizes: 1", "(sizes: 1)"},
      {"size1:2", "size1:2"},
      {"x:y form:", "(x:y form:)"},
      {"\"sise:>1G\"", "\"sise:>1G\""},
      {"kind:video,Audio", "kind:video,audio"},
      {"ext:.jpg,png", "ext:jpg,png"},
      {"owner:0,1000", "owner:0,1000"},
      {"owner:root", "owner:0"},
      {"under:/a//b/", "under:/a/b"},
      {"under:\"/a b\"", "under:/a b"},
      {"is:duplicate is:HIDDEN", "(is:duplicate is:hidden)"},
      {"has:text has:location has:title has:pages", "(has:text has:location has:title has:pages)"},
      {"content:failed", "content:failed"},
      {"near:52.5,-13.4,2km", "near:52.500000,-13.400000,2000.000000"},
      {"near:0,0,50m", "near:0.000000,0.000000,50.000000"},
      {"near:0,0,7", "near:0.000000,0.000000,7.000000"},
  });
}

TEST_F(QueryParseTest, NumbersSizesAndDurations) {
  ExpectAll({
      {"size:0", "size[0..0]"},
      {"size:>1K", "size[1025..]"},
      {"size:>=1k", "size[1024..]"},
      {"size:<1M", "size[..1048575]"},
      {"size:<=1MB", "size[..1048576]"},
      {"size:1.5G", "size[1610612736..1610612736]"},
      {"size:10MiB..2T", "size[10485760..2199023255552]"},
      {"size:1..", "size[1..]"},
      {"size:..9", "size[..9]"},
      {"duration:>90s", "duration[90001..]"},
      {"duration:90", "duration[90000..90999]"},
      {"duration:3m..5m", "duration[180000..300999]"},
      {"duration:<1h30m", "duration[..5399999]"},
      {"bitrate:>=128K", "bitrate[128000..]"},
      {"year:1990..1999", "year[1990..1999]"},
      {"rating:5", "rating[5..5]"},
      {"track:-1", "track[-1..-1]"},
  });
}

TEST_F(QueryParseTest, TimesAreThoseOfTheZone) {
  ExpectAll({
      {"sent:today", "sent[1705276800..1705363199]"},
      {"sent:yesterday", "sent[1705190400..1705276799]"},
      {"sent:>-7d", "sent[1704715201..]"},
      {"sent:-7d", "sent[1704715200..1705320000]"},
      {"sent:<-1w", "sent[..1704715199]"},
      {"sent:2024", "sent[1704067200..1735689599]"},
      {"sent:2024-02", "sent[1706745600..1709251199]"},
      {"sent:2024-01-05", "sent[1704412800..1704499199]"},
      {"sent:2024-01-05T12:30", "sent[1704457800..1704457859]"},
      {"sent:>2023", "sent[1704067200..]"},
      {"sent:>=2023", "sent[1672531200..]"},
      {"sent:<2024-01", "sent[..1704067199]"},
      {"sent:<=2024-01", "sent[..1706745599]"},
      {"sent:2023..2024-01", "sent[1672531200..1706745599]"},
      {"sent:-7d..-1d", "sent[1704715200..1705233600]"},
      {"modified:2024-01-05", "modified[1704412800000000000..1704499199999999999]"},
      {"modified:<9999", "modified[..9223372036854775806]"},
  });

  Zone("Europe/Berlin");
  EXPECT_EQ(Parsed("sent:2024-01-05"), "sent[1704409200..1704495599]");
  EXPECT_EQ(Parsed("sent:2024-03-31"), "sent[1711839600..1711922399]") << "has 23 hours";
  EXPECT_EQ(Parsed("taken:2024-01-05"), "taken[1704412800..1704499199]") << "a clock without zone";
}

TEST_F(QueryParseTest, SenselessQuestionsSayWhere) {
  ExpectAll({
      {"", "?0"},
      {" \t", "?0"},
      {std::string("\0", 1), "?0"},
      {"\"", "?0"},
      {"a \"b", "?2"},
      {"\"\"", "?0"},
      {"a \"\" b", "?2"},
      {"(", "?1"},
      {"(a", "?0"},
      {"x (a OR (b)", "?2"},
      {"a)", "a)"},
      {"a )", "?2"},
      {"()", "?1"},
      {"a ()", "?3"},
      {"OR a", "?0"},
      {"a OR", "?4"},
      {"a OR OR b", "?5"},
      {"a (OR b)", "?3"},
      {"AND a", "?0"},
      {"a AND", "?5"},
      {"a AND AND b", "?6"},
      {"a AND OR b", "?6"},
      {"a NOT", "?2"},
      {"NOT OR a", "?0"},
      {"(a NOT)", "?3"},
      {"-a", "?0"},
      {"-a -b", "?0"},
      {"NOT a", "?0"},
      {"a OR -b", "?5"},
      {"-(a b)", "?0"},
      {"*", "?0"},
      {"a *", "?2"},
      {"***", "?0"},
      {"\"*\"", "?1"},
      {"name:", "?0"},
      {"a name: b", "?2"},
      {"name:*", "?5"},
      {"name:**", "?5"},
      {"name:\"\"", "?0"},
      {"name:\"*\"", "?6"},
      {"name:\"a", "?5"},
      {"path:", "?0"},
      {"path:*", "?5"},
      {"share:", "?0"},
      {"share:.x", "?6"},
      {"share:a,", "?6"},
      {"share:a/b", "?6"},
      {"text:++", "?5"},
      {"author:*", "?7"},
      {"author:\"\"", "?0"},
      {"author:\"x", "?7"},
      {"kind:", "?0"},
      {"kind:film", "?5"},
      {"kind:video,", "?5"},
      {"kind:video, audio", "?5"},
      {"ext:", "?0"},
      {"ext:,", "?4"},
      {"ext:a/b", "?4"},
      {"owner:no_such_user_here", "?6"},
      {"owner:-1", "?6"},
      {"owner:4294967296", "?6"},
      {"under:a/b", "?6"},
      {"under:/a/../b", "?6"},
      {"under:.", "?6"},
      {"is:nice", "?3"},
      {"is:", "?0"},
      {"has:name", "?4"},
      {"has:size", "?4"},
      {"has:x", "?4"},
      {"content:read", "?8"},
      {"size:big", "?5"},
      {"size:>", "?6"},
      {"size:>=", "?7"},
      {"size:>x", "?6"},
      {"size:1X", "?5"},
      {"size:-1", "?5"},
      {"size:1M..x", "?9"},
      {"size:2M..1M", "?5"},
      {"size:..", "?5"},
      {"size:1e3", "?5"},
      {"size:inf", "?5"},
      {"size:nan", "?5"},
      {"size:99999999T", "?5"},
      {"size:0x10", "?5"},
      {"size:M", "?5"},
      {"year:two", "?5"},
      {"year:99999999999999999999", "?5"},
      {"pages:1.5", "?6"},
      {"duration:m", "?9"},
      {"duration:3x", "?9"},
      {"duration:-3m", "?9"},
      {"duration:99999999999999999999s", "?9"},
      {"modified:tomorrowish", "?9"},
      {"modified:2024-13", "?9"},
      {"modified:2024-02-30", "?9"},
      {"modified:2024-1", "?9"},
      {"modified:24", "?9"},
      {"modified:20245", "?9"},
      {"modified:2024-01-05T25:00", "?9"},
      {"modified:-7", "?9"},
      {"modified:-", "?9"},
      {"modified:>-7q", "?10"},
      {"near:1,2", "?5"},
      {"near:1,2,3,4", "?5"},
      {"near:91,0,1km", "?5"},
      {"near:0,181,1km", "?5"},
      {"near:0,0,-1", "?5"},
      {"near:a,b,c", "?5"},
      {"near:0,0,km", "?5"},
      {"near:nan,0,1", "?5"},
      {std::string(5000, 'a'), "?4096"},
  });
}

TEST_F(QueryParseTest, StarsThatWouldFindNothingAreRefused) {
  ExpectAll({
      {"inv*ce", "?3"},
      {"a *port", "?2"},
      {"re*po*", "?2"},
      {"+*+", "?1"},
      {"text:re*port", "?7"},
      {"author:*x", "?7"},
      {"under:\"/a\"*", "?10"},
      {"size:\"1M\"*", "?9"},
      {"kind:\"video\"*", "?12"},
      {"ext:\"pdf\"*", "?9"},
      {"is:\"file\"*", "?9"},
      {"year:\"2024\"*", "?11"},
  });
}

TEST_F(QueryParseTest, WhatCanOnlyBeMeantForAFieldIsRefused) {
  ExpectAll({
      {"sise:>1G", "?0"},
      {"a -sise:1G", "?3"},
      {"(sise:1G)", "?1"},
      {"SIZ:1M", "?0"},
      {"autor:x", "?0"},
      {"form:bob", "?0"},
      {"tags:sea", "?0"},
      {"foo:>3", "?0"},
      {"foo:<=3", "?0"},
      {"foo:\"a b\"", "?0"},
  });
  QueryNode query;
  QueryError error;
  ASSERT_FALSE(ParseQuery("a sise:>1G", NOW, query, error));
  EXPECT_EQ(error.Line("a sise:>1G"),
            "there is no field 'sise'; 'size'? (a word with a colon stands in quotes) "
            "(character 3, at: sise:>1G)");
}

TEST_F(QueryParseTest, UsersThatCannotBeLookedUpAreNotUnknownOnes) {
  QueryNode query;
  QueryError error;
  fail_lookups = {ERANGE, ERANGE};
  EXPECT_EQ(Parsed("owner:root"), "owner:0") << "asked again with more room";
  fail_lookups = {ENOENT};
  EXPECT_FALSE(ParseQuery("owner:root", NOW, query, error));
  EXPECT_EQ(error.what, "there is no user 'root'");
  fail_lookups = {EIO};
  EXPECT_FALSE(ParseQuery("owner:root", NOW, query, error));
  EXPECT_EQ(error.what, "cannot look up the user 'root': Input/output error; a number needs none");
  EXPECT_EQ(error.at, 6U);
  fail_lookups = std::vector<int>(100, ERANGE);
  EXPECT_FALSE(ParseQuery("owner:root", NOW, query, error));
  EXPECT_TRUE(error.what.starts_with("cannot look up")) << error.what;
  fail_lookups.clear();
}

TEST_F(QueryParseTest, WhatIsTooMuchIsRefused) {
  std::string words;
  for (int i = 0; i < 100; ++i) {
    words += "a ";
  }
  EXPECT_NE(Parsed(words).front(), '?');
  EXPECT_EQ(Parsed(words + "b"), "?200");
  EXPECT_EQ(Parsed(std::string(40, '(') + "a" + std::string(40, ')')), "a");
  EXPECT_EQ(Parsed(std::string(2000, '(') + "a" + std::string(2000, ')')).front(), '?');
  std::string negations = "a ";
  for (int i = 0; i < 1000; ++i) {
    negations += "NOT ";
  }
  EXPECT_EQ(Parsed(negations + "b").front(), '?');
}

TEST_F(QueryParseTest, ErrorsShowTheCharacterAndWhatStandsThere) {
  const std::string text = "\u00fcber size:1X und mehr";
  QueryNode query;
  QueryError error;

  ASSERT_FALSE(ParseQuery(text, NOW, query, error));
  EXPECT_EQ(error.Line(text),
            "'1X' is not a size like 500K, 10M or 1.5G (character 11, at: 1X und mehr)");
  ASSERT_FALSE(ParseQuery("a OR", NOW, query, error));
  EXPECT_NE(error.Line("a OR").find("(at its end)"), std::string::npos);
}

}  // namespace fileindexd
