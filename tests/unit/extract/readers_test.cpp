// SPDX-License-Identifier: GPL-2.0-or-later
// Text and markup, read in this process.
#include "tests/unit/extract/reader_fixture.h"

namespace fileindexd {

namespace {

std::string FieldOf(const Found& found, ContentField field) {
  for (const TextField& text : found.content.texts) {
    if (text.field == field) {
      return text.text;
    }
  }
  return "";
}

TEST(TextTest, BinaryDataIsRefused) {
  std::string noise;
  uint32_t state = 1;
  for (int at = 0; at < 100'000; ++at) {
    state = state * 1664525U + 1013904223U;
    noise += static_cast<char>(state >> 24);
  }
  EXPECT_EQ(Read(ReadText, noise).why, "not a text");
  EXPECT_FALSE(Read(ReadText, std::string(1000, '\0')).is_read);
  EXPECT_FALSE(Read(ReadText, std::string_view("\x01\x02\x03\x04", 4)).is_read);
  // An archive behind a script: the script is read.
  const Found script = Read(ReadText, "#!/bin/sh\n" + std::string(64 * 1024, 'w') + noise);
  EXPECT_TRUE(script.is_read);
  EXPECT_TRUE(script.content.text.starts_with("#!/bin/sh w"));
}

TEST(TextTest, StrayControlsAreAllowed) {
  EXPECT_EQ(Read(ReadText, std::string_view("log\0line\x1B[1mbold", 16)).content.text,
            "log line [1mbold");
  EXPECT_TRUE(Read(ReadText, "").is_read);
}

TEST(TextTest, OnlyWhatTheCapNeedsIsRead) {
  const ScopedFd file(memfd_create("test", MFD_CLOEXEC));
  ASSERT_EQ(write(file.fd, "some words ", 11), 11);
  // All holes: reading it through would take minutes, and find no text in it.
  ASSERT_EQ(ftruncate(file.fd, off_t{1} << 40), 0);
  ASSERT_EQ(pwrite(file.fd, std::string(64 * 1024, 'x').data(), 64 * 1024, 11), 64 * 1024);
  ContentSink sink(10);
  std::string why;
  EXPECT_TRUE(ReadText({file.fd, "a.txt", int64_t{1} << 40, 0}, sink, why)) << why;
  EXPECT_EQ(sink.content.text, "some words");
  EXPECT_TRUE(sink.IsFull());
}

TEST(HtmlTest, WordsAndFieldsAreRead) {
  const Found found = Read(ReadHtml,
                           R"(<!doctype html><html><head>
<title>A &amp; B &eacute;</title><meta name="Author" content="Me &lt;me@x&gt;">
<META NAME=description CONTENT='What it is'><meta name=keywords content="one, two">
<style>p { color: hidden1 }</style><script>var hidden2 = "</p>";</script></head>
<body onload='hidden3()'><h1>He<i>ad</i></h1><p>one<p>two<br>three<table><tr><td>x<td>y</table>lo<wbr>ng <var>a</var>b
<svg><title>not this</title></svg><noscript>hidden4</noscript><template>hidden5</template>
<!-- hidden6 --><a href="hidden7">li</a>nk &#8364; &unknown;</body></html>)");
  EXPECT_TRUE(found.is_read) << found.why;
  EXPECT_EQ(found.content.text,
            "Head one two three x y long ab not this link \xE2\x82\xAC &unknown;");
  EXPECT_EQ(FieldOf(found, ContentField::TITLE), "A & B \xC3\xA9");
  EXPECT_EQ(FieldOf(found, ContentField::AUTHOR), "Me <me@x>");
  EXPECT_EQ(FieldOf(found, ContentField::DESCRIPTION), "What it is");
  EXPECT_EQ(FieldOf(found, ContentField::KEYWORDS), "one, two");
}

TEST(HtmlTest, BrokenPagesAreReadAsFarAsTheyGo) {
  const struct {
    const char* bytes;
    const char* text;
  } rows[] = {{"<p>one</b></i><table>two", "one two"},
              {"no markup at all", "no markup at all"},
              {"<p>one<script>never closed", "one"},
              {"<title>never closed <p>x", ""},
              {"<", ""},
              {"<p>a</p", "a"},
              {"</script></style>words", "words"},
              {"", ""}};
  for (const auto& row : rows) {
    EXPECT_EQ(Read(ReadHtml, row.bytes).content.text, row.text) << row.bytes;
  }
}

TEST(HtmlTest, DepthAndLengthAreNoDanger) {
  std::string deep;
  for (int at = 0; at < 100'000; ++at) {
    deep += "<div>";
  }
  EXPECT_TRUE(Read(ReadHtml, deep + "words").is_read);
  std::string attribute = "<p title=\"" + std::string(3'000'000, 'x') + "\">words";
  EXPECT_TRUE(Read(ReadHtml, attribute).is_read);
  const Found cut = Read(ReadHtml, "<p>" + std::string(3'000'000, 'w'), 1000);
  EXPECT_TRUE(cut.content.is_cut);
}

TEST(XmlTest, WordsAndFieldsAreRead) {
  const Found found = Read(ReadXml, R"(<?xml version="1.0"?>
<svg xmlns="http://www.w3.org/2000/svg" xmlns:dc="urn:dc"><title>A map</title><desc>Of the isle</desc>
<metadata><dc:creator>Me</dc:creator></metadata><style>hidden</style>
<text>one<tspan>two</tspan></text><script><![CDATA[hidden]]></script><g><![CDATA[three]]></g></svg>)");
  EXPECT_TRUE(found.is_read) << found.why;
  EXPECT_EQ(found.content.text, "A map Of the isle Me one two three");
  EXPECT_EQ(FieldOf(found, ContentField::TITLE), "A map");
  EXPECT_EQ(FieldOf(found, ContentField::DESCRIPTION), "Of the isle");
  EXPECT_EQ(FieldOf(found, ContentField::AUTHOR), "Me");
}

TEST(XmlTest, NoEntityIsPutInAndNothingIsFetched) {
  const Found bomb = Read(ReadXml, R"(<!DOCTYPE a [<!ENTITY b "bbbbbbbbbb"><!ENTITY c "&b;&b;&b;">
<!ENTITY d "&c;&c;&c;&c;"><!ENTITY file SYSTEM "file:///etc/passwd">]><a>x &d; &file; y</a>)");
  EXPECT_EQ(bomb.content.text, "x y");
}

TEST(XmlTest, AFaultCostsNoWordsAndNoFields) {
  for (const char* begin :
       {"<?xml version=\"1.0\" encoding=\"UTF-8\"?><a><title>Dues</title><b>caf\xE9 closed</b>",
        "<?xml version=\"1.0\" encoding=\"no-such\"?><a><title>Dues</title><b>caf\xE9 closed</b>",
        "<a><title>Dues</title><b>caf\xE9 closed</b>&nbsp;",
        "<a><title>Dues</title><b>caf\xE9 closed</b></c>"}) {
    const Found found = Read(ReadXml, std::string(begin) + "<b>quay <i>west</i></b></a>");
    EXPECT_EQ(found.why, "damaged XML") << begin;
    EXPECT_NE(found.content.text.find("café closed"), std::string::npos) << found.content.text;
    EXPECT_NE(found.content.text.find("quay west"), std::string::npos) << found.content.text;
    EXPECT_EQ(found.content.text.find("version"), std::string::npos) << found.content.text;
    EXPECT_EQ(FieldOf(found, ContentField::TITLE), "Dues") << begin;
  }
}

TEST(XmlTest, BehindAFaultTheSameIsHiddenAndTheSameIsText) {
  for (const char* fault : {"", "&nbsp;", "</c>"}) {
    const std::string bytes =
        "<?xml version=\"1.0\"?><a xmlns:office=\"urn:o\"><b>quay <object>west</object></b>" +
        std::string(fault) +
        "<binary id=\"1\">aGlkZGVu</binary><office:binary-data>aGlkZGVu</office:binary-data>"
        "<b><![CDATA[alpha words]]></b></a>";
    EXPECT_EQ(Read(ReadXml, bytes).content.text, "quay west alpha words") << fault;
  }
}

TEST(XmlTest, DamagedFilesKeepWhatIsThere) {
  const Found damaged = Read(ReadXml, "<a><b>words</b><c>more");
  EXPECT_EQ(damaged.content.text, "words more");
  EXPECT_EQ(damaged.why, "damaged XML");
  const Found other = Read(ReadXml, "no markup");
  EXPECT_FALSE(other.is_read);
  EXPECT_EQ(other.why, "not an XML file");
  EXPECT_FALSE(Read(ReadXml, "").is_read);
}

TEST(XmlTest, DepthIsNoDanger) {
  std::string deep;
  for (int at = 0; at < 100'000; ++at) {
    deep += "<a>";
  }
  EXPECT_FALSE(Read(ReadXml, deep + "words").is_read);
}

}  // namespace

}  // namespace fileindexd
