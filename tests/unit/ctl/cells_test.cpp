// SPDX-License-Identifier: GPL-2.0-or-later
#include "ctl/terminal/cells.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace fileindexd {
namespace {

std::string Middle(std::string_view text, size_t columns,
                   const std::vector<Snippet::Mark>& marks = {}) {
  return ShowCells(CutMiddle(CellsOf(text, marks), columns), false);
}

std::string Around(std::string_view text, size_t columns,
                   const std::vector<Snippet::Mark>& marks = {}) {
  return ShowCells(CutAround(CellsOf(text, marks), columns), false);
}

TEST(CellsTest, ColumnsAreThoseOfATerminal) {
  const struct {
    const char* text;
    size_t columns;
    size_t cells;
  } cases[] = {
      {"", 0, 0},
      {"plain", 5, 5},
      {"gr\u00fc\u00df", 4, 4},
      {"u\u0308", 1, 1},             // a letter and its accent
      {"\u0308u", 1, 2},             // an accent upon nothing
      {"\u6771\u4eac", 4, 2},        // wide
      {"\uff76\uff9e", 2, 2},        // half-width kana
      {"\u1112\u1161\u11ab", 2, 1},  // a Hangul syllable in parts
      {"\u0915\u093e", 2, 2},        // a vowel sign beside its letter
      {"\U0001f600", 2, 1},
      {"a\u200db", 2, 2},      // a joiner takes no room
      {"a\u0378b", 3, 3},      // no character yet: it takes room all the same
      {"a\U0001faffb", 4, 3},  // and more, where it will be a picture
      {"\t", 4, 1},
      {"\x7f\x1b", 8, 2},
      {"\u0085", 8, 1},  // a control character of two bytes
      {"\u202e", 6, 1},
      {"\u2028", 6, 1},
      {"\xff", 4, 1},
      {"\xe6\x9d", 8, 2},       // cut off
      {"\xed\xa0\x80", 12, 3},  // half of a pair is no UTF-8
      {"\xc0\xaf", 8, 2},
  };
  for (const auto& one : cases) {
    const Cells cells = CellsOf(one.text);
    EXPECT_EQ(ColumnsOf(cells), one.columns) << one.text;
    EXPECT_EQ(cells.size(), one.cells) << one.text;
  }
}

TEST(CellsTest, WhatWouldMoveTheCursorIsShownInDigits) {
  EXPECT_EQ(ShowCells(CellsOf("a\x1b[1mb\n\xff\u009b\u202e"), true),
            "a\\x1b[1mb\\x0a\\xff\\xc2\\x9b\\u202e");
}

TEST(EscapedJsonTest, MeansTheSameAndActsOnNothing) {
  EXPECT_EQ(EscapedJson("{\"a\":\"gr\u00fc\u00df \\n\"}"), "{\"a\":\"gr\u00fc\u00df \\n\"}");
  EXPECT_EQ(EscapedJson("\"\x7f\u009b\u202e\u2028\""), "\"\\u007f\\u009b\\u202e\\u2028\"");
  EXPECT_EQ(EscapedJson("\"\xff\""), "\"\\ufffd\"");
}

TEST(WrappedLinesTest, PartsAtBlanks) {
  using testing::ElementsAre;
  EXPECT_THAT(WrappedLines("one two three", 20), ElementsAre("one two three"));
  EXPECT_THAT(WrappedLines("one two three", 9), ElementsAre("one two", "three"));
  EXPECT_THAT(WrappedLines("one two three", 8), ElementsAre("one two", "three"));
  EXPECT_THAT(WrappedLines("one two three", 5), ElementsAre("one", "two", "thre", "e"));
  EXPECT_THAT(WrappedLines("\u6771\u4eac", 1), ElementsAre("\u6771", "\u4eac"));
  EXPECT_THAT(WrappedLines("", 9), ElementsAre());
}

TEST(CellsTest, MarksAreBrightWhereThereAreColours) {
  const Cells cells = CellsOf("one two", {{0, 3}, {4, 7}});

  EXPECT_EQ(ShowCells(cells, true), "\x1b[1;31mone\x1b[0m \x1b[1;31mtwo\x1b[0m");
  EXPECT_EQ(ShowCells(cells, false), "one two");
}

TEST(CellsTest, MarksThatMakeNoSenseDoNoHarm) {
  for (const Snippet::Mark mark : {Snippet::Mark{2, 2}, {3, 1}, {9, 12}, {1, 99}}) {
    EXPECT_EQ(ShowCells(CellsOf("text", {mark}), false), "text");
  }
  // In the middle of a character: it is marked if its first byte is.
  EXPECT_EQ(ShowCells(CellsOf("\u00fcx", {{1, 2}}), true), "\u00fcx");
}

TEST(CutMiddleTest, LeavesAloneWhatFits) {
  EXPECT_EQ(Middle("/srv/a.txt", 10), "/srv/a.txt");
  EXPECT_EQ(Middle("", 0), "");
  EXPECT_EQ(Middle("\u6771\u4eac", 4), "\u6771\u4eac");
}

TEST(CutMiddleTest, KeepsMoreOfTheEnd) {
  EXPECT_EQ(Middle("/srv/photos/2024/summer/beach.jpg", 16), "/srv/…/beach.jpg");
  EXPECT_EQ(Middle("0123456789", 9), "01…456789");
  EXPECT_EQ(Middle("0123456789", 2), "…9");
  EXPECT_EQ(Middle("0123456789", 1), "…");
  EXPECT_EQ(Middle("0123456789", 0), "");
}

TEST(CutMiddleTest, KeepsWhatIsMarked) {
  EXPECT_EQ(Middle("/data/reports/annual/x/y/z/long-name.txt", 24, {{6, 13}}),
            "/data/reports…g-name.txt");
  EXPECT_EQ(Middle("0123456789abcdefghij", 10, {{17, 20}}), "012…efghij");
  EXPECT_EQ(Middle("0123456789abcdefghij", 10, {{0, 9}}), "012345678…");
}

TEST(CutMiddleTest, NeverPartsACharacterFromItsMarks) {
  const std::string text = "abcdefghu\u0308u\u0308u\u0308u\u0308ijklmnop";
  for (size_t columns = 1; columns < 20; ++columns) {
    const std::string cut = Middle(text, columns);
    EXPECT_EQ(cut.find("…\u0308"), std::string::npos) << cut;
    EXPECT_EQ(ColumnsOf(CellsOf(cut)), columns) << cut;
  }
}

TEST(CutMiddleTest, WideCharactersNeverStandOut) {
  const std::string text = "\u6771a\u4eac\u6771\u4eacbcd\u6771\u4eac\u6771\u4eac\u6771";
  for (size_t columns = 1; columns < 25; ++columns) {
    EXPECT_LE(ColumnsOf(CellsOf(Middle(text, columns))), columns);
    EXPECT_LE(ColumnsOf(CellsOf(Around(text, columns))), columns);
  }
}

TEST(CutAroundTest, CutsAtTheEnd) {
  EXPECT_EQ(Around("a line of text", 14), "a line of text");
  EXPECT_EQ(Around("a line of text", 9), "a line o…");
  EXPECT_EQ(Around("a line of text", 1), "…");
  EXPECT_EQ(Around("a line of text", 0), "");
}

TEST(CutAroundTest, GoesToTheMark) {
  EXPECT_EQ(Around("0123456789 word and more", 12, {{11, 15}}), "…89 word an…");
  EXPECT_EQ(Around("0123456789 word", 8, {{11, 15}}), "…9 word");
  EXPECT_EQ(Around("word 0123456789", 8, {{0, 4}}), "word 01…");
  EXPECT_EQ(Around("0123456789 word", 3, {{11, 15}}), "…w…");
}

TEST(CutAroundTest, ShowsTheMarkWhereverItStands) {
  const std::string text(60, 'x');
  for (size_t start = 0; start < 57; ++start) {
    std::string with = text;
    with.replace(start, 3, "abc");
    for (size_t columns = 8; columns < 70; ++columns) {
      const std::string cut = Around(with, columns, {{start, start + 3}});
      EXPECT_NE(cut.find("abc"), std::string::npos) << start << ", " << columns << ": " << cut;
      EXPECT_LE(ColumnsOf(CellsOf(cut)), columns);
    }
  }
}

}  // namespace
}  // namespace fileindexd
