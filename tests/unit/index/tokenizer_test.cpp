// SPDX-License-Identifier: GPL-2.0-or-later
#include <gtest/gtest.h>

#include <algorithm>
#include <string>
#include <vector>

#include "index/text_tokenizer.h"
#include "state/sqlite.h"

namespace fileindexd {

namespace {

using Names = std::vector<std::string>;

}  // namespace

class TokenizerTest : public testing::Test {
 protected:
  void SetUp() override { Use("english"); }
  ~TokenizerTest() override { sqlite3_close_v2(db); }

  void Use(const std::string& language) {
    sqlite3_close_v2(db);
    ASSERT_EQ(sqlite3_open(":memory:", &db), SQLITE_OK);
    ASSERT_EQ(RegisterTextTokenizer(db), SQLITE_OK);
    Run("CREATE VIRTUAL TABLE t USING fts5(x, content='', tokenize='fileindex " + language + "')");
    Run("CREATE VIRTUAL TABLE v USING fts5vocab(t, instance)");
  }

  void Run(const std::string& sql) {
    ASSERT_EQ(sqlite3_exec(db, sql.c_str(), nullptr, nullptr, nullptr), SQLITE_OK)
        << sqlite3_errmsg(db);
  }

  void Insert(const std::string& text) {
    Statement insert;
    ASSERT_EQ(insert.Prepare(db, "INSERT INTO t(x) VALUES(?1)"), SQLITE_OK);
    insert.BindText(1, text);
    ASSERT_EQ(insert.Run(), SQLITE_OK) << text;
  }

  // The words of a text: those of one place joined by '|', sorted.
  Names Words(const std::string& text) {
    Run("INSERT INTO t(t) VALUES('delete-all')");
    Insert(text);
    Statement read;
    EXPECT_EQ(read.Prepare(db, "SELECT \"offset\", term FROM v ORDER BY 1, 2"), SQLITE_OK);
    Names words;
    int64_t place = -1;
    while (read.Step() == SQLITE_ROW) {
      if (read.Int(0) != place) {
        words.emplace_back();
      }
      words.back() += (words.back().empty() ? "" : "|") + read.Bytes(1);
      place = read.Int(0);
    }
    return words;
  }

  // Whether the question's word finds the text.
  bool Finds(const std::string& word, const std::string& text) {
    Run("INSERT INTO t(t) VALUES('delete-all')");
    Insert(text);
    Statement ask;
    EXPECT_EQ(ask.Prepare(db, "SELECT count(*) FROM t WHERE t MATCH ?1"), SQLITE_OK);
    const std::string query = TextQuery(word);
    ask.BindText(1, query);
    EXPECT_EQ(ask.Step(), SQLITE_ROW) << word;
    return ask.Int(0) == 1;
  }

  sqlite3* db = nullptr;
};

TEST_F(TokenizerTest, CutsWords) {
  const struct {
    const char* text;
    Names words;
  } cases[] = {
      {"", {}},
      {" \t\n.,;", {}},
      {"The quick fox", {"the", "quick", "fox"}},
      {"running shoes", {"run|running", "shoe|shoes"}},
      {"a-b/c", {"a", "b", "c"}},
      {"foo_bar baz", {"bar|foo|foo_bar", "baz"}},
      {"__init__", {"init"}},
      {"fooBar", {"bar|foo|foobar"}},
      {"XMLReader", {"reader|xml|xmlreader"}},
      {"PDFs USA", {"pdfs", "usa"}},
      {"v1.2", {"1|1.2|2|v|v1|v1.2"}},
      {"3.14 and 2.", {"14|3|3.14", "and", "2"}},
      {"10.0.0.1", {"0|1|10|10.0.0.1"}},
      {"end.Start", {"end", "start"}},
      {"utf8 mp3", {"utf8", "mp3"}},
      {"IMG_2034.jpg", {"2034|img|img_2034", "jpg"}},
      {"don't", {"don", "t"}},
      {"\xff\xfe ab\xc3", {"ab"}},
  };
  for (const auto& one : cases) {
    EXPECT_EQ(Words(one.text), one.words) << one.text;
  }
}

TEST_F(TokenizerTest, FoldsCaseAccentsAndCompatibilityForms) {
  const struct {
    const char* text;
    Names words;
  } cases[] = {
      {"\u00dcBUNG u\u0308bung", {"ubung", "ubung"}},
      {"Stra\u00dfe", {"strass|strasse"}},
      {"\ufb01nance \uff21\uff22\uff23", {"financ|finance", "abc"}},
      {"\u03a3\u03af\u03c3\u03c5\u03c6\u03bf\u03c2",
       {"\u03c3\u03b9\u03c3\u03c5\u03c6\u03bf\u03c3"}},
      {"\u0130stanbul", {"istanbul"}},
      {"co\u00adoperate", {"cooper|cooperate"}},
      {"\u041c\u043e\u0441\u043a\u0432\u0430", {"\u043c\u043e\u0441\u043a\u0432\u0430"}},
      {"x\u00b2", {"x2"}},
      {"\u0645\u064f\u062d\u064e\u0645\u0651\u064e\u062f", {"\u0645\u062d\u0645\u062f"}},
  };
  for (const auto& one : cases) {
    EXPECT_EQ(Words(one.text), one.words) << one.text;
  }
}

TEST_F(TokenizerTest, PairsCharactersOfScriptsWithoutBlanks) {
  const struct {
    const char* text;
    Names words;
  } cases[] = {
      {"\u4e2d\u6587\u5b57", {"\u4e2d\u6587", "\u6587\u5b57", "\u5b57"}},
      {"\u4e2d", {"\u4e2d"}},
      {"abc\u4e2d\u6587def", {"abc", "\u4e2d\u6587", "\u6587", "def"}},
      {"\u98df\u3079\u308b", {"\u98df\u3079", "\u3079\u308b", "\u308b"}},
      {"\uff76\uff9e\uff97\uff7d", {"\u30ac\u30e9", "\u30e9\u30b9", "\u30b9"}},
      {"\u304b\u3099\u304f", {"\u304c\u304f", "\u304f"}},
      {"\ud55c\uad6d\uc5b4", {"\ud55c\uad6d", "\uad6d\uc5b4", "\uc5b4"}},
      {"\u1112\u1161\u11ab\u1100\u116e\u11a8", {"\ud55c\uad6d", "\uad6d"}},
  };
  for (const auto& one : cases) {
    EXPECT_EQ(Words(one.text), one.words) << one.text;
  }
}

TEST_F(TokenizerTest, QuestionsFindWords) {
  const struct {
    const char* word;
    const char* text;
    bool found;
  } cases[] = {
      {"run", "she was running", true},
      {"Running", "a good run", true},
      {"runs", "running", true},
      {"runn*", "running", true},
      {"runs*", "running", false},
      {"foo_bar", "call foo_bar(x)", true},
      {"foo_bar", "foo and bar", false},
      {"bar", "call foo_bar(x)", true},
      {"fooBar", "call fooBar(x)", true},
      {"foobar", "call fooBar(x)", true},
      {"bars", "call fooBar(x)", true},
      {"foo", "call fooBar(x)", true},
      {"v1.2", "in v1.2 we", true},
      {"v1.2", "in v1.3 we", false},
      {"1.2", "in v1.2 we", true},
      {"v1", "in v1.2 we", true},
      {"well-known", "a well-known fact", true},
      {"well-known", "known well", false},
      {"3.14", "pi is 3.14", true},
      {"ubung", "\u00dcbungen und \u00dcbung", true},
      {"\u4e2d\u6587", "\u5b66\u4e2d\u6587\u5b57", true},
      {"\u6587\u4e2d", "\u5b66\u4e2d\u6587\u5b57", false},
      {"\u4e2d\u6587\u5b57", "\u5b66\u4e2d\u6587\u5b57", true},
      {"\u4e2d\u6587\u3002", "\u5b66\u4e2d\u6587\u5b57", true},
      {"\u5b66", "\u5b66\u4e2d\u6587\u5b57", true},
      {"\u6587", "\u5b66\u4e2d\u6587\u5b57", true},
      {"\u5b57", "\u5b66\u4e2d\u6587\u5b57", true},
      {"\u5b57*", "\u5b66\u4e2d\u6587\u5b57", true},
      {"\u4e2d\u6587*", "\u5b66\u4e2d\u6587\u5b57", true},
      {"abc\u4e2d", "abc\u4e2d\u6587", true},
      {"\u4e2d\u6587abc", "\u4e2d\u6587abc", true},
      {"\ud55c\uad6d", "\ud55c\uad6d\uc5b4\ub97c", true},
      {"\u1100\u116e\u11a8", "\ud55c\uad6d\uc5b4", true},
      {"\u1100\u116e\u11a8", "\u1112\u1161\u11ab\u1100\u116e\u11a8\u110b\u1165", true},
      {"\uad6d", "\u1112\u1161\u11ab\u1100\u116e\u11a8\u110b\u1165", true},
      {"foo \u1100\u116e\u11a8", "foo \uad6d\uc5b4", true},
      {"\u304b\u3099", "\u304c\u3044", true},
      {"\uff8a\uff9e", "\u30d0\u30b9", true},
      {"\u304b\u3099", "\u304b\u3044", false},
      {"\u304b\u304f", "\u304b\u304f\u3082", true},
      {"\u6587 \u5b57", "\u6587 \u5b57\u5178", true},
      {"\u6587abc", "\u6587abcd", false},
      {"\u6587\u3002", "\u6587\u5b57", true},
      {"\u6587\u20dd", "\u6587\u5b57", true},
      {"AND", "and", true},
      {"\"", "quote", false},
      {"a\"b", "a b", true},
  };
  for (const auto& one : cases) {
    EXPECT_EQ(Finds(one.word, one.text), one.found) << one.word << " in " << one.text;
  }
}

TEST_F(TokenizerTest, LanguageTellsTheStems) {
  Use("german");
  EXPECT_TRUE(Finds("Haus", "viele H\u00e4user"));
  EXPECT_TRUE(Finds("hauser", "ein Haus"));
  Use("none");
  EXPECT_EQ(Words("running"), Names({"running"}));
  EXPECT_FALSE(Finds("run", "running"));
  Use("french");
  EXPECT_TRUE(Finds("grande", "les grands"));
}

TEST_F(TokenizerTest, ACapitalBehindADigitBeginsAWord) {
  EXPECT_EQ(Words("Utf8Decoder"), Names({"8|decod|decoder|utf|utf8decoder"}));
  EXPECT_EQ(Words("MP3Player"), Names({"3|mp|mp3player|player"}));
  EXPECT_TRUE(Finds("hash", "Sha256Hash"));
  EXPECT_TRUE(Finds("encoder", "Base64Encoder"));
  EXPECT_EQ(Words("4GB"), Names({"4gb"}));
  EXPECT_EQ(Words("A4s"), Names({"a4s"}));
}

TEST_F(TokenizerTest, ABreakWithoutWidthEndsAWord) {
  EXPECT_EQ(Words("harbour\u200bquay"), Names({"harbour", "quay"}));
  EXPECT_TRUE(
      Finds("\u0e40\u0e23\u0e37\u0e2d", "\u0e17\u0e48\u0e32\u200b\u0e40\u0e23\u0e37\u0e2d"));
}

TEST_F(TokenizerTest, AWordOfManyJoinedOnesHasThemAll) {
  constexpr const char* NAME = "test_that_a_user_can_log_in_with_a_valid_passphrase";
  for (const char* part : {"user", "log", "valid", "passphrase"}) {
    EXPECT_TRUE(Finds(part, NAME)) << part;
  }
}

TEST_F(TokenizerTest, EncodedDataHasNoParts) {
  EXPECT_EQ(Words("aB1cD2eF3gH4iJ5kL6mN7").size(), 1U);
  EXPECT_EQ(Words("aB1cD2eF3gH4iJ5kL6mN7"), Names({"ab1cd2ef3gh4ij5kl6mn7"}));
  EXPECT_EQ(Words(std::string(1000, 'x')), Names({std::string(64, 'x')}));
  EXPECT_TRUE(Finds(std::string(1000, 'x'), std::string(1000, 'x')));
  std::string long_word;
  for (int i = 0; i < 100; ++i) {
    long_word += "\u00e9\u0436";
  }
  EXPECT_LE(Words(long_word).front().size(), 64U);
  EXPECT_TRUE(Finds(long_word, long_word));
  EXPECT_EQ(Words(std::string(100'000, '_') + "a" + std::string(100'000, '_')), Names({"a"}));
}

TEST_F(TokenizerTest, WordThatWasMetBeforeIsCutTheSame) {
  EXPECT_EQ(Words("fooBar_1 fooBar_1 v1.2 fooBar_1"),
            Names({"1|bar|foo|foobar|foobar_1", "1|bar|foo|foobar|foobar_1", "1|1.2|2|v|v1|v1.2",
                   "1|bar|foo|foobar|foobar_1"}));

  TextCutter cutter("english");
  Names words;
  const auto take = [&words](std::string_view word, size_t, size_t) {
    words.emplace_back(word);
    return words.size() != 1;
  };
  cutter.Cut("fooBar", false, take);  // stopped within the word
  words = {"", ""};
  cutter.Cut("fooBar", false, take);
  EXPECT_EQ(words, Names({"", "", "foobar", "foo", "bar"}));
}

TEST_F(TokenizerTest, TextThatWasCutBeforeHasTheSameWords) {
  TextCutter cutter("english");
  for (const char* text : {"Two connections of fooBar_1 in v1.2", "\u00dcber H\u00e4user",
                           "\u6771\u4eac\u90fd ", ""}) {
    EXPECT_EQ(Words(cutter.CutForTable(text)), Words(text)) << text;
  }
  EXPECT_TRUE(Finds("connected", cutter.CutForTable("two connections")));
}

TEST_F(TokenizerTest, CutTextThatEndsWithinATokenEndsBeforeIt) {
  const std::string cut = TextCutter("none").CutForTable("one two");
  const size_t mark = CUT_MARK.size();
  ASSERT_EQ(cut.size(), mark + 10);
  for (size_t size = mark; size < cut.size(); ++size) {
    EXPECT_EQ(Words(cut.substr(0, size)), size < mark + 5 ? Names() : Names({"one"})) << size;
  }
}

TEST_F(TokenizerTest, AnyBytesAreTaken) {
  std::string bytes;
  uint32_t seed = 7;
  for (int i = 0; i < 20'000; ++i) {
    seed = seed * 1664525 + 1013904223;
    bytes += static_cast<char>(seed >> 24);
  }
  Insert(bytes);
  std::string codes;
  for (int32_t code = 1; code < 0x11000; ++code) {
    if (code < 0xd800 || code > 0xdfff) {
      char utf8[5] = {};
      const auto put = [&](int i, int32_t value) { utf8[i] = static_cast<char>(value); };
      if (code < 0x80) {
        put(0, code);
      } else if (code < 0x800) {
        put(0, 0xc0 | code >> 6);
        put(1, 0x80 | (code & 63));
      } else if (code < 0x10000) {
        put(0, 0xe0 | code >> 12);
        put(1, 0x80 | (code >> 6 & 63));
        put(2, 0x80 | (code & 63));
      } else {
        put(0, 0xf0 | code >> 18);
        put(1, 0x80 | (code >> 12 & 63));
        put(2, 0x80 | (code >> 6 & 63));
        put(3, 0x80 | (code & 63));
      }
      codes += utf8;
      codes += code % 3 == 0 ? " " : "";
    }
  }
  Insert(codes);
}

TEST(LanguageTest, NamesAndCodesAreKnown) {
  EXPECT_EQ(LanguageName("en"), "english");
  EXPECT_EQ(LanguageName("English"), "english");
  EXPECT_EQ(LanguageName("DE"), "german");
  EXPECT_EQ(LanguageName("none"), "none");
  for (const char* bad : {"", "klingon", "english ", "e'n", "../x"}) {
    EXPECT_EQ(LanguageName(bad), "") << bad;
  }
  for (const std::string& name : Languages()) {
    EXPECT_EQ(LanguageName(name), name);
  }
}

}  // namespace fileindexd
