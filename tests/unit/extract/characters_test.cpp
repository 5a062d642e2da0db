// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/characters.h"

#include <gtest/gtest.h>

#include <string>

namespace fileindexd {

namespace {

TEST(CharactersTest, WellFormedOnesHaveTheirCodeAndLength) {
  const struct {
    std::string_view bytes;
    char32_t code;
    size_t length;
  } rows[] = {{"a", U'a', 1},
              {std::string_view("\0", 1), 0, 1},
              {"\xC2\x80", 0x80, 2},
              {"\xE2\x82\xAC!", 0x20AC, 3},
              {"\xED\x9F\xBF", 0xD7FF, 3},
              {"\xEE\x80\x80", 0xE000, 3},
              {"\xF0\x9F\x98\x80", 0x1F600, 4},
              {"\xF4\x8F\xBF\xBD", 0x10FFFD, 4}};
  for (const auto& row : rows) {
    const Utf8Character character = FirstCharacter(row.bytes);
    EXPECT_EQ(character.code, row.code) << row.bytes;
    EXPECT_EQ(character.length, row.length) << row.bytes;
    EXPECT_FALSE(character.is_wrong) << row.bytes;
    EXPECT_FALSE(character.is_cut) << row.bytes;
    std::string again;
    AppendUtf8(row.code, again);
    EXPECT_EQ(again, row.bytes.substr(0, row.length));
  }
}

TEST(CharactersTest, IllFormedOnesEndWhereAnotherCanBegin) {
  const struct {
    const char* bytes;
    size_t length;
    bool is_cut;
  } rows[] = {{"\x80", 1, false},
              {"\xC0\x80", 1, false},
              {"\xC1\xBF", 1, false},
              {"\xC3", 1, true},
              {"\xC3z", 1, false},
              {"\xE0\x9F\xBF", 1, false},
              {"\xE2\x82", 2, true},
              {"\xE2\x82z", 2, false},
              {"\xED\xA0\x80", 1, false},
              {"\xF0\x8F\xBF\xBF", 1, false},
              {"\xF4\x90\x80\x80", 1, false},
              {"\xF5\x80", 1, false},
              {"\xFF", 1, false},
              {"\xF0\x9F\x98", 3, true}};
  for (const auto& row : rows) {
    const Utf8Character character = FirstCharacter(row.bytes);
    EXPECT_TRUE(character.is_wrong) << row.bytes;
    EXPECT_EQ(character.code, U'\0') << row.bytes;
    EXPECT_EQ(character.length, row.length) << row.bytes;
    EXPECT_EQ(character.is_cut, row.is_cut) << row.bytes;
  }
}

TEST(CharactersTest, WhatIsNoCharacterIsWrittenAsTheOneForThat) {
  std::string text;
  AppendUtf8(0x110000, text);
  AppendUtf8(0xD800, text);
  AppendUtf8(0xDFFF, text);
  EXPECT_EQ(text, "\uFFFD\uFFFD\uFFFD");
}

TEST(CharactersTest, CleanTextHasNoBlankButSpaceAndLineFeed) {
  EXPECT_TRUE(IsCleanText(""));
  EXPECT_TRUE(IsCleanText("caf\xC3\xA9 \n \xE4\xB8\xAD"));
  for (const std::string bytes :
       {"\t", "\r", "\x01", "\x7F", "\xC2\xA0", "\xC2\x85", "\xE3\x80\x80", "\xEF\xBB\xBF",
        "\xEF\xBF\xBD", "\xFF", "a\xC3"}) {
    EXPECT_FALSE(IsCleanText(bytes)) << bytes;
  }
  EXPECT_FALSE(IsCleanText(std::string_view("a\0b", 3)));
}

TEST(CharactersTest, TextIsCutBeforeTheCharacterThatDoesNotFit) {
  EXPECT_EQ(CutText("ab", 2), "ab");
  EXPECT_EQ(CutText("ab\xE2\x82\xAC", 4), "ab");
  EXPECT_EQ(CutText("ab\xE2\x82\xAC", 5), "ab\xE2\x82\xAC");
  EXPECT_EQ(CutText("\xE2\x82\xAC", 0), "");
}

TEST(CharactersTest, NumbersThatCannotBeTrueAreTold) {
  EXPECT_TRUE(IsPlausible(ContentField::TAKEN, -1));
  EXPECT_TRUE(IsPlausible(ContentField::RATING, 0));
  EXPECT_TRUE(IsPlausible(ContentField::LATITUDE, -900'000'000));
  EXPECT_TRUE(IsPlausible(ContentField::PAGES, 1));
  EXPECT_FALSE(IsPlausible(ContentField::TAKEN, 0));
  EXPECT_FALSE(IsPlausible(ContentField::SENT, INT64_MAX));
  EXPECT_FALSE(IsPlausible(ContentField::YEAR, 10'000));
  EXPECT_FALSE(IsPlausible(ContentField::LATITUDE, 900'000'001));
  EXPECT_FALSE(IsPlausible(ContentField::LONGITUDE, -1'800'000'001));
  EXPECT_FALSE(IsPlausible(ContentField::RATING, 6));
  EXPECT_FALSE(IsPlausible(ContentField::WIDTH, 0));
  EXPECT_FALSE(IsPlausible(ContentField::DURATION, -5));
}

}  // namespace

}  // namespace fileindexd
