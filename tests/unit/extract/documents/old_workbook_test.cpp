// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/converters.h"
#include "extract/workbook_records.h"
#include "tests/unit/extract/documents/compound.h"
#include "tests/unit/extract/documents/fixture.h"

namespace fileindexd {

namespace {

const std::string CELL(6, '\0');
const std::string CELL_2(7, '\0');
const std::string DOUBLE("\0\0\0\0\0\x40\x45\x40", 8);  // 42.5
const std::string NO_NUMBER("\0\0\0\0\0\0\xff\xff", 8);

std::string Record(uint32_t type, const std::string& bytes) {
  return Le16(type) + Le16(static_cast<uint32_t>(bytes.size())) + bytes;
}

std::string Short(const std::string& text) {
  return static_cast<char>(text.size()) + text;
}
std::string Long(const std::string& text) {
  return Le16(static_cast<uint32_t>(text.size())) + text;
}

std::string Codepage(uint32_t page) {
  return Record(0x42, Le16(page));
}

// Of 1995: all sheets in one stream.
std::string Book(const std::string& records) {
  return Record(0x809, Le16(0x500) + Le16(5) + Le32(0)) + records;
}
std::string BookFile(const std::string& records) {
  return Compound({{"Book", Book(records)}}, "Dues", "Clerk");
}

std::string AllOfABook() {
  return Codepage(1252) + Record(0x85, CELL + Short("Moorings")) + Record(0x0A, "") +
         Record(0x809, Le16(0x500) + Le16(0x10) + Le32(0)) +
         Record(0x14, Short("&LTide &P&R&12tables")) + Record(0x204, CELL + Long("harb\xf6ur")) +
         Record(0xD6, CELL + Long("quay") + '\1' + '\0' + '\1') +
         Record(0x06, CELL + NO_NUMBER + CELL) + Record(0x207, Long("computed")) +
         Record(0x06, CELL + DOUBLE) + Record(0x27E, CELL + Le32(1234 << 2 | 3)) +
         Record(0xBD, Le32(0) + Le16(0) + Le32(7 << 2 | 2) + Le16(0) + Le32(8 << 2 | 2) + Le16(1)) +
         Record(0x1C, Le32(0) + Long("a note")) + Record(0x0A, "");
}
constexpr const char* WORDS_OF_A_BOOK =
    "Moorings Tide tables harb\u00f6ur quay computed 42.5 12.34 7 8 a note";

// Files before compound ones, by version.
std::string Sheet2() {
  return Record(0x09, Le16(2) + Le16(0x10)) + Codepage(0x8001) +
         Record(0x04, CELL_2 + Short("harb\xf6ur")) + Record(0x02, CELL_2 + Le16(77)) +
         Record(0x03, CELL_2 + DOUBLE) + Record(0x06, CELL_2 + NO_NUMBER) +
         Record(0x07, Short("computed"));
}
std::string Sheet3() {
  return Record(0x209, Le16(0) + Le16(0x10) + Le16(0)) + Codepage(850) +
         Record(0x204, CELL + Long("harb\x94ur")) + Record(0x206, CELL + NO_NUMBER) +
         Record(0x207, Long("computed"));
}
std::string Sheet4() {
  return Record(0x409, Le16(0) + Le16(0x100) + Le16(0)) + Codepage(437) +
         Record(0x85, Short("Moorings")) + Record(0x8F, Le32(0) + Short("Piers")) +
         Record(0x204, CELL + Long("harb\x94ur")) + Record(0x406, CELL + DOUBLE);
}

}  // namespace

TEST(OldWorkbookTest, TextNumbersAndSummaryOfAWorkbookAreFound) {
  const Reading reading = ReadBytes(ReadOldOffice, "a.xls", BookFile(AllOfABook()));

  ASSERT_TRUE(reading.is_good) << reading.why;
  EXPECT_EQ(reading.content.kind, Kind::DOCUMENT);
  EXPECT_EQ(reading.content.text, WORDS_OF_A_BOOK);
  EXPECT_EQ(reading.Text(ContentField::TITLE), "Dues");
  EXPECT_EQ(reading.converter, "");
}

TEST(OldWorkbookTest, FilesWithoutACompoundFileAroundThemAreRead) {
  const struct {
    std::string bytes;
    const char* text;
  } rows[] = {
      {Sheet2(), "harb\u00f6ur 77 42.5 computed"},
      {Sheet3(), "harb\u00f6ur computed"},
      {Sheet4(), "Moorings Piers harb\u00f6ur 42.5"},
      {Book(AllOfABook()), WORDS_OF_A_BOOK},
  };
  for (const auto& row : rows) {
    const Reading reading = ReadBytes(ReadOldOffice, "a.xls", row.bytes);
    EXPECT_TRUE(reading.is_good) << reading.why;
    EXPECT_EQ(reading.content.text, row.text);
    EXPECT_EQ(ReadBytes(ReadOldOffice, "a.xls", row.bytes, {1}).content.text, row.text);
  }
}

TEST(OldWorkbookTest, LettersOfAnUnknownCodePageAreWestern) {
  const Reading reading = ReadBytes(
      ReadOldOffice, "a.xls",
      BookFile(Codepage(59999) + Record(0x204, CELL + Long("harb\xf6ur")) + Record(0x0A, "")));

  EXPECT_EQ(reading.content.text, "harb\u00f6ur");
}

TEST(OldWorkbookTest, PiecesOfARecordAreBounded) {
  constexpr size_t MANY = 1 << 20;
  std::string records = Record(0x204, "label");
  for (size_t i = 0; i < MANY; ++i) {
    records += Record(0x3C, i % 4 == 0 ? "x" : "");
  }
  records += Record(0x204, "behind");
  ContentSink sink(1 << 20);
  WorkbookRecords reader(records, sink);

  ASSERT_TRUE(reader.Next());
  EXPECT_LE(reader.views.size(), WorkbookRecords::MOST_VIEWS);
  ASSERT_TRUE(reader.Next());
  EXPECT_EQ(reader.views.front(), "behind");
}

TEST(OldWorkbookTest, LettersAreThoseOfTheCodePage) {
  const struct {
    uint32_t page;
    const char* bytes;
    const char* text;
  } rows[] = {
      {1251, "\xef\xee\xf0\xf2", "\u043f\u043e\u0440\u0442"},
      {932, "\x8d\x60", "\u6e2f"},
      {949, "\xc7\xd7", "\ud56d"},
      {1252, "\x80 \x93quay\x94", "\u20ac \u201cquay\u201d"},
      {0x8000, "harb\x9aur", "harb\u00f6ur"},
      {0, "caf\xe9", "caf\u00e9"},
      {65000, "plain", "plain"},  // of no table
  };
  for (const auto& row : rows) {
    EXPECT_EQ(ReadBytes(ReadOldOffice, "a.xls",
                        BookFile(Codepage(row.page) + Record(0x204, CELL + Long(row.bytes))))
                  .content.text,
              row.text)
        << row.page;
  }
}

// The stream of 1997 under the older name, and the older one under the newer name.
TEST(OldWorkbookTest, TheVersionIsWhatTheRecordsSay) {
  EXPECT_EQ(ReadBytes(ReadOldOffice, "a.xls",
                      Compound({{"Workbook", Book(Record(0x204, CELL + Long("old")))}}))
                .content.text,
            "old");
  EXPECT_EQ(
      ReadBytes(ReadOldOffice, "a.xls",
                Compound({{"Book", Record(0x809, Le16(0x600) + Le16(5)) +
                                       Record(0x204, CELL + Le16(2) + '\1' + Wide(u"\u8ba1a"))}}))
          .content.text,
      "\u8ba1a");
}

TEST(OldWorkbookTest, WhatCannotBeReadIsSaidInWords) {
  EXPECT_EQ(ReadBytes(ReadOldOffice, "a.xls", BookFile(Record(0x2F, Le32(1)))).why, "encrypted");
  EXPECT_EQ(ReadBytes(ReadOldOffice, "a.xls", Compound({{"Book", "x"}})).why, "damaged");
  EXPECT_EQ(ReadBytes(ReadOldOffice, "a.xls", Compound({{"Book", ""}})).why, "damaged");
  // Tabs of a text, which begin as a record would.
  EXPECT_EQ(ReadBytes(ReadOldOffice, "a.xls", std::string("\x09\x00\x04\x00zz", 6)).why,
            "not a compound file, or damaged");
}

TEST(OldWorkbookTest, ALengthBeyondTheRecordTakesNoMoreThanTheRecord) {
  EXPECT_EQ(ReadBytes(ReadOldOffice, "a.xls",
                      BookFile(Record(0x204, CELL + Le16(0xFFFF) + "quay") +
                               Record(0x204, CELL + Long("pier"))))
                .content.text,
            "quay pier");
}

TEST(OldWorkbookTest, TextEndsAtItsCap) {
  std::string records;
  for (int i = 0; i < 1000; ++i) {
    records += Record(0x204, CELL + Long("caf\xe9"));
  }
  const Reading reading = ReadBytes(ReadOldOffice, "a.xls", BookFile(records), {0, 100});

  EXPECT_TRUE(reading.is_good);
  EXPECT_TRUE(reading.content.is_cut);
  EXPECT_LE(reading.content.text.size(), 100u);
}

// Both crash on their standard input, which is all that a converter is given.
TEST(OldWorkbookTest, NoConverterReadsWorkbooksOrSlides) {
  EXPECT_EQ(FindConverter("xls2csv"), nullptr);
  EXPECT_EQ(FindConverter("catppt"), nullptr);
  EXPECT_NE(FindConverter("catdoc"), nullptr);
}

TEST(OldWorkbookTest, DamageIsSurvived) {
  ExpectSurvivesDamage(ReadOldOffice, "a.xls", BookFile(AllOfABook()));
  for (const std::string& bare : {Sheet2(), Sheet3(), Sheet4(), Book(AllOfABook())}) {
    ExpectSurvivesDamage(ReadOldOffice, "a.xls", bare);
  }
}

}  // namespace fileindexd
