// SPDX-License-Identifier: GPL-2.0-or-later
#include <vector>

#include "tests/unit/extract/behind_doors.h"
#include "tests/unit/extract/documents/fixture.h"

namespace fileindexd {

namespace {

// Objects one after the other, numbered from 1; the first is the catalogue, the last the
// information dictionary.
std::string PdfOf(const std::vector<std::string>& objects, const std::string& trailer = "") {
  std::string pdf = "%PDF-1.4\n";
  std::string table = "xref\n0 " + std::to_string(objects.size() + 1) + "\n0000000000 65535 f \n";
  for (size_t i = 0; i < objects.size(); ++i) {
    std::string offset = std::to_string(pdf.size());
    table += std::string(10 - offset.size(), '0') + offset + " 00000 n \n";
    pdf += std::to_string(i + 1) + " 0 obj\n" + objects[i] + "\nendobj\n";
  }
  const size_t table_offset = pdf.size();
  return pdf + table + "trailer\n<< /Size " + std::to_string(objects.size() + 1) +
         " /Root 1 0 R /Info " + std::to_string(objects.size()) + " 0 R " + trailer +
         " >>\nstartxref\n" + std::to_string(table_offset) + "\n%%EOF\n";
}

std::string Stream(const std::string& bytes) {
  return "<< /Length " + std::to_string(bytes.size()) + " >>\nstream\n" + bytes + "\nendstream";
}

constexpr char INFO[] =
    "<< /Title (Harbour dues) /Author <FEFF00C5007300610020004C0069006E0064> /Subject (Tariff)"
    " /Keywords (quay, crane) /CreationDate (D:20200102030405Z) >>";

std::string PageOf(int content) {
  return "<< /Type /Page /Parent 2 0 R /MediaBox [0 0 400 400] /Contents " +
         std::to_string(content) + " 0 R /Resources << /Font << /F 3 0 R >> >> >>";
}

const std::string FONT =
    "<< /Type /Font /Subtype /Type1 /BaseFont /Helvetica /Encoding /WinAnsiEncoding >>";

std::string TwoPages() {
  return PdfOf(
      {"<< /Type /Catalog /Pages 2 0 R >>", "<< /Type /Pages /Kids [4 0 R 6 0 R] /Count 2 >>", FONT,
       PageOf(5),
       Stream("BT /F 12 Tf 20 300 Td (The lighthouse) Tj 0 -40 Td (keeper r\344umt auf) Tj ET"),
       PageOf(7), Stream("BT /F 12 Tf 20 300 Td (second sheet) Tj ET"), INFO});
}

}  // namespace

TEST(PdfTest, TextOfAllPagesAndFieldsAreFound) {
  const Reading reading = ReadBytes(ReadPdf, "a.pdf", TwoPages());

  ASSERT_TRUE(reading.is_good) << reading.why;
  EXPECT_EQ(reading.content.kind, Kind::DOCUMENT);
  EXPECT_THAT(reading.content.text, testing::HasSubstr("The lighthouse keeper r\u00e4umt auf"));
  EXPECT_THAT(reading.content.text, testing::HasSubstr("second sheet"));
  EXPECT_EQ(reading.Text(ContentField::TITLE), "Harbour dues");
  EXPECT_EQ(reading.Text(ContentField::AUTHOR), "\u00c5sa Lind");
  EXPECT_EQ(reading.Text(ContentField::SUBJECT), "Tariff");
  EXPECT_EQ(reading.Text(ContentField::KEYWORDS), "quay, crane");
  EXPECT_EQ(reading.Number(ContentField::PAGES), 2);
  EXPECT_EQ(reading.Number(ContentField::CREATED), 1577934245);
}

TEST(PdfTest, PagesAreReadUntilTheTextIsFull) {
  const Reading reading = ReadBytes(ReadPdf, "a.pdf", TwoPages(), {0, 16});

  EXPECT_TRUE(reading.is_good) << reading.why;
  EXPECT_TRUE(reading.content.is_cut);
  EXPECT_LE(reading.content.text.size(), 16U);
  EXPECT_EQ(reading.Number(ContentField::PAGES), 2);
}

TEST(PdfTest, WithoutDatesOrNamesThereAreNoFields) {
  const Reading reading = ReadBytes(
      ReadPdf, "a.pdf",
      PdfOf({"<< /Type /Catalog /Pages 2 0 R >>", "<< /Type /Pages /Kids [4 0 R] /Count 1 >>", FONT,
             PageOf(5), Stream("BT /F 12 Tf (x) Tj ET"), "<< /CreationDate (soon) >>"}));

  EXPECT_TRUE(reading.is_good) << reading.why;
  EXPECT_TRUE(reading.content.texts.empty());
  EXPECT_EQ(reading.Number(ContentField::CREATED), std::nullopt);
}

TEST(PdfTest, AnEncryptedFileIsSaidToBeOne) {
  const std::string handler = "<< /Filter /Standard /V 1 /R 2 /O <" + std::string(64, '1') +
                              "> /U <" + std::string(64, '2') + "> /P -4 >>";
  const Reading reading = ReadBytes(
      ReadPdf, "a.pdf",
      PdfOf(
          {"<< /Type /Catalog /Pages 2 0 R >>", "<< /Type /Pages /Kids [] /Count 0 >>", INFO},
          "/ID [<00112233445566778899AABBCCDDEEFF> <00112233445566778899AABBCCDDEEFF>] /Encrypt " +
              handler));

  EXPECT_FALSE(reading.is_good);
  EXPECT_EQ(reading.why, "encrypted");
}

TEST(PdfTest, WhatIsNoPdfIsSaidInWords) {
  EXPECT_EQ(ReadBytes(ReadPdf, "a.pdf", "").why, "empty");
  EXPECT_EQ(ReadBytes(ReadPdf, "a.pdf", "just some words").why, "not a PDF file");
  EXPECT_EQ(ReadBytes(ReadPdf, "a.pdf", "%PDF-1.4\nand nothing else").why, "damaged");
}

TEST(PdfTest, AClaimOfEndlessPagesEnds) {
  const auto claiming = [](const std::string& count) {
    return PdfOf({"<< /Type /Catalog /Pages 2 0 R >>",
                  "<< /Type /Pages /Kids [4 0 R] /Count " + count + " >>", FONT, PageOf(5),
                  Stream("BT /F 12 Tf 20 300 Td (alone) Tj ET"), INFO});
  };
  // More than there are objects: the library believes nothing of it.
  const Reading endless = ReadBytes(ReadPdf, "a.pdf", claiming("2000000000"));
  EXPECT_EQ(endless.why, "damaged");
  EXPECT_EQ(endless.Text(ContentField::TITLE), "Harbour dues");
  EXPECT_EQ(endless.Number(ContentField::PAGES), std::nullopt);
  EXPECT_EQ(endless.content.text, "");

  const Reading more = ReadBytes(ReadPdf, "a.pdf", claiming("5"));
  EXPECT_TRUE(more.is_good) << more.why;
  EXPECT_EQ(more.content.text, "alone");
  EXPECT_EQ(more.Number(ContentField::PAGES), 5);
}

TEST(PdfTest, PagesThatHoldThemselvesEnd) {
  const Reading reading =
      ReadBytes(ReadPdf, "a.pdf",
                PdfOf({"<< /Type /Catalog /Pages 2 0 R >>",
                       "<< /Type /Pages /Parent 2 0 R /Kids [2 0 R 2 0 R] /Count 100 >>", INFO}));

  EXPECT_FALSE(reading.is_good);
  EXPECT_EQ(reading.why, "damaged");
}

TEST(PdfTest, PagesOfAnySizeCostNothing) {
  for (const char* box : {"0 0 1000000000 1000000000", "-1e30 -1e30 1e30 1e30", "0 0 0 0",
                          "2147483647 2147483647 -2147483648 -2147483648"}) {
    std::string page = PageOf(5);
    page.replace(page.find("0 0 400 400"), 11, box);
    const std::string pdf =
        PdfOf({"<< /Type /Catalog /Pages 2 0 R >>", "<< /Type /Pages /Kids [4 0 R] /Count 1 >>",
               FONT, page, Stream("BT /F 12 Tf 20 300 Td (alone) Tj ET"), INFO});
    const Reading reading = ReadBytes(ReadPdf, "a.pdf", pdf);

    EXPECT_TRUE(reading.is_good) << box << ": " << reading.why;
    EXPECT_EQ(reading.Text(ContentField::TITLE), "Harbour dues") << box;
    ExpectSameBehindDoors("a.pdf", pdf);
  }
}

// The font names a table of characters, which is a file of the library's own.
TEST(PdfTest, LettersOfTheEastAreFoundByTheirTablesBehindTheDoorsToo) {
  const std::string pdf =
      PdfOf({"<< /Type /Catalog /Pages 2 0 R >>", "<< /Type /Pages /Kids [4 0 R] /Count 1 >>",
             "<< /Type /Font /Subtype /Type0 /BaseFont /HeiseiMin-W3 /Encoding /90ms-RKSJ-H"
             " /DescendantFonts [6 0 R] >>",
             PageOf(5), Stream("BT /F 12 Tf 20 300 Td <938C8B9E> Tj ET"),
             "<< /Type /Font /Subtype /CIDFontType0 /BaseFont /HeiseiMin-W3 /FontDescriptor 7 0 R"
             " /CIDSystemInfo << /Registry (Adobe) /Ordering (Japan1) /Supplement 2 >> >>",
             "<< /Type /FontDescriptor /FontName /HeiseiMin-W3 /Flags 4 /FontBBox [0 -136 1000 859]"
             " /ItalicAngle 0 /Ascent 859 /Descent -140 /CapHeight 709 /StemV 80 >>",
             INFO});

  EXPECT_EQ(ReadBytes(ReadPdf, "a.pdf", pdf).content.text, "\u6771\u4eac");
  ExpectSameBehindDoors("a.pdf", pdf);
}

TEST(PdfTest, DamageIsSurvived) {
  ExpectSurvivesDamage(ReadPdf, "a.pdf", TwoPages());
}

}  // namespace fileindexd
