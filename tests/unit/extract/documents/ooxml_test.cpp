// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/choice.h"
#include "tests/unit/extract/behind_doors.h"
#include "tests/unit/extract/documents/fixture.h"
#include "tests/unit/extract/documents/packing.h"

namespace fileindexd {

namespace {

constexpr char XML[] = "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n";

const Member CORE{
    "docProps/core.xml",
    std::string(XML) +
        "<cp:coreProperties xmlns:cp=\"c\" xmlns:dc=\"d\" xmlns:dcterms=\"t\">"
        "<dc:title>Kr\u00e4ne &amp; Kais</dc:title><dc:creator>\u738b\u82b3</dc:creator>"
        "<dc:subject>Harbour</dc:subject><dc:description>All of them</dc:description>"
        "<cp:keywords>quay, crane</cp:keywords>"
        "<dcterms:created>2020-01-02T03:04:05Z</dcterms:created></cp:coreProperties>"};
const Member APP{"docProps/app.xml",
                 std::string(XML) + "<Properties xmlns=\"p\"><Pages>7</Pages></Properties>"};

std::string Docx(const std::string& body) {
  return Zipped({{"[Content_Types].xml", "<Types/>"},
                 {"word/document.xml", std::string(XML) +
                                           "<w:document xmlns:w=\"w\" xmlns:mc=\"m\" xmlns:a=\"a\">"
                                           "<w:body>" +
                                           body + "</w:body></w:document>"},
                 {"word/styles.xml", "<w:styles xmlns:w=\"w\"><w:t>style</w:t></w:styles>"},
                 {"word/footnotes.xml", "<w:f xmlns:w=\"w\"><w:t>footnote</w:t></w:f>"},
                 CORE,
                 APP});
}

std::string Piece(const std::string& text) {
  return "<w:r><w:t xml:space=\"preserve\">" + text + "</w:t></w:r>";
}

std::string Xlsx() {
  return Zipped(
      {{"xl/workbook.xml",
        "<workbook><sheets><sheet name=\"Dues\" sheetId=\"1\"/></sheets></workbook>"},
       {"xl/worksheets/sheet1.xml",
        "<worksheet><sheetData><row><c t=\"s\"><v>31337</v></c><c><v>42.5</v></c>"
        "<c t=\"inlineStr\"><is><t>in place</t></is></c><c "
        "t=\"str\"><f>CONCAT(A1)</f><v>made</v></c>"
        "<c t=\"b\"><v>8080</v></c></row></sheetData></worksheet>"},
       {"xl/sharedStrings.xml",
        "<sst><si><t>sh</t></si><si><r><t>are</t></r><r><t>d</t></r><rPh><t>said</t></rPh></si>"
        "</sst>"},
       CORE});
}

std::string Pptx() {
  const auto slide = [](const std::string& text) {
    return "<p:sld xmlns:p=\"p\" xmlns:a=\"a\"><a:p><a:r><a:t>" + text +
           "</a:t></a:r><a:fld><a:t>12</a:t></a:fld></a:p></p:sld>";
  };
  return Zipped({{"ppt/slideMasters/slideMaster1.xml", slide("click to edit")},
                 {"ppt/slides/slide1.xml", slide("\u041f\u0440\u0438\u0432\u0435\u0442")},
                 {"ppt/notesSlides/notesSlide1.xml", slide("whisper")},
                 {"docProps/app.xml", "<Properties><Slides>3</Slides></Properties>"}});
}

}  // namespace

// As the format has it, whose parts are one whatever the case of their names.
TEST(OoxmlTest, PartsAreFoundWhateverTheirNamesLookLike) {
  const Reading upper = ReadBytes(
      ReadOfficeZip, "a.xlsx",
      Zipped({{"/XL/Worksheets/Sheet1.xml",
               "<worksheet><sheetData><row><c t=\"inlineStr\"><is><t>in place</t></is></c></row>"
               "</sheetData></worksheet>"}}));
  EXPECT_TRUE(upper.is_good) << upper.why;
  EXPECT_EQ(upper.content.text, "in place");

  const Reading other = ReadBytes(
      ReadOfficeZip, "a.docx",
      Zipped({{"word/document.xml", "<w:document xmlns:w=\"w\"><w:t>harbour</w:t></w:document>"},
              {"package/services/metadata/core-properties/0a1b.psmdcp", CORE.bytes}}));
  EXPECT_TRUE(other.is_good) << other.why;
  EXPECT_EQ(other.content.text, "harbour");
  EXPECT_EQ(other.Text(ContentField::AUTHOR), "\u738b\u82b3");
}

TEST(OoxmlTest, TextAndFieldsOfADocumentAreFound) {
  const Reading reading = ReadBytes(
      ReadOfficeZip, "a.docx",
      Docx("<w:p>" + Piece("The light") + Piece("house ") + Piece("k\u00f6nig") + "</w:p><w:p>" +
           Piece("\u8ba1\u5212") + "<w:r><w:tab/></w:r>" + Piece("tail") + "</w:p>"));

  ASSERT_TRUE(reading.is_good) << reading.why;
  EXPECT_EQ(reading.content.kind, Kind::DOCUMENT);
  EXPECT_EQ(reading.content.text, "The lighthouse k\u00f6nig \u8ba1\u5212 tail footnote");
  EXPECT_EQ(reading.Text(ContentField::TITLE), "Kr\u00e4ne & Kais");
  EXPECT_EQ(reading.Text(ContentField::AUTHOR), "\u738b\u82b3");
  EXPECT_EQ(reading.Text(ContentField::SUBJECT), "Harbour");
  EXPECT_EQ(reading.Text(ContentField::DESCRIPTION), "All of them");
  EXPECT_EQ(reading.Text(ContentField::KEYWORDS), "quay, crane");
  EXPECT_EQ(reading.Number(ContentField::CREATED), 1577934245);
  EXPECT_EQ(reading.Number(ContentField::PAGES), 7);
}

TEST(OoxmlTest, CellsOfATableAreWordsOfTheirOwn) {
  const Reading reading = ReadBytes(ReadOfficeZip, "a.docx",
                                    Docx("<w:tbl><w:tr><w:tc>" + Piece("left") + "</w:tc><w:tc>" +
                                         Piece("right") + "</w:tc></w:tr></w:tbl>"));

  EXPECT_EQ(reading.content.text, "left right footnote");
}

TEST(OoxmlTest, DeletedTextFieldCodesAndSecondFormsAreLeftOut) {
  const Reading reading = ReadBytes(
      ReadOfficeZip, "a.docx",
      Docx("<w:p><w:del><w:r><w:delText>gone</w:delText></w:r>" + Piece("too") + "</w:del>" +
           "<w:moveFrom>" + Piece("moved") + "</w:moveFrom>" +
           "<w:r><w:instrText>HYPERLINK x</w:instrText></w:r>" + Piece("kept") +
           "<mc:AlternateContent><mc:Choice>" + Piece("box") + "</mc:Choice><mc:Fallback>" +
           Piece("box") + "</mc:Fallback></mc:AlternateContent></w:p>"));

  EXPECT_EQ(reading.content.text, "keptbox footnote");
}

TEST(OoxmlTest, FieldsAreFoundBehindTextThatIsTooLong) {
  std::string body;
  for (int i = 0; i < 100; ++i) {
    body += "<w:p>" + Piece("lighthouse") + "</w:p>";
  }

  const Reading reading = ReadBytes(ReadOfficeZip, "a.docx", Docx(body), {0, 100});

  EXPECT_TRUE(reading.is_good) << reading.why;
  EXPECT_TRUE(reading.content.is_cut);
  EXPECT_EQ(reading.Text(ContentField::SUBJECT), "Harbour");
}

TEST(OoxmlTest, StringsNumbersAndNamesOfSheetsAreFound) {
  const Reading reading = ReadBytes(ReadOfficeZip, "a.xlsx", Xlsx());

  ASSERT_TRUE(reading.is_good) << reading.why;
  EXPECT_EQ(reading.content.text, "Dues sh ared 42.5 in place made");
  EXPECT_EQ(reading.Text(ContentField::SUBJECT), "Harbour");
}

TEST(OoxmlTest, HugePlacesOfCellsCostNothing) {
  const std::string bytes = Zipped(
      {{"xl/worksheets/sheet1.xml",
        "<worksheet><dimension ref=\"A1:XFD1048576\"/><cols><col min=\"1\" max=\"4000000000\"/>"
        "</cols><sheetData><row r=\"1048576\" spans=\"1:1000000\"><c r=\"XFD1048576\" "
        "t=\"inlineStr\"><is><t>quay</t></is></c><c r=\"ZZZZZZZ4000000000\" t=\"s\">"
        "<v>4000000000</v></c></row></sheetData><mergeCells><mergeCell "
        "ref=\"A1:XFD1048576\"/></mergeCells></worksheet>"},
       {"xl/sharedStrings.xml",
        "<sst count=\"4000000000\" uniqueCount=\"4000000000\"><si><t>shared</t></si></sst>"}});

  EXPECT_EQ(ReadBytes(ReadOfficeZip, "a.xlsx", bytes).content.text, "shared quay");
  ExpectSameBehindDoors("a.xlsx", bytes);
}

TEST(OoxmlTest, ATableOfNumbersHidesNoWords) {
  std::string rows;
  for (int i = 0; i < 10'000; ++i) {
    rows += "<row><c><v>" + std::to_string(i) + "</v></c></row>";
  }
  const Reading reading =
      ReadBytes(ReadOfficeZip, "a.xlsx",
                Zipped({{"xl/worksheets/sheet1.xml", "<worksheet>" + rows + "</worksheet>"},
                        {"xl/sharedStrings.xml", "<sst><si><t>shared</t></si></sst>"}}),
                {0, 1000});

  EXPECT_TRUE(reading.is_good) << reading.why;
  EXPECT_TRUE(reading.content.is_cut);
  EXPECT_THAT(reading.content.text, testing::StartsWith("shared 0 1 2 "));
}

TEST(OoxmlTest, HeadsAndFeetOfPagesAreFoundWithoutTheirMarks) {
  const Reading reading = ReadBytes(
      ReadOfficeZip, "a.xlsx",
      Zipped({{"xl/worksheets/sheet1.xml",
               "<worksheet><sheetData><row><c><v>1</v></c></row></sheetData><headerFooter>"
               "<oddHeader>&amp;LTide&amp;C&amp;\"Arial,Bold\"&amp;14ta&amp;Bble&amp;K00FF00s"
               "</oddHeader><oddFooter>&amp;RQuay &amp;&amp; Co&amp;P</oddFooter></headerFooter>"
               "</worksheet>"}}));

  EXPECT_EQ(reading.content.text, "1 Tide tables Quay & Co");
}

TEST(OoxmlTest, CommentsAreWordsOfTheirOwn) {
  const Reading reading = ReadBytes(
      ReadOfficeZip, "a.xlsx",
      Zipped({{"xl/comments1.xml",
               "<comments><commentList><comment><text><t>one</t></text></comment><comment><text>"
               "<r><t>tw</t></r><r><t>o</t></r></text></comment></commentList></comments>"},
              {"ppt/comments/comment1.xml",
               "<cmLst><cm><text>three</text></cm><cm><text>four</text></cm></cmLst>"}}));

  EXPECT_EQ(reading.content.text, "one two three four");
}

TEST(OoxmlTest, SlidesAndNotesAreFoundMastersAreNot) {
  const Reading reading = ReadBytes(ReadOfficeZip, "a.pptx", Pptx());

  ASSERT_TRUE(reading.is_good) << reading.why;
  EXPECT_EQ(reading.content.text, "\u041f\u0440\u0438\u0432\u0435\u0442 whisper");
  EXPECT_EQ(reading.Number(ContentField::PAGES), 3);
}

TEST(OoxmlTest, EntitiesOfTheFilesOwnAreNotExpanded) {
  const std::string bomb =
      "<!DOCTYPE d [<!ENTITY a \"aaaaaaaaaa\"><!ENTITY b \"&a;&a;&a;&a;&a;&a;&a;&a;&a;&a;\">"
      "<!ENTITY f SYSTEM \"file:///etc/passwd\">]>"
      "<d><t>before &b; &f; after</t></d>";

  const Reading reading = ReadBytes(ReadOfficeZip, "a.docx", Zipped({{"word/document.xml", bomb}}));

  EXPECT_EQ(reading.content.text, "before after");
}

TEST(OoxmlTest, ElementsInElementsWithoutEndAreDamage) {
  std::string deep = "<d>";
  for (int i = 0; i < 100'000; ++i) {
    deep += "<p>";
  }

  const Reading reading = ReadBytes(ReadOfficeZip, "a.docx", Zipped({{"word/document.xml", deep}}));

  EXPECT_EQ(reading.why, "damaged");
}

TEST(OoxmlTest, OfAPartThatBreaksOffTheBeginningIsKept) {
  const Reading reading =
      ReadBytes(ReadOfficeZip, "a.docx",
                Zipped({{"word/document.xml", "<d><p><t>half a</t></p><p><t>docu"}}));

  EXPECT_EQ(reading.why, "damaged");
  EXPECT_THAT(reading.content.text, testing::StartsWith("half a"));
}

TEST(OoxmlTest, ADamagedDocumentIsNotReadAsAnArchive) {
  std::string error;
  ASSERT_TRUE(LoadMagic(error)) << error;
  const Reading damaged =
      ReadBytes(ReadDocument, "a.docx", Zipped({CORE, {"word/document.xml", "<d><p><t>half a"}}));
  EXPECT_EQ(damaged.why, "damaged");
  EXPECT_EQ(damaged.Text(ContentField::SUBJECT), "Harbour");
  EXPECT_EQ(damaged.Text(ContentField::MEMBERS), "");

  const Reading other = ReadBytes(ReadDocument, "a.docx", Zipped({{"a.txt", "words"}}));
  EXPECT_TRUE(other.is_good) << other.why;
  EXPECT_EQ(other.Text(ContentField::MEMBERS), "a.txt");
}

TEST(OoxmlTest, WhatIsNoDocumentIsSaidInWords) {
  EXPECT_EQ(ReadBytes(ReadOfficeZip, "a.docx", "").why, "not an office document");
  EXPECT_EQ(ReadBytes(ReadOfficeZip, "a.docx", "words").why, "not an office document");
  EXPECT_EQ(ReadBytes(ReadOfficeZip, "a.docx", Zipped({{"a.txt", "words"}})).why,
            "not an office document");
  EXPECT_EQ(ReadBytes(ReadOfficeZip, "a.docx", "PK").why, "not a ZIP file");
}

TEST(OoxmlTest, APieceOfTextWithoutEndIsDamageInSilence) {
  const std::string blanks(64 << 20, ' ');

  testing::internal::CaptureStderr();
  const Reading reading =
      ReadBytes(ReadOfficeZip, "a.docx",
                Zipped({{"word/document.xml", "<d><t>first</t><t>" + blanks + "</t></d>"}, CORE}));

  EXPECT_EQ(testing::internal::GetCapturedStderr(), "");
  EXPECT_EQ(reading.why, "damaged");
  EXPECT_EQ(reading.content.text, "first");
  EXPECT_EQ(reading.Text(ContentField::SUBJECT), "Harbour");
}

TEST(OoxmlTest, DamageIsSurvived) {
  ExpectSurvivesDamage(ReadOfficeZip, "a.docx", Docx("<w:p>" + Piece("word") + "</w:p>"));
  ExpectSurvivesDamage(ReadOfficeZip, "a.xlsx", Xlsx());
  ExpectSurvivesDamage(ReadOfficeZip, "a.pptx", Pptx());
}

}  // namespace fileindexd
