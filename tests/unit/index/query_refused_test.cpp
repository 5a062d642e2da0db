// SPDX-License-Identifier: GPL-2.0-or-later
// Questions that make no sense.
#include <dlfcn.h>
#include <pwd.h>

#include <cerrno>

#include "tests/unit/index/query_parse_fixture.h"
#include "tests/unit/repeated.h"

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

class QueryRefusedTest : public QueryParseTest {};

// It would go unseen, as a word of its own or as nothing.
TEST_F(QueryRefusedTest, NothingIsGluedToQuotes) {
  ExpectAll({
      {"\"a b\"c", "?5"},
      {"\"a\"\"b\"", "?3"},
      {"\"a\"*b", "?4"},
      {"\"a\"**", "?4"},
      {"\"a\"(b)", "?3"},
      {"\"a\",\"b\"", "?3"},
      {"x -\"a\"-b", "?6"},
      {"name:\"report\"x", "?13"},
      {"title:(\"a\"b)", "?10"},
      {"under:\"/a\"/b", "?10"},
      {"size:\"1M\"..2M", "?9"},
      {"is:\"file\",\"link\"", "?9"},
      {"kind:\"document\"x", "?15"},
      {"kind:\"document\",", "?16"},
      {"kind:\"document\",,photo", "?16"},
      {"kind:\"document\",\"", "?16"},
      {"kind:\"document\",\"film\"", "?17"},
      {"kind:photo,\"document\"*", "?21"},
      {"share:\"a\"b", "?9"},
      {"share:\"a\",\"\"", "?11"},
      {"\"a\")", "?3"},
  });
}

TEST_F(QueryRefusedTest, SenselessQuestionsSayWhere) {
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
      {"a)", "?1"},
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
      {"name:\"a/b\"", "?7"},
      {"name:a/b", "?6"},
      {"name:/etc", "?5"},
      {"name:a/b*", "?6"},
      {"name:(x a/b)", "?9"},
      {"name:*a/b*", "?7"},
      {"name:/*b", "?5"},
      {"path:", "?0"},
      {"path:*", "?5"},
      {"share:", "?0"},
      {"share:.x", "?6"},
      {"share:a,", "?8"},
      {"share:a/b", "?6"},
      {"text:++", "?5"},
      {"author:*", "?7"},
      {"author:\"\"", "?0"},
      {"author:\"x", "?7"},
      {"kind:", "?0"},
      {"kind:film", "?5"},
      {"kind:video,", "?11"},
      {"kind:video, audio", "?11"},
      {"ext:", "?0"},
      {"ext:,", "?4"},
      {"ext:pdf,a/b,c", "?8"},
      {"owner:0,no_such_user_here", "?8"},
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

// Folded as names are, nothing is left of it, and nothing stands in every name.
TEST_F(QueryRefusedTest, WhatIsNotSeenIsNothingToSearchFor) {
  for (const std::string sign :
       {"\u200b", "\ufeff", "\u00ad", "\u200d", "\u200e", "\u202e", "\ufe0f", "\u2060", "\u0301",
        "\u20dd", "\ufe77", "\u0301\u200b"}) {
    ExpectAll({
        {sign, "?0"},
        {sign + "*", "?0"},
        {"\"" + sign + "\"", "?1"},
        {"\"*" + sign + "\"", "?1"},
        {"report " + sign, "?7"},
        {"report -" + sign, "?8"},
        {"kind:document -(a OR " + sign + ")", "?21"},
        {"name:" + sign, "?5"},
        {"name:" + sign + "*", "?5"},
        {"name:*" + sign + "*", "?6"},
        {"name:*" + sign + "*" + sign + "*", "?6"},
        {"name:(" + sign + ")", "?6"},
        {"name:\"" + sign + "\"*", "?6"},
        {"path:" + sign, "?5"},
        {"path:**" + sign, "?7"},
        {"path:\"" + sign + "\"", "?6"},
        {"ext:" + sign, "?4"},
        {"ext:." + sign, "?4"},
        {"ext:pdf," + sign, "?8"},
        {"text:" + sign, "?5"},
        {"title:" + sign, "?6"},
        {"a" + sign, "a" + sign},
        {"name:*a*" + sign + "*", "name:*a*" + sign + "*"},
    });
  }
  EXPECT_EQ(LineOf("a \u200b"),
            "a \u200b: U+200B alone is nothing to search for: accents and what is not seen do not "
            "count (character 3, at: \u200b)");
}

TEST_F(QueryRefusedTest, RangesThatNothingCanLieInAreRefused) {
  ExpectAll({
      {"size:<0", "?5"},
      {"a size:<0 b", "?7"},
      {"-size:<0 a", "?6"},
      {"size:<0K", "?5"},
      {"size:5M..1M", "?5"},
      {"size:1..0", "?5"},
      {"duration:<0", "?9"},
      {"duration:<0m", "?9"},
      {"duration:5m..3m", "?9"},
      {"bitrate:<0", "?8"},
      {"rating:>5", "?7"},
      {"rating:>=6", "?7"},
      {"rating:6", "?7"},
      {"rating:6..", "?7"},
      {"rating:7..9", "?7"},
      {"rating:<0", "?7"},
      {"rating:-1", "?7"},
      {"height:<0", "?7"},
      {"height:<-3", "?7"},
      {"height:..-1", "?7"},
      {"width:<=-1", "?6"},
      {"width:-3..-1", "?6"},
      {"year:<0", "?5"},
      {"year:2000..1990", "?5"},
      {"year:>9223372036854775807", "?5"},
      {"pages:<0", "?6"},
      {"track:-1", "?6"},
      {"near:0,0,0", "?5"},
      {"near:0,0,0m", "?5"},
      {"near:0,0,0.0km", "?5"},
      {"near:0,0,-0", "?5"},
      {"near:90.1,0,1km", "?5"},
      {"near:-91,0,1km", "?5"},
      {"near:0,-181,1km", "?5"},
      {"modified:2024-06..2024-01", "?9"},
      {"modified:now..-7d", "?9"},
      {"modified:-1d..-7d", "?9"},
      {"modified:today..yesterday", "?9"},
      {"created:2024..2023", "?8"},
      {"taken:2024-01-05..2024-01-04", "?6"},
  });
}

TEST_F(QueryRefusedTest, RangesThatOnlyTheLeastOrTheGreatestLiesInAreNot) {
  ExpectAll({
      {"size:<1", "size[..0]"},
      {"size:<=0", "size[..0]"},
      {"size:0", "size[0..0]"},
      {"duration:<=0", "duration[..0]"},
      {"rating:>4", "rating[5..]"},
      {"rating:5", "rating[5..5]"},
      {"rating:>=5", "rating[5..]"},
      {"rating:<=9", "rating[..9]"},
      {"rating:3..9", "rating[3..9]"},
      {"rating:<1", "rating[..0]"},
      {"pages:>-1", "pages[0..]"},
      {"width:-3..0", "width[-3..0]"},
      {"year:1994..1994", "year[1994..1994]"},
      {"near:0,0,1", "near:0.000000,0.000000,1.000000"},
      {"near:90,180,0.5m", "near:90.000000,180.000000,0.500000"},
      {"modified:<1970", "modified[..-1]"},
  });
}

TEST_F(QueryRefusedTest, StarsThatWouldFindNothingAreRefused) {
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
      {"ext:jp*", "?4"},
      {"ext:\"*\"", "?5"},
      {"is:\"file\"*", "?9"},
      {"year:\"2024\"*", "?11"},
  });
}

TEST_F(QueryRefusedTest, UsersThatCannotBeLookedUpAreNotUnknownOnes) {
  fail_lookups = {ERANGE, ERANGE};
  EXPECT_EQ(Parsed("owner:root"), "owner:0") << "asked again with more room";
  fail_lookups = {ENOENT};
  EXPECT_EQ(ErrorOf("owner:root").what, "there is no user 'root'");
  fail_lookups = {EIO};
  const QueryError failed = ErrorOf("owner:root");
  EXPECT_EQ(failed.what, "cannot look up the user 'root': Input/output error; a number needs none");
  EXPECT_EQ(failed.at, 6U);
  fail_lookups = std::vector<int>(100, ERANGE);
  const std::string what = ErrorOf("owner:root").what;
  EXPECT_TRUE(what.starts_with("cannot look up")) << what;
  fail_lookups.clear();
}

TEST_F(QueryRefusedTest, WhatIsTooMuchIsRefused) {
  const std::string words = Repeated("a ", 100);
  EXPECT_NE(Parsed(words).front(), '?');
  EXPECT_EQ(Parsed(words + "b"), "?200");
  EXPECT_NE(Parsed("name:(" + words + ")").front(), '?');
  EXPECT_EQ(Parsed("name:(" + words + "b)"), "?206");
  const auto nested = [](const std::string& before, size_t depth, const std::string& behind) {
    return Repeated(before, depth) + "b" + Repeated(behind, depth);
  };
  EXPECT_EQ(Parsed(nested("(", 50, ")")), "b");
  EXPECT_EQ(Parsed(nested("(", 51, ")")), "?51");
  EXPECT_EQ(Parsed("name:" + nested("(", 50, ")")), "name:b");
  EXPECT_EQ(Parsed("name:" + nested("(", 51, ")")), "?56");
  EXPECT_EQ(Parsed(nested("(", 2000, ")")), "?51");
  EXPECT_EQ(Parsed("a " + nested("NOT ", 50, "")), "(a " + std::string(50, '-') + "b)");
  EXPECT_EQ(Parsed("a " + nested("NOT ", 51, "")), "?202");
  EXPECT_EQ(Parsed("a " + nested("-(", 25, ")")), "(a " + std::string(25, '-') + "b)");
  EXPECT_EQ(Parsed("a " + nested("-(", 26, ")")).front(), '?');
}

}  // namespace fileindexd
