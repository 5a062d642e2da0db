// SPDX-License-Identifier: GPL-2.0-or-later
#include "tests/unit/extract/documents/fixture.h"
#include "tests/unit/extract/documents/packing.h"

namespace fileindexd {

namespace {

const Member PACKAGE{
    "OEBPS/book.opf",
    "<package xmlns:dc=\"d\"><metadata><dc:title>The Quay</dc:title><dc:creator>\u00c5sa Lind"
    "</dc:creator><dc:subject>sea</dc:subject><dc:subject>ships</dc:subject>"
    "<dc:description>A tale</dc:description><dc:date>2020-01-02</dc:date></metadata><manifest>"
    "<item id=\"c1\" href=\"text/one.xhtml\"/><item id=\"c2\" href=\"text/two%20b.xhtml\"/>"
    "</manifest><spine><itemref idref=\"c1\"/><itemref idref=\"c2\"/></spine></package>"};

std::string Chapter(const std::string& text) {
  return "<?xml version=\"1.0\" encoding=\"UTF-8\"?><html><head><title/></head><body><p>" + text +
         "</p></body></html>";
}

std::string Book() {
  return Zipped({{"mimetype", "application/epub+zip"},
                 {"OEBPS/extra.html", Chapter("epilogue")},
                 {"OEBPS/text/two b.xhtml", Chapter("and ended")},
                 {"OEBPS/text/one.xhtml", Chapter("It b\u00e9gan \u8ba1\u5212")},
                 PACKAGE});
}

}  // namespace

TEST(EpubTest, ChaptersAreReadInTheBooksOrder) {
  const Reading reading = ReadBytes(ReadEpub, "a.epub", Book());

  ASSERT_TRUE(reading.is_good) << reading.why;
  EXPECT_EQ(reading.content.kind, Kind::DOCUMENT);
  EXPECT_EQ(reading.content.text, "It b\u00e9gan \u8ba1\u5212 and ended epilogue");
}

TEST(EpubTest, FieldsComeFromThePackage) {
  const Reading reading = ReadBytes(ReadEpub, "a.epub", Book());

  EXPECT_EQ(reading.Text(ContentField::TITLE), "The Quay");
  EXPECT_EQ(reading.Text(ContentField::AUTHOR), "\u00c5sa Lind");
  EXPECT_EQ(reading.Text(ContentField::KEYWORDS), "sea, ships");
  EXPECT_EQ(reading.Text(ContentField::DESCRIPTION), "A tale");
  EXPECT_EQ(reading.Number(ContentField::CREATED), 1577923200);
}

TEST(EpubTest, WhatIsNoBookIsSaidInWords) {
  EXPECT_EQ(ReadBytes(ReadEpub, "a.epub", "").why, "not a ZIP file");
  EXPECT_EQ(ReadBytes(ReadEpub, "a.epub", Zipped({{"a.txt", "x"}})).why, "not an EPUB file");
  EXPECT_EQ(ReadBytes(ReadEpub, "a.epub", Zipped({{"META-INF/rights.xml", "x"}, PACKAGE})).why,
            "encrypted");
}

TEST(EpubTest, DamageIsSurvived) {
  ExpectSurvivesDamage(ReadEpub, "a.epub", Book());
}

}  // namespace fileindexd
