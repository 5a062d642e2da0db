// SPDX-License-Identifier: GPL-2.0-or-later
// What people are told of a question that makes no sense.
#include "base/utf8.h"
#include "tests/unit/index/query_parse_fixture.h"
#include "tests/unit/repeated.h"

namespace fileindexd {

class QueryErrorsTest : public QueryParseTest {};

TEST_F(QueryErrorsTest, ShowTheCharacterAndWhatStandsThere) {
  const std::string text = "\u00fcber size:1X und mehr";
  EXPECT_EQ(LineOf(text),
            text + ": '1X' is not a size like 500K, 10M or 1.5G (character 11, at: 1X und mehr)");
}

// What they say, and where.
TEST_F(QueryErrorsTest, AreLinesForPeople) {
  const std::string missing = "something to find is missing here";
  const std::vector<Case> cases = {
      {"a OR", missing + " (character 5, at the end)"},
      {"\u00fc (", missing + " (character 4, at the end)"},
      {"a AND", missing + " (character 6, at the end)"},
      {"a ()", "something to find is missing in front of this bracket (character 4, at: ))"},
      {"OR a",
       "OR stands between two things (the word stands in quotes: \"OR\") (character 1, at: OR a)"},
      {"size:", "size: needs a value right behind the colon (character 1, at: size:)"},
      {"size>1M",
       "a colon is missing behind 'size', as in size:>1M (a word with > stands in quotes) "
       "(character 1, at: size>1M)"},
      {"size > 1M",
       "behind the field 'size' stands a colon and no blank, as in size:>1M "
       "(as a word it stands in quotes) (character 1, at: size > 1M)"},
      {"size=",
       "a colon is missing behind 'size' (a word with = stands in quotes) (character 1, "
       "at: size=)"},
      {"name:(a title:b)",
       "no field stands within the brackets of another, name:( ) (character 9, "
       "at: title:b))"},
      {"foo:>3",
       "there is no field 'foo' (a word with a colon stands in quotes) (character 1, at: foo:>3)"},
      {"", "nothing to search for"},
      {"name:\"report\"x", "a blank is missing behind what stands in quotes (character 14, at: x)"},
      {"a size:<0", "no such number is below 0 (character 8, at: <0)"},
      {"rating:>5", "a rating goes from 0 to 5 (character 8, at: >5)"},
      {"pages:>9223372036854775807",
       "no number is greater than that (character 7, at: >9223372036854775807)"},
      {"size:>8192P", "'8192P' is too large (character 7, at: 8192P)"},
      {"size:9223372036854775807",
       "'9223372036854775807' is too large (character 6, at: 9223372036854775807)"},
      {"year:99999999999999999999",
       "'99999999999999999999' is too large (character 6, at: 99999999999999999999)"},
      {"bitrate:>99999999999999M",
       "'99999999999999M' is too large (character 10, at: 99999999999999M)"},
      {"duration:1h..99999999999m", "'99999999999m' is too large (character 14, at: 99999999999m)"},
      {"sent:>-99999999999d", "'-99999999999d' is too large (character 7, at: -99999999999d)"},
      {"modified:>2262", "no time is later than that (character 10, at: >2262)"},
      {"modified:2024-01-05T12:30:15",
       "'2024-01-05T12:30:15' is not a time like today, yesterday, -7d, 2024, 2024-01, 2024-01-05 "
       "or 2024-01-05T12:30 (character 10, at: 2024-01-05T12:30:15)"},
      {"size:>10i", "'10i' is not a size like 500K, 10M or 1.5G (character 7, at: 10i)"},
      {"size:10iB", "'10iB' is not a size like 500K, 10M or 1.5G (character 6, at: 10iB)"},
      {"a OR -b",
       "this side of OR says only what not to find; add to it what to find, as in kind:document "
       "(character 6, at: -b)"},
      {"-a -b",
       "this says only what not to find; add what to find, as in kind:document (character 1, at: "
       "-a -b)"},
      {"size:5M..1M", "the range ends before it begins (character 6, at: 5M..1M)"},
      {"near:1,2,0",
       "latitude goes from -90 to 90, longitude from -180 to 180, and a radius is above 0 "
       "(character 6, at: 1,2,0)"},
  };
  for (const Case& one : cases) {
    EXPECT_EQ(LineOf(one.text), (one.text.empty() ? "" : one.text + ": ") + one.parsed);
  }
}

// What is shown of a long question is what stands around the place.
TEST_F(QueryErrorsTest, OfLongQuestionsShowAPieceOfThem) {
  const std::string many = Repeated("\u00fc", 1500);
  const std::string what = ": 'x' is not a size like 500K, 10M or 1.5G (character ";
  EXPECT_EQ(LineOf(many + " size:x"),
            "\u2026" + Repeated("\u00fc", 53) + " size:x" + what + "1507, at: x)");
  EXPECT_EQ(LineOf("size:x " + many), "size:x " + Repeated("\u00fc", 53) + "\u2026" + what +
                                          "6, at: x " + Repeated("\u00fc", 28) + "\u2026)");
  EXPECT_EQ(LineOf(many + " size:x " + Repeated("\u00fc", 100)),
            "\u2026" + Repeated("\u00fc", 14) + " size:x " + Repeated("\u00fc", 38) + "\u2026" +
                what + "1507, at: x " + Repeated("\u00fc", 28) + "\u2026)");
  EXPECT_EQ(LineOf(many + " ("),
            "\u2026" + Repeated("\u00fc", 58) +
                " (: something to find is missing here (character 1503, at the end)");
  EXPECT_EQ(LineOf(std::string(5000, 'a')), "\u2026" + std::string(20, 'a') + std::string(40, 'a') +
                                                "\u2026: the question is too long (character "
                                                "4097, at: " +
                                                std::string(30, 'a') + "\u2026)");
}

TEST_F(QueryErrorsTest, CiteNoMoreOfAValueThanShowsWhichItIs) {
  const std::string many = Repeated("\u00fc", 1500);
  for (const std::string& text :
       {"size:" + many, "kind:" + many, "owner:" + many, "under:" + many, "share:/" + many,
        "near:" + many, "ext:/" + many, "is:" + many, "has:" + many, "content:" + many,
        "text:" + Repeated("+", 3000), "size>" + many, "title=\"" + many + "\"",
        std::string(3000, 'q') + ":>1", "modified:" + many + ".." + many, "year:" + many}) {
    const std::string line = LineOf(text);
    EXPECT_LT(line.size(), 600U) << line;
    EXPECT_EQ(ToUtf8(line), line);
    EXPECT_NE(line.find("\u2026"), std::string::npos) << line;
  }
}

TEST_F(QueryErrorsTest, ShowControlCharactersInDigits) {
  EXPECT_EQ(LineOf("a\x1b[31m\tb size:1X\n\x7f"),
            "a\\x1b[31m\\x09b size:1X\\x0a\\x7f: '1X' is not a size like 500K, 10M or 1.5G "
            "(character 15, at: 1X\\x0a\\x7f)");
  EXPECT_EQ(LineOf("kind:\"a\x01\""),
            "kind:\"a\\x01\": 'a\\x01' is no kind: document, audio, video, photo, other or folder "
            "(character 7, at: a\\x01\")");
}

}  // namespace fileindexd
