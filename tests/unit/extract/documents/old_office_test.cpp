// SPDX-License-Identifier: GPL-2.0-or-later
#include "tests/unit/extract/behind_doors.h"
#include "tests/unit/extract/documents/compound.h"
#include "tests/unit/extract/documents/fixture.h"

namespace fileindexd {

namespace {

constexpr uint32_t ENCRYPTED = 0x100;

// A piece of letters of one byte, then one of two.
std::string Doc(const std::string& narrow, const std::u16string& wide, uint32_t flags = 0) {
  std::string document(0x800, '\0');
  document.replace(0, 4, Le16(0xA5EC) + Le16(0xC1));
  document.replace(10, 2, Le16(0x200 | flags));
  const auto narrow_at = static_cast<uint32_t>(document.size());
  document += narrow;
  const auto wide_at = static_cast<uint32_t>(document.size());
  document += Wide(wide);

  const auto middle = static_cast<uint32_t>(narrow.size());
  const std::string pieces =
      Le32(0) + Le32(middle) + Le32(middle + static_cast<uint32_t>(wide.size())) + Le16(0) +
      Le32(0x40000000 | 2 * narrow_at) + Le16(0) + Le16(0) + Le32(wide_at) + Le16(0);
  const std::string table =
      std::string("\1\2\0ab", 5) + '\2' + Le32(static_cast<uint32_t>(pieces.size())) + pieces;
  document.replace(0x1A2, 8, Le32(0) + Le32(static_cast<uint32_t>(table.size())));
  return Compound({{"WordDocument", document}, {"1Table", table}}, "Harbour", "\u00c5sa Lind");
}

std::string Record(uint32_t type, const std::string& bytes) {
  return Le16(type) + Le16(static_cast<uint32_t>(bytes.size())) + bytes;
}

std::string Xls(const std::string& records) {
  return Compound({{"Workbook", Record(0x809, Le16(0x600) + std::string(14, '\0')) + records}},
                  "Dues", "Clerk");
}

std::string Narrow(const std::string& text) {
  return Le16(static_cast<uint32_t>(text.size())) + '\0' + text;
}

const std::string CELL(6, '\0');

// Shared strings: one with runs, one that goes on in the next record with other letters.
std::string SharedStrings() {
  return Record(0xFC, Le32(2) + Le32(2) + Le16(4) + '\x08' + Le16(1) + "quay" + Le32(0) + Le16(8) +
                          '\0' + "harb") +
         Record(0x3C, '\1' + Wide(u"\u00f6urs")) + Record(0x3C, Narrow("third"));
}

std::string PptRecord(uint32_t instance_version, uint32_t type, const std::string& bytes) {
  return Le16(instance_version) + Le16(type) + Le32(static_cast<uint32_t>(bytes.size())) + bytes;
}

std::string PageFoot() {
  return PptRecord(15, 0xFD9, PptRecord(0x20, 0xFBA, Wide(u"foot")));
}

// In what later versions add; strings of other uses around it.
std::string Comment() {
  const std::string comment =
      PptRecord(15, 0x2EE0,
                PptRecord(0, 0xFBA, Wide(u"Speaker")) + PptRecord(0x10, 0xFBA, Wide(u"louder")) +
                    PptRecord(0x20, 0xFBA, Wide(u"S")));
  return PptRecord(
      15, 0x1388,
      PptRecord(15, 0x138A,
                PptRecord(0, 0xFBA, Wide(u"___PPT10")) + PptRecord(0, 0x138B, comment)));
}

// One slide that was saved twice, and a master.
std::string Ppt(uint32_t token = 0xE391C05F) {
  const std::string old_slide = PptRecord(15, 0x3EE, PptRecord(0, 0xFA8, "deleted words"));
  const std::string slide = PptRecord(
      15, 0x3EE,
      PptRecord(15, 0x40C, PptRecord(15, 0xF00D, PptRecord(0, 0xFA0, Wide(u"\u8ba1\u5212")))) +
          PptRecord(0, 0xFA8, "caf\xe9") + PageFoot() + Comment());
  const std::string master = PptRecord(15, 0x3F8, PptRecord(0, 0xFA8, "click to edit"));
  std::string stream = old_slide;
  const auto directory1 = static_cast<uint32_t>(stream.size());
  stream += PptRecord(0, 0x1772, Le32(0x100001) + Le32(0));
  const auto edit1 = static_cast<uint32_t>(stream.size());
  stream += PptRecord(0, 0xFF5,
                      Le32(0) + Le32(0) + Le32(0) + Le32(directory1) + Le32(1) + Le32(2) + Le32(0));
  const auto slide_at = static_cast<uint32_t>(stream.size());
  stream += slide;
  const auto master_at = static_cast<uint32_t>(stream.size());
  stream += master;
  const auto directory2 = static_cast<uint32_t>(stream.size());
  stream += PptRecord(0, 0x1772, Le32(0x200001) + Le32(slide_at) + Le32(master_at));
  const auto edit2 = static_cast<uint32_t>(stream.size());
  stream += PptRecord(
      0, 0xFF5, Le32(0) + Le32(0) + Le32(edit1) + Le32(directory2) + Le32(1) + Le32(3) + Le32(0));
  return Compound({{"PowerPoint Document", stream},
                   {"Current User", PptRecord(0, 0xFF6, Le32(20) + Le32(token) + Le32(edit2))}},
                  "Talk", "Speaker");
}

}  // namespace

TEST(OldOfficeTest, TextAndSummaryOfADocumentAreFound) {
  const Reading reading = ReadBytes(
      ReadOldOffice, "a.doc", Doc("Sm\xf6rg\xe5s \x93table\x94\r", u"left\a\u8ba1\u5212\a\r"));

  ASSERT_TRUE(reading.is_good) << reading.why;
  EXPECT_EQ(reading.content.kind, Kind::DOCUMENT);
  EXPECT_EQ(reading.content.text, "Sm\u00f6rg\u00e5s \u201ctable\u201d left \u8ba1\u5212");
  EXPECT_EQ(reading.Text(ContentField::TITLE), "Harbour");
  EXPECT_EQ(reading.Text(ContentField::AUTHOR), "\u00c5sa Lind");
  EXPECT_EQ(reading.converter, "");
}

TEST(OldOfficeTest, FieldCodesAreLeftOutTheirResultsAreNot) {
  EXPECT_EQ(ReadBytes(ReadOldOffice, "a.doc",
                      Doc("see \x13 HYPERLINK x \x14the quay\x15 now\r",
                          u"\x13 PAGE \x15"
                          u"end\r"))
                .content.text,
            "see the quay now end");
  EXPECT_EQ(ReadBytes(ReadOldOffice, "a.doc", Doc("an \x13 open code\rand on\r", u"")).content.text,
            "an and on");
}

TEST(OldOfficeTest, AnEncryptedDocumentIsSaidToBeOne) {
  EXPECT_EQ(ReadBytes(ReadOldOffice, "a.doc", Doc("x", u"", ENCRYPTED)).why, "encrypted");
  EXPECT_EQ(ReadBytes(ReadOldOffice, "a.xls", Xls(Record(0x2F, Le16(1)))).why, "encrypted");
  EXPECT_EQ(ReadBytes(ReadOldOffice, "a.ppt", Ppt(0xF3D1C4DF)).why, "encrypted");
  EXPECT_EQ(ReadBytes(ReadOldOffice, "a.doc", Compound({{"EncryptedPackage", "x"}})).why,
            "encrypted");
  EXPECT_EQ(ReadBytes(ReadOfficeZip, "a.docx", Compound({{"EncryptedPackage", "x"}})).why,
            "encrypted");
}

TEST(OldOfficeTest, StringsAndNumbersOfAWorkbookAreFound) {
  const Reading reading =
      ReadBytes(ReadOldOffice, "a.xls",
                Xls(Record(0x85, CELL + std::string("\5\0Sheet", 7)) + SharedStrings() +
                    Record(0x204, CELL + Narrow("label")) +
                    Record(0x203, CELL + std::string("\0\0\0\0\0\x40\x45\x40", 8)) +
                    Record(0x27E, CELL + Le32(1234 << 2 | 3)) +
                    Record(0xBD, Le32(0) + Le16(0) + Le32(7 << 2 | 2) + Le16(0) + Le32(8 << 2 | 2) +
                                     Le16(1)) +
                    Record(0x06, CELL + std::string("\0\0\0\0\0\0\xff\xff", 8)) +
                    Record(0x207, Narrow("computed")) + Record(0x14, "") +
                    Record(0x15, Narrow("&LTide &P&R&\"Arial\"&12tables"))));

  ASSERT_TRUE(reading.is_good) << reading.why;
  EXPECT_EQ(reading.content.text,
            "Sheet quay harb\u00f6urs third label 42.5 12.34 7 8 computed Tide tables");
  EXPECT_EQ(reading.Text(ContentField::TITLE), "Dues");
  EXPECT_EQ(reading.Text(ContentField::AUTHOR), "Clerk");
}

TEST(OldOfficeTest, OfSlidesTheLastSavedTextIsFoundMastersAreNot) {
  const Reading reading = ReadBytes(ReadOldOffice, "a.ppt", Ppt());

  ASSERT_TRUE(reading.is_good) << reading.why;
  EXPECT_EQ(reading.content.text, "\u8ba1\u5212 caf\u00e9 foot Speaker louder");
  EXPECT_EQ(reading.Text(ContentField::TITLE), "Talk");
}

TEST(OldOfficeTest, OlderDocumentsAreLeftToAConverter) {
  EXPECT_EQ(ReadBytes(ReadOldOffice, "a.doc", Compound({{"WordDocument", "\xDC\xA5"}})).converter,
            "catdoc");
  EXPECT_EQ(
      ReadBytes(ReadOldOffice, "a.doc", Compound({{"WordDocument", "\xDC\xA5"}}), {1}).converter,
      "");
}

// Its text stands in one piece, from where the header says.
TEST(OldOfficeTest, AnOlderDocumentIsReadByItsConverter) {
  const std::string text = "the red harbour\rby night\r";
  std::string document(0x300, '\0');
  document.replace(0, 4, Le16(0xA5DC) + Le16(0x65));
  const auto begin = static_cast<uint32_t>(document.size());
  document.replace(24, 8, Le32(begin) + Le32(begin + static_cast<uint32_t>(text.size())));

  ExpectSameBehindDoors("a.doc", Compound({{"WordDocument", document + text}}));
}

TEST(OldOfficeTest, OldPresentationsAreSaidToBeUnread) {
  const std::string why = "a presentation from before 1997: no reader is known for it";
  EXPECT_EQ(ReadBytes(ReadOldOffice, "a.ppt", Compound({{"PP40", "x"}})).why, why);
  EXPECT_EQ(ReadBytes(ReadOldOffice, "a.ppt", Compound({{"PowerPoint Document", "x"}})).why, why);
  const Reading named =
      ReadBytes(ReadOldOffice, "a.ppt", Compound({{"PP40", "x"}}, "Harbour plans", "Clerk"));
  EXPECT_EQ(named.Text(ContentField::TITLE), "Harbour plans");
  EXPECT_EQ(named.converter, "");
}

TEST(OldOfficeTest, OtherFormatsUnderTheOldEndingsAreRead) {
  EXPECT_EQ(ReadBytes(ReadOldOffice, "a.doc", "<html><p>a web page").content.text, "a web page");
  EXPECT_EQ(
      ReadBytes(ReadOldOffice, "a.doc", Zipped({{"word/document.xml", "<d><t>packed</t></d>"}}))
          .content.text,
      "packed");
}

TEST(OldOfficeTest, WhatIsNoDocumentIsSaidInWords) {
  EXPECT_EQ(ReadBytes(ReadOldOffice, "a.doc", "").why, "not a compound file, or damaged");
  EXPECT_EQ(ReadBytes(ReadOldOffice, "a.doc", Compound({{"Other", "x"}})).why,
            "not an office document");
}

// A directory of many objects that are all the same, an edit before itself.
TEST(OldOfficeTest, ChainsThatGoInCirclesEnd) {
  std::string stream =
      PptRecord(0, 0xFF5, Le32(0) + Le32(0) + Le32(0) + Le32(36) + Le32(0) + Le32(0) + Le32(0));
  std::string entries = Le32(0xFFF00001);
  for (int i = 0; i < 4095; ++i) {
    entries += Le32(0);
  }
  stream += PptRecord(0, 0x1772, entries);
  EXPECT_TRUE(
      ReadBytes(ReadOldOffice, "a.ppt",
                Compound({{"PowerPoint Document", stream},
                          {"Current User", PptRecord(0, 0xFF6, Le32(20) + Le32(0) + Le32(0))}}))
          .is_good);
}

// Two texts, each in a directory of its own; the long one is named by so many edits.
std::string PptOfEdits(int edits_of_long_one) {
  std::string stream = PptRecord(0, 0xFA8, "near");
  const auto far_at = static_cast<uint32_t>(stream.size());
  stream += PptRecord(0, 0xFA8, "far");
  const auto short_one = static_cast<uint32_t>(stream.size());
  stream += PptRecord(0, 0x1772, Le32(0x105000) + Le32(far_at));
  std::string entries = Le32(0xFFF00001);
  for (int i = 0; i < 4095; ++i) {
    entries += Le32(0);
  }
  const auto long_one = static_cast<uint32_t>(stream.size());
  stream += PptRecord(0, 0x1772, entries);
  uint32_t before = 0;
  for (int edit = 0; edit <= edits_of_long_one; ++edit) {
    const auto at = static_cast<uint32_t>(stream.size());
    stream += PptRecord(0, 0xFF5,
                        Le32(0) + Le32(0) + Le32(before) + Le32(edit == 0 ? short_one : long_one) +
                            Le32(1) + Le32(2) + Le32(0));
    before = at;
  }
  return Compound({{"PowerPoint Document", stream},
                   {"Current User", PptRecord(0, 0xFF6, Le32(20) + Le32(0) + Le32(before))}});
}

TEST(OldOfficeTest, DirectoriesTogetherAreNoLongerThanTheStream) {
  EXPECT_EQ(ReadBytes(ReadOldOffice, "a.ppt", PptOfEdits(1)).content.text, "near far");
  EXPECT_EQ(ReadBytes(ReadOldOffice, "a.ppt", PptOfEdits(3)).content.text, "near");
}

TEST(OldOfficeTest, DamageIsSurvived) {
  ExpectSurvivesDamage(ReadOldOffice, "a.doc",
                       Doc("words \x13 CODE \x14 and\x15 more\r", u"wide\r"));
  ExpectSurvivesDamage(ReadOldOffice, "a.xls",
                       Xls(SharedStrings() + Record(0x204, CELL + Narrow("label"))));
  ExpectSurvivesDamage(ReadOldOffice, "a.ppt", Ppt());
}

}  // namespace fileindexd
