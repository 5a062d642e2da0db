// SPDX-License-Identifier: GPL-2.0-or-later
#include "tests/unit/extract/documents/fixture.h"

namespace fileindexd {

namespace {

constexpr char PLAIN[] =
    "The lighthouse keeper\nr\u00e4umt auf.\n\n\u041c\u0430\u044f\u043a \u8ba1\u5212\n";
// In KOI8-R: a Russian sentence.
constexpr char RUSSIAN[] =
    "\xf3\xdf\xc5\xdb\xd8 \xc5\xdd\xa3 \xdc\xd4\xc9\xc8 \xcd\xd1\xc7\xcb\xc9\xc8 "
    "\xc6\xd2\xc1\xce\xc3\xd5\xda\xd3\xcb\xc9\xc8 \xc2\xd5\xcc\xcf\xcb\n";
constexpr char TABLE[] = "quay;dues;\"paid; in full\"\n1;42,5;yes\n2;17,0;\"no\"\n";
constexpr char PAGE[] =
    "<!DOCTYPE html><html><head><meta charset=utf-8><title>Harbour &amp; dues</title>"
    "<meta name=author content='\u00c5sa'></head><body><h1>The</h1><p>light<b>house</b>"
    "<table><tr><td>left<td>right</table><script>hidden()</script>&eacute;&#8364;</body></html>";
constexpr char MARKUP[] =
    "<?xml version=\"1.0\" encoding=\"UTF-8\"?><!DOCTYPE a [<!ENTITY b \"c\">]>\n"
    "<a xmlns:d=\"e\"><d:title>Dues</d:title><f g=\"h\">first</f><![CDATA[second]]>&b;</a>";
constexpr char DRAWING[] =
    "<svg xmlns=\"http://www.w3.org/2000/svg\" width=\"9\" height=\"9\"><title>Map</title>"
    "<desc>Of the quay</desc><style>hidden</style><text x=\"1\">north<tspan>east</tspan></text>"
    "<path d=\"M0 0L9 9\"/></svg>";

// Two bytes a letter, with the mark of their order.
std::string Widened(std::string_view ascii) {
  std::string wide = "\xFF\xFE";
  for (const char letter : ascii) {
    wide += letter;
    wide += '\0';
  }
  return wide;
}

}  // namespace

// As programs write it: with the colours of a terminal.
TEST(TextFilesTest, ALogIsReadAsText) {
  const std::string log =
      "2026-01-02T03:04:05Z quay[42]: \x1b[31mcrane stuck\x1b[0m\n"
      "2026-01-02T03:04:06Z quay[42]: caf\u00e9 shut\n";
  const Reading reading = ReadBytes(ReadDocument, "quay.log", log);

  EXPECT_TRUE(reading.is_good) << reading.why;
  EXPECT_EQ(reading.content.kind, Kind::DOCUMENT);
  EXPECT_THAT(reading.content.text, testing::HasSubstr("crane stuck"));
  EXPECT_THAT(reading.content.text, testing::HasSubstr("caf\u00e9 shut"));
}

TEST(TextFilesTest, DamageIsSurvived) {
  ExpectSurvivesDamage(ReadText, "a.txt", PLAIN);
  ExpectSurvivesDamage(ReadText, "b.txt", RUSSIAN);
  ExpectSurvivesDamage(ReadText, "c.txt", Widened(TABLE));
  ExpectSurvivesDamage(ReadText, "a.csv", TABLE);
  ExpectSurvivesDamage(ReadText, "a.md", PLAIN);
  ExpectSurvivesDamage(ReadText, "a.cpp", MARKUP);
}

TEST(MarkupTest, DamageIsSurvived) {
  ExpectSurvivesDamage(ReadHtml, "a.html", PAGE);
  ExpectSurvivesDamage(ReadXml, "a.xml", MARKUP);
  ExpectSurvivesDamage(ReadXml, "a.svg", DRAWING);
  ExpectSurvivesDamage(ReadXml, "b.xml", Widened(DRAWING));
}

}  // namespace fileindexd
