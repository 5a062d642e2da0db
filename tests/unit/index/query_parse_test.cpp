// SPDX-License-Identifier: GPL-2.0-or-later
#include "tests/unit/index/query_parse_fixture.h"

namespace fileindexd {

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
      {"(\"a b\")", "\"a b\""},
      {"a\"b", "a\"b"},
      {"copy(1).txt", "copy(1).txt"},
      {"smile:)", "smile:)"},
      {":) ;-)) x=)", "(name:*:)* name:*;-))* x=))"},
      {"a)b (x) f(1)", "(a)b x f(1))"},
      {"5\"x7\" say\"a\"", "(5\"x7\" say\"a\")"},
      {"http://x/y", "http://x/y"},
      {"12:30", "12:30"},
      {"c++", "c++"},
      {"++", "name:*++*"},
      {"a - b", "(a name:*-* b)"},
      {"-- a--b --- a-- -->", "(name:*--* a--b name:*---* a-- name:*-->*)"},
      {"or", "or"},
      {"and not", "(and not)"},
      {"OR", "OR"},
      {" AND ", "AND"},
      {"NOT", "NOT"},
      {"\"OR\" \"AND\"", "(\"OR\" \"AND\")"},
      {"ORa aOR", "(ORa aOR)"},
  });
}

TEST_F(QueryParseTest, BlanksOfAnyScriptPartWords) {
  for (const std::string blank : {" ", "\t", "\n", "\x01", "\u00a0", "\u0085", "\u1680", "\u2003",
                                  "\u2009", "\u2028", "\u202f", "\u205f", "\u3000"}) {
    const auto parsed = [&blank](std::string text) {
      for (size_t at = 0; (at = text.find('_', at)) != std::string::npos; at += blank.size()) {
        text.replace(at, 1, blank);
      }
      return Parsed(text);
    };
    EXPECT_EQ(parsed("_a__b_"), "(a b)") << blank;
    EXPECT_EQ(parsed("\u00e0_\u6771"), "(\u00e0 \u6771)") << blank;
    EXPECT_EQ(parsed("kind:document_report"), "(kind:document report)") << blank;
    EXPECT_EQ(parsed("a_OR_b_-c"), "(a OR (b -c))") << blank;
    EXPECT_EQ(parsed("name:(_a_OR_b_)_c"), "((name:a OR name:b) c)") << blank;
    EXPECT_EQ(parsed("_NOT_"), "NOT") << blank;
    EXPECT_EQ(parsed("a_-_b"), "(a name:*-* b)") << blank;
    EXPECT_EQ(parsed("form:_b"), "(form: b)") << blank;
    EXPECT_EQ(parsed("_"), "?0") << blank;
    EXPECT_EQ(parsed("\"a_b\""), "\"a" + blank + "b\"") << blank;
  }
  for (const std::string sign : {"\u200b", "\u00ad", "\u200d", "\xa0", "\xe3\x80"}) {
    EXPECT_EQ(Parsed("a" + sign + "b"), "a" + sign + "b") << "none of these is a blank";
  }
}

// In front of digits and a unit "-" says how long ago; in front of all else it leaves out.
TEST_F(QueryParseTest, TimesBeforeNowAreValuesInBracketsToo) {
  ExpectAll({
      {"sent:(-7d)", "sent[1704715200..1705320000]"},
      {"sent:(-7d OR 2023)", "(sent[1704715200..1705320000] OR sent[1672531200..1704067199])"},
      {"sent:(2024 -7d)", "(sent[1704067200..1735689599] sent[1704715200..1705320000])"},
      {"sent:(2024 NOT -7d)", "(sent[1704067200..1735689599] -sent[1704715200..1705320000])"},
      {"sent:(2024 --7d)", "?11"},
      {"sent:(2024 -2023)", "(sent[1704067200..1735689599] -sent[1672531200..1704067199])"},
      {"sent:(2024 -2024-01-05)", "(sent[1704067200..1735689599] -sent[1704412800..1704499199])"},
      {"sent:(2024 -today)", "(sent[1704067200..1735689599] -sent[1705276800..1705363199])"},
      {"sent:(2024 -(-7d))", "(sent[1704067200..1735689599] -sent[1704715200..1705320000])"},
      {"sent:(-1h30m..now)", "sent[1705314600..1705320000]"},
      {"sent:(-7D..-1d)", "sent[1704715200..1705233600]"},
      {"sent:(-7d..)", "sent[1704715200..]"},
      {"duration:(3m -7s)", "(duration[180000..180999] -duration[7000..7999])"},
      {"name:(a -7d)", "(name:a -name:7d)"},
      {"a -7d", "(a -7d)"},
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

TEST_F(QueryParseTest, AFieldGoesForAllWithinTheBracketsBehindIt) {
  ExpectAll({
      {"name:(a OR b)", "(name:a OR name:b)"},
      {"name:(a b)", "(name:a name:b)"},
      {"name:(a)", "name:a"},
      {"x name:(a OR b) y", "(x (name:a OR name:b) y)"},
      {"name:(a -b)", "(name:a -name:b)"},
      {"name:(a NOT b AND c)", "(name:a -name:b name:c)"},
      {"-name:(a OR b) x", "(-(name:a OR name:b) x)"},
      {"x name:(-a)", "(x -name:a)"},
      {"(name:(a OR b) OR c) d", "(((name:a OR name:b) OR c) d)"},
      {"name:(a (b OR c))", "(name:a (name:b OR name:c))"},
      {"name:( a* OR *b* OR \"c d\" )", "(name:a* OR name:*b* OR name:\"c d\")"},
      {"title:(\"moby dick\" OR whale*)", "(title:\"moby dick\" OR title:whale*)"},
      {"text:(a \"b c\"*) d", "((text:a text:\"b c\"*) d)"},
      {"path:(a/b OR c)", "(path:*a/b* OR path:*c*)"},
      {"NAME:(a) OR tag:(b)", "(name:a OR keywords:b)"},
      {"name:(12:30 c:)", "(name:12:30 name:c:)"},
      {"name:(copy(1) x)", "(name:copy(1) name:x)"},
      {"name:(a)b", "(name:a b)"},
      {"name:(a)name:b", "(name:a name:b)"},
      {"name:(a OR b)author:(c)", "((name:a OR name:b) author:c)"},
      {"name:(or and not)", "(name:or name:and name:not)"},
      {"kind:(photo OR video)", "(kind:photo OR kind:video)"},
      {"ext:(pdf OR jpg,png)", "(ext:pdf OR ext:jpg,png)"},
      {"has:(artist -album)", "(has:artist -has:album)"},
      {"size:(>1K <1M)", "(size[1025..] size[..1048575])"},
      {"name:\"(a\" b", "(name:\"(a\" b)"},
      {"name:*(1)*", "name:*(1)*"},
  });
}

TEST_F(QueryParseTest, WhatIsWrongInBracketsBehindAFieldIsShown) {
  ExpectAll({
      {"name:(", "?6"},           {"name:(a", "?5"},
      {"x name:(a OR", "?12"},    {"name:()", "?6"},
      {"name:(a OR)", "?10"},     {"name:(OR a)", "?6"},
      {"name:(a title:b)", "?8"}, {"name:(a (b OR author:c))", "?14"},
      {"name:(title:(a))", "?6"}, {"name:(-size:1)", "?7"},
      {"name:(a name:b)", "?8"},  {"name:(a size=1)", "?8"},
      {"name:(a sise:1)", "?8"},  {"name:(-a)", "?6"},
      {"name:(a OR -b)", "?11"},  {"name: (a)", "?0"},
      {"name:(\"a/b\")", "?8"},   {"name:(*)", "?6"},
      {"title:(a ++)", "?9"},     {"kind:(film)", "?6"},
      {"size:(1X)", "?6"},        {"name:(a) )", "?9"},
  });
}

TEST_F(QueryParseTest, SeveralValuesMayStandInQuotes) {
  ExpectAll({
      {"share:\"data\",\"dup\" one", "(share:data,dup one)"},
      {"share:\"we ird:e\",data", "share:we ird:e,data"},
      {"share:data,\"we ird:e\" x", "(share:data,we ird:e x)"},
      {"share:\"a,b\",c", "share:a,b,c"},
      {"kind:\"document\",\"photo\"", "kind:document,photo"},
      {"kind:document,\"photo\",video", "kind:document,photo,video"},
      {"ext:\"txt\",\"gz\"", "ext:txt,gz"},
      {"ext:(\"txt\",gz OR pdf,\"jpg\")", "(ext:txt,gz OR ext:pdf,jpg)"},
      {"owner:\"0\",\"1\"", "owner:0,1"},
      {"kind:\"photo,video\"", "kind:photo,video"},
  });
}

TEST_F(QueryParseTest, CommasInQuotesBelongToTheNameOfAShareAndPartAllElse) {
  const auto names = [](const std::string& text) {
    QueryNode query;
    QueryError error;
    EXPECT_TRUE(ParseQuery(text, NOW, query, error)) << text;
    return query.names;
  };
  using Names = std::vector<std::string>;
  EXPECT_EQ(names("share:\"a,b\""), Names({"a,b"}));
  EXPECT_EQ(names("share:\"a,b\",c,\"d\""), Names({"a,b", "c", "d"}));
  EXPECT_EQ(names("share:a,b"), Names({"a", "b"}));
  EXPECT_EQ(names("ext:\"tar.gz,zip\""), Names({"tar.gz", "zip"}));
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
      {"size:10MI..10b", "?5"},
      {"size:>=10Mi", "size[10485760..]"},
      {"size:10B", "size[10..10]"},
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
      {"track:-1..2", "track[-1..2]"},
  });
}

TEST_F(QueryParseTest, CapitalLettersDoNotCountInValuesKnownByName) {
  for (const auto& [text, as_small] : std::vector<std::pair<std::string, std::string>>{
           {"sent:TODAY", "sent:today"},
           {"sent:Yesterday", "sent:yesterday"},
           {"sent:2024..NOW", "sent:2024..now"},
           {"taken:Today", "taken:today"},
           {"modified:>-1D", "modified:>-1d"},
           {"modified:-1H30M", "modified:-1h30m"},
           {"sent:2024-01-05t12:30", "sent:2024-01-05T12:30"},
           {"duration:>1H", "duration:>1h"},
           {"duration:90S..3M", "duration:90s..3m"},
           {"size:1MIB..2mib", "size:1MiB..2MiB"},
           {"bitrate:1m", "bitrate:1M"},
           {"near:0,0,1KM", "near:0,0,1km"},
           {"near:0,0,1Km", "near:0,0,1km"},
           {"near:0,0,500M", "near:0,0,500m"},
           {"kind:Folder IS:Duplicate has:TEXT content:Failed",
            "kind:folder is:duplicate has:text content:failed"},
       }) {
    EXPECT_EQ(Parsed(text), Parsed(as_small)) << text;
    EXPECT_FALSE(Parsed(text).starts_with('?')) << text;
  }
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
  EXPECT_EQ(Parsed("sent:2024-10-27T02:30"), "sent[1729989000..1729992659]") << "it comes twice";
  EXPECT_EQ(Parsed("sent:>=2024-10-27T02:00"), "sent[1729987200..]");
  EXPECT_EQ(Parsed("sent:2024-10-27T03:00"), "sent[1729994400..1729994459]");
  EXPECT_EQ(Parsed("sent:2024-06-01T12:00"), "sent[1717236000..1717236059]");
  EXPECT_EQ(Parsed("taken:2024-01-05"), "taken[1704412800..1704499199]") << "a clock without zone";

  Zone("America/Havana");  // the clock is put forward and back at midnight
  for (const char* before : {"sent:2024-06-01", "sent:2024-12-01"}) {
    (void)Parsed(before);
    EXPECT_EQ(Parsed("sent:2024-11-02"), "sent[1730520000..1730606399]") << before;
    EXPECT_EQ(Parsed("sent:2024-11-03"), "sent[1730606400..1730696399]") << before;
    EXPECT_EQ(Parsed("sent:2024-03-10"), "sent[1710046800..1710129599]") << before;
    EXPECT_EQ(Parsed("sent:2024-03-10T00:30"), "sent[1710048600..1710048659]") << before;
  }
}

}  // namespace fileindexd
