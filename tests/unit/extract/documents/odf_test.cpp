// SPDX-License-Identifier: GPL-2.0-or-later
#include "tests/unit/extract/behind_doors.h"
#include "tests/unit/extract/documents/fixture.h"
#include "tests/unit/extract/documents/packing.h"

namespace fileindexd {

namespace {

constexpr char NAMES[] =
    " xmlns:office=\"o\" xmlns:text=\"t\" xmlns:table=\"b\" xmlns:meta=\"m\" xmlns:dc=\"d\"";

constexpr char META[] =
    "<office:meta><dc:title>Kr\u00e4ne</dc:title><meta:initial-creator>First Hand"
    "</meta:initial-creator><dc:creator>Last Hand</dc:creator><dc:subject>Harbour</dc:subject>"
    "<dc:description>All</dc:description><meta:keyword>quay</meta:keyword>"
    "<meta:keyword>crane</meta:keyword>"
    "<meta:creation-date>2020-01-02T03:04:05.123</meta:creation-date>"
    "<meta:document-statistic meta:table-count=\"1\" meta:page-count=\"4\"/></office:meta>";

constexpr char BODY[] =
    "<office:body><text:tracked-changes><text:p>deleted</text:p></text:tracked-changes>layout"
    "<text:h>The<text:s/>light<text:span>house</text:span></text:h><table:table "
    "table:name=\"Dues\"><table:table-cell><text:p>\u8ba1\u5212</text:p></table:table-cell>"
    "<table:table-cell><text:p>42.5</text:p></table:table-cell></table:table></office:body>";

std::string Odt(const std::string& manifest) {
  return Zipped({{"mimetype", "application/vnd.oasis.opendocument.text"},
                 {"content.xml", std::string("<office:document-content") + NAMES + ">" + BODY +
                                     "</office:document-content>"},
                 {"styles.xml", std::string("<office:document-styles") + NAMES +
                                    "><text:p>running head</text:p></office:document-styles>"},
                 {"meta.xml", std::string("<office:document-meta") + NAMES + ">" + META +
                                  "</office:document-meta>"},
                 {"META-INF/manifest.xml", manifest}});
}

std::string FlatOdt() {
  return std::string("<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<office:document") + NAMES + ">" +
         META + BODY + "</office:document>";
}

void ExpectFields(const Reading& reading) {
  EXPECT_EQ(reading.content.kind, Kind::DOCUMENT);
  EXPECT_EQ(reading.Text(ContentField::TITLE), "Kr\u00e4ne");
  EXPECT_EQ(reading.Text(ContentField::AUTHOR), "First Hand");
  EXPECT_EQ(reading.Text(ContentField::SUBJECT), "Harbour");
  EXPECT_EQ(reading.Text(ContentField::DESCRIPTION), "All");
  EXPECT_EQ(reading.Text(ContentField::KEYWORDS), "quay, crane");
  EXPECT_EQ(reading.Number(ContentField::CREATED), 1577934245);
  EXPECT_EQ(reading.Number(ContentField::PAGES), 4);
}

}  // namespace

TEST(OdfTest, TextAndFieldsAreFoundDeletedTextIsNot) {
  const Reading reading = ReadBytes(ReadOfficeZip, "a.odt", Odt("<manifest/>"));

  ASSERT_TRUE(reading.is_good) << reading.why;
  EXPECT_EQ(reading.content.text, "The lighthouse Dues \u8ba1\u5212 42.5 running head");
  ExpectFields(reading);
}

TEST(OdfTest, SheetsAndSlidesAreReadByTheirEndings) {
  const struct {
    const char* name;
    const char* type;
    const char* body;
    const char* text;
  } rows[] = {{"a.ods", "spreadsheet",
               "<office:spreadsheet><table:table table:name=\"Dues\"><table:table-row>"
               "<table:table-cell><text:p>quay</text:p></table:table-cell><table:table-cell>"
               "<text:p>42.5</text:p></table:table-cell></table:table-row></table:table>"
               "</office:spreadsheet>",
               "Dues quay 42.5"},
              {"a.odp", "presentation",
               "<office:presentation><draw:page xmlns:draw=\"w\"><draw:frame><draw:text-box>"
               "<text:p>The lighthouse</text:p><text:list><text:list-item><text:p>lamp</text:p>"
               "</text:list-item></text:list></draw:text-box></draw:frame></draw:page>"
               "</office:presentation>",
               "The lighthouse lamp"}};
  for (const auto& row : rows) {
    const std::string bytes =
        Zipped({{"mimetype", std::string("application/vnd.oasis.opendocument.") + row.type},
                {"content.xml", std::string("<office:document-content") + NAMES + "><office:body>" +
                                    row.body + "</office:body></office:document-content>"},
                {"meta.xml", std::string("<office:document-meta") + NAMES + ">" + META +
                                 "</office:document-meta>"}});
    const Reading reading = ReadBytes(ReadDocument, row.name, bytes);
    EXPECT_TRUE(reading.is_good) << reading.why;
    EXPECT_EQ(reading.content.text, row.text);
    ExpectFields(reading);
    ExpectSurvivesDamage(ReadDocument, row.name, bytes);
  }
}

TEST(OdfTest, RepeatedCellsAreReadOnce) {
  const std::string bytes = Zipped(
      {{"mimetype", "application/vnd.oasis.opendocument.spreadsheet"},
       {"content.xml",
        std::string("<office:document-content") + NAMES +
            "><office:body><office:spreadsheet><table:table table:name=\"Dues\">"
            "<table:table-row table:number-rows-repeated=\"1048576\">"
            "<table:table-cell table:number-columns-repeated=\"1000000\"><text:p>quay</text:p>"
            "</table:table-cell><table:table-cell "
            "table:number-columns-repeated=\"4000000000\"/></table:table-row></table:table>"
            "</office:spreadsheet></office:body></office:document-content>"}});

  EXPECT_EQ(ReadBytes(ReadOfficeZip, "a.ods", bytes).content.text, "Dues quay");
  ExpectSameBehindDoors("a.ods", bytes);
}

TEST(OdfTest, TheFlatFormIsReadAlike) {
  const Reading reading = ReadBytes(ReadOfficeZip, "a.fodt", FlatOdt());

  ASSERT_TRUE(reading.is_good) << reading.why;
  EXPECT_EQ(reading.content.text, "The lighthouse Dues \u8ba1\u5212 42.5");
  ExpectFields(reading);
}

TEST(OdfTest, TheWordsOfAnAnnotationAreWordsOfTheirOwn) {
  const Reading reading = ReadBytes(
      ReadOfficeZip, "a.fodt",
      std::string("<?xml version=\"1.0\"?><office:document") + NAMES +
          "><text:p>keep<office:annotation><dc:creator>First Hand</dc:creator>"
          "<dc:date>2020-01-02</dc:date><text:p>why</text:p></office:annotation>er</text:p>"
          "</office:document>");

  EXPECT_EQ(reading.content.text, "keep First Hand 2020-01-02 why er");
}

TEST(OdfTest, FieldsAreFoundBehindTextThatIsTooLong) {
  const Reading reading = ReadBytes(ReadOfficeZip, "a.odt", Odt("<manifest/>"), {0, 8});

  EXPECT_TRUE(reading.content.is_cut);
  ExpectFields(reading);
}

TEST(OdfTest, AnEncryptedDocumentIsSaidToBeOne) {
  const std::string manifest =
      "<manifest><file-entry full-path=\"content.xml\"><encryption-data/></file-entry></manifest>";
  const Reading reading = ReadBytes(
      ReadOfficeZip, "a.odt",
      Zipped({{"content.xml", "\x81\x02\x93garbled\xff"}, {"META-INF/manifest.xml", manifest}}));

  EXPECT_FALSE(reading.is_good);
  EXPECT_EQ(reading.why, "encrypted");
}

TEST(OdfTest, DamageIsSurvived) {
  ExpectSurvivesDamage(ReadOfficeZip, "a.odt", Odt("<manifest/>"));
  ExpectSurvivesDamage(ReadOfficeZip, "a.fodt", FlatOdt());
}

}  // namespace fileindexd
