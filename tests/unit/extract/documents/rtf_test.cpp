// SPDX-License-Identifier: GPL-2.0-or-later
#include "tests/unit/extract/documents/fixture.h"

namespace fileindexd {

namespace {

constexpr char LETTER[] =
    "{\\rtf1\\ansi\\ansicpg1252\\deff0{\\fonttbl{\\f0 Arial;}{\\f1\\fcharset204 Arial;}}\n"
    "{\\info{\\title Gr\\'fc\\'dfe}{\\author \\u29579?\\u33459?}{\\subject Quay}{\\keywords a, b}"
    "{\\doccomm note}{\\creatim\\yr2020\\mo1\\dy2\\hr3\\min4}}\n"
    "{\\*\\generator hidden;}\\pard The light\n{\\b house}\\par{\\f1 \\'ef\\'f0\\'e8}\\tab\\uc2"
    "\\u8364 EUR{\\field{\\*\\fldinst HYPERLINK x}{\\fldrslt link}}{\\pict\\bin4 "
    "{}}}}done\\~it\\cell"
    "\\u-10179 ??\\u-8704 ??\\par}";

}  // namespace

TEST(RtfTest, FieldsAreReadTheTextIsLeftToAConverter) {
  const Reading reading = ReadBytes(ReadRtf, "a.rtf", LETTER);

  ASSERT_TRUE(reading.is_good) << reading.why;
  EXPECT_EQ(reading.content.kind, Kind::DOCUMENT);
  EXPECT_EQ(reading.converter, "unrtf");
  EXPECT_EQ(reading.content.text, "");
  EXPECT_EQ(reading.Text(ContentField::TITLE), "Gr\u00fc\u00dfe");
  EXPECT_EQ(reading.Text(ContentField::AUTHOR), "\u738b\u82b3");
  EXPECT_EQ(reading.Text(ContentField::SUBJECT), "Quay");
  EXPECT_EQ(reading.Text(ContentField::KEYWORDS), "a, b");
  EXPECT_EQ(reading.Text(ContentField::DESCRIPTION), "note");
  EXPECT_EQ(reading.Number(ContentField::CREATED), 1577934240);
}

TEST(RtfTest, TheTextOfAMemberIsReadHere) {
  const Reading reading = ReadBytes(ReadRtf, "a.rtf", LETTER, {1});

  EXPECT_EQ(reading.converter, "");
  EXPECT_EQ(reading.content.text,
            "The lighthouse \u043f\u0440\u0438 \u20acRlinkdone it \U0001F600");
}

TEST(RtfTest, WhatIsNoRtfIsSaidInWords) {
  EXPECT_EQ(ReadBytes(ReadRtf, "a.rtf", "").why, "empty");
  EXPECT_EQ(ReadBytes(ReadRtf, "a.rtf", "words").why, "not an RTF file");
}

TEST(RtfTest, GroupsWithinGroupsWithoutEndAreRead) {
  const std::string deep =
      "{\\rtf1" + std::string(1'000'000, '{') + "deep" + std::string(1'000'000, '}') + "after}";

  EXPECT_EQ(ReadBytes(ReadRtf, "a.rtf", deep, {1}).content.text, "deepafter");
}

TEST(RtfTest, DamageIsSurvived) {
  ExpectSurvivesDamage(ReadRtf, "a.rtf", LETTER);
}

}  // namespace fileindexd
