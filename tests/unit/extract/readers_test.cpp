// SPDX-License-Identifier: GPL-2.0-or-later
// Text and markup, read in this process.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <iconv.h>
#include <sys/mman.h>
#include <unistd.h>

#include <string>

#include "base/scoped_fd.h"
#include "extract/choice.h"
#include "extract/format.h"
#include "index/kind.h"
#include "index/kind_table.h"

namespace fileindexd {

namespace {

struct Found {
  bool is_read = false;
  std::string why;
  Content content;
};

Found Read(FormatReader reader, std::string_view bytes, size_t cap = 100'000) {
  const ScopedFd file(memfd_create("test", MFD_CLOEXEC));
  EXPECT_EQ(write(file.fd, bytes.data(), bytes.size()), static_cast<ssize_t>(bytes.size()));
  ContentSink sink(cap);
  Found found;
  found.is_read = reader({file.fd, "test", static_cast<int64_t>(bytes.size()), 0}, sink, found.why);
  found.content = sink.content;
  return found;
}

std::string FieldOf(const Found& found, ContentField field) {
  for (const TextField& text : found.content.texts) {
    if (text.field == field) {
      return text.text;
    }
  }
  return "";
}

std::string InCharset(const char* charset, std::string text) {
  const iconv_t converter = iconv_open(charset, "UTF-8");
  std::string made(4 * text.size() + 16, '\0');
  char* from = text.data();
  size_t left = text.size();
  char* to = made.data();
  size_t room = made.size();
  EXPECT_EQ(iconv(converter, &from, &left, &to, &room), 0u) << charset;
  iconv_close(converter);
  made.resize(made.size() - room);
  return made;
}

constexpr const char* FRENCH =
    "Les élèves préfèrent étudier à la bibliothèque, où le silence règne même après dîner.";
constexpr const char* RUSSIAN =
    "Съешь ещё этих мягких французских булок, да выпей чаю. Широкая электрификация южных губерний "
    "даст мощный толчок подъёму сельского хозяйства.";
constexpr const char* GREEK =
    "Η γλώσσα αυτή μιλιέται από πολλούς ανθρώπους στην Ελλάδα και στην Κύπρο.";
constexpr const char* JAPANESE =
    "日本語の文章を読むことができます。この文書は検索のためのものです。東京は日本の首都です。";
constexpr const char* CHINESE =
    "这是一个用来测试编码的中文文件，里面有很多常用的汉字，可以被搜索到。北京是中国的首都。";
constexpr const char* KOREAN =
    "이 문서는 한국어로 작성되었습니다. 서울은 대한민국의 수도이며 많은 사람들이 살고 있습니다.";

TEST(TextTest, CharsetsAreTold) {
  const struct {
    const char* charset;
    const char* text;
  } rows[] = {{"UTF-8", FRENCH},     {"ISO-8859-1", FRENCH},    {"WINDOWS-1252", FRENCH},
              {"UTF-8", RUSSIAN},    {"KOI8-R", RUSSIAN},       {"WINDOWS-1251", RUSSIAN},
              {"ISO-8859-7", GREEK}, {"UTF-8", JAPANESE},       {"SHIFT_JIS", JAPANESE},
              {"EUC-JP", JAPANESE},  {"ISO-2022-JP", JAPANESE}, {"GB18030", CHINESE},
              {"EUC-KR", KOREAN},    {"UTF-16", RUSSIAN},       {"UTF-16LE", FRENCH},
              {"UTF-16BE", FRENCH},  {"UTF-32", JAPANESE}};
  for (const auto& row : rows) {
    const Found found = Read(ReadText, InCharset(row.charset, row.text));
    EXPECT_TRUE(found.is_read) << row.charset << ": " << found.why;
    EXPECT_EQ(found.content.text, row.text) << row.charset;
  }
}

// A guess needs more to rest on than a name or two in a text without any other accent.
TEST(TextTest, AFewAccentsAreWestern) {
  for (const char* text :
       {"Please send the draft to José before Friday and ask whether the figures are right.",
        "It would be naïve to think that this works.", "The Señor called.",
        "My friend Zoë came yesterday with the keys of the house.",
        "A letter from Günther arrived this morning.", "The façade was painted.",
        "João wrote the first version of the program.", "François and his brother went home.",
        "Dvorák played by Céline at Orléans.", "20° below and 5 µm thick",
        "Het programma is geïnstalleerd op alle computers van de organisatie."}) {
    EXPECT_EQ(Read(ReadText, InCharset("WINDOWS-1252", text)).content.text, text);
  }
  std::string italian;
  for (int line = 0; line < 40; ++line) {
    italian +=
        "tutti gli esseri umani nascono liberi ed eguali senza alcuna distinzione e possono ";
    italian += line % 8 == 0 ? "avere la proprietà privata e la libertà, " : "vivere in pace, ";
  }
  italian += "ecco";
  EXPECT_TRUE(Read(ReadText, InCharset("ISO-8859-1", italian)).content.text == italian);
}

TEST(TextTest, ManyAccentsAreNotTakenForWestern) {
  for (const char* text :
       {"Wszyscy ludzie rodzą się wolni i równi pod względem swej godności i swych praw.",
        "Sva ljudska bića rađaju se slobodna i jednaka u dostojanstvu i pravima. Ona su obdarena "
        "razumom i sviješću i trebaju jedna prema drugima postupati u duhu bratstva."}) {
    EXPECT_EQ(Read(ReadText, InCharset("WINDOWS-1250", text)).content.text, text);
  }
}

TEST(TextTest, WideTextWithoutAMarkIsTold) {
  constexpr const char* CYRILLIC_LINES = "Съешь ещё этих\nмягких французских булок\n";
  for (const char* text : {CYRILLIC_LINES, RUSSIAN, GREEK, "日本語の文章\n東京は日本の首都\n",
                           "这是一个 UTF-16 文件\n北京是中国的首都\n", FRENCH}) {
    for (const char* charset : {"UTF-16LE", "UTF-16BE", "UTF-32LE", "UTF-32BE"}) {
      const std::string read = Read(ReadText, InCharset(charset, text)).content.text;
      const std::string lines = Read(ReadText, text).content.text;
      EXPECT_EQ(read, lines) << charset;
    }
  }
  // Tables of small numbers are none.
  std::string numbers;
  for (int number = 0; number < 2000; ++number) {
    numbers += static_cast<char>(number % 251);
    numbers += static_cast<char>(number % 5);
  }
  EXPECT_FALSE(Read(ReadText, numbers).is_read);
}

TEST(TextTest, KoreanWithShiftsIsRead) {
  EXPECT_EQ(Read(ReadText, InCharset("ISO-2022-KR", KOREAN)).content.text, KOREAN);
}

TEST(TextTest, TheLargerOfTwoCharsetsIsMeant) {
  constexpr const char* UKRAINIAN =
      "Всі люди народжуються вільними і рівними у своїй гідності та правах. Її ґанок.";
  EXPECT_EQ(Read(ReadText, InCharset("KOI8-U", UKRAINIAN)).content.text, UKRAINIAN);
  // Mostly Hungarian, with a few letters that the standard's charset has elsewhere.
  constexpr const char* HUNGARIAN =
      "Minden emberi lény szabadon születik és egyenlő méltósága és joga van. Az emberek, ésszel "
      "és lelkiismerettel bírván, egymással szemben testvéri szellemben kell hogy viseltessenek: "
      "Tomáš, Žofie a Šťastný";
  EXPECT_EQ(Read(ReadText, InCharset("WINDOWS-1250", HUNGARIAN)).content.text, HUNGARIAN);
}

// What begins a character at a piece's or the file's end tells nothing of the charset yet.
TEST(TextTest, ACharacterThatTheEndCutsSettlesNoCharset) {
  EXPECT_EQ(Read(ReadText, "Caf\xE9").content.text, "Café");
  EXPECT_EQ(Read(ReadText, "\xE9").content.text, "é");
  constexpr size_t PIECE = 64 * 1024;
  const std::string plain(PIECE - 1, 'a');
  const std::string text = plain + "é est une lettre. " + FRENCH;
  EXPECT_TRUE(Read(ReadText, InCharset("ISO-8859-1", text), 1'000'000).content.text == text);
  EXPECT_TRUE(Read(ReadText, text, 1'000'000).content.text == text);
  const std::string last = plain + "é";
  EXPECT_TRUE(Read(ReadText, InCharset("ISO-8859-1", last), 1'000'000).content.text == last);
  EXPECT_TRUE(Read(ReadText, last, 1'000'000).content.text == last);
  // Cut, but other characters told before.
  EXPECT_EQ(Read(ReadText, "éa\xC3").content.text, "éa");
}

TEST(TextTest, MarksOfByteOrderAreNoText) {
  EXPECT_EQ(Read(ReadText,
                 "\xEF\xBB\xBF"
                 "a")
                .content.text,
            "a");
  EXPECT_EQ(Read(ReadText, std::string_view("\xFF\xFE"
                                            "a\0b\0",
                                            6))
                .content.text,
            "ab");
  EXPECT_EQ(Read(ReadText, std::string_view("\xFE\xFF\0a\0b", 6)).content.text, "ab");
  EXPECT_EQ(Read(ReadText, std::string_view("\0\0\xFE\xFF\0\0\0a", 8)).content.text, "a");
}

TEST(TextTest, CharactersAreWholeAcrossThePiecesOfAFile) {
  for (const char* charset : {"UTF-8", "SHIFT_JIS", "UTF-16"}) {
    std::string text;
    while (text.size() < 300'000) {
      text += text.size() % 7 == 0 ? "a" : "日本語の文書";
    }
    // Not EXPECT_EQ: it would look for the least difference of long texts, for minutes.
    EXPECT_TRUE(Read(ReadText, InCharset(charset, text), 1'000'000).content.text == text)
        << charset;
  }
}

TEST(TextTest, ACharsetIsToldByTheFirstPieceThatTells) {
  const std::string plain(200'000, 'a');
  const Found found = Read(ReadText, plain + " " + InCharset("ISO-8859-1", FRENCH), 1'000'000);
  EXPECT_TRUE(found.content.text == plain + " " + FRENCH);
}

TEST(TextTest, AWrongUnitCostsItsLetterAlone) {
  using std::string_view_literals::operator""sv;
  // The second half of a pair where a letter should be.
  EXPECT_EQ(Read(ReadText,
                 "\xFF\xFE"
                 "a\0"
                 "\x00\xDC"
                 "b\0c\0"sv)
                .content.text,
            "a bc");
  EXPECT_EQ(Read(ReadText,
                 "\0\0\xFE\xFF"
                 "\0\0\0a"
                 "\0\x7F\0\0"
                 "\0\0\0b"sv)
                .content.text,
            "a b");
}

TEST(TextTest, ABadByteDoesNotMakeItAnotherCharset) {
  const std::string text = JAPANESE;
  EXPECT_EQ(Read(ReadText, text + "\xE9 " + text).content.text, text + " " + text);
  // Much of Latin text is ASCII, and a pair of its letters may look like UTF-8.
  const std::string french = InCharset("WINDOWS-1252", FRENCH);
  EXPECT_EQ(Read(ReadText, french + " \xC3\xA9").content.text, std::string(FRENCH) + " Ã©");
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

TEST(HtmlTest, ThePagesCharsetIsBelieved) {
  for (const char* declared : {"<meta charset=koi8-r>", "<meta charset = \"KOI8-R\">",
                               "<?xml version='1.0' encoding='koi8-r'?>",
                               "<meta http-equiv=content-type content='text/html; charset=koi8-r'>",
                               "<meta charset=nonsense>", "<meta charset=utf-16>", ""}) {
    const Found found =
        Read(ReadHtml, std::string(declared) + "<p>" + InCharset("KOI8-R", RUSSIAN));
    EXPECT_EQ(found.content.text, RUSSIAN) << declared;
  }
}

TEST(HtmlTest, CharsetsAreWhatPeopleMeanByTheirNames) {
  const struct {
    const char* label;
    const char* charset;
    const char* text;
  } rows[] = {{"iso-8859-1", "WINDOWS-1252", "“quay” €5"},
              {"Latin1", "WINDOWS-1252", "“quay” €5"},
              {"gb2312", "GB18030", "朱镕基 €"},
              {"shift_jis", "CP932", "①東京 ～"},
              {"euc-kr", "CP949", "똠방각하"},
              {"us-ascii", "UTF-8", "quay – Größe"}};
  for (const auto& row : rows) {
    const std::string page = std::string("<meta charset=") + row.label + "><p>";
    EXPECT_EQ(Read(ReadHtml, page + InCharset(row.charset, row.text)).content.text, row.text)
        << row.label;
  }
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

// A table of the one says nothing against that of the other.
TEST(FormatTableTest, EndingsHaveTheKindThatTheIndexGivesThem) {
  const struct {
    Kind kind;
    std::string_view endings;
  } rows[] = {{Kind::DOCUMENT, DocumentEndings()},
              {Kind::AUDIO, AudioEndings()},
              {Kind::VIDEO, VideoEndings()},
              {Kind::PHOTO, PhotoEndings()}};
  const auto kind_of = [](Format format) {
    switch (format) {
      case Format::AUDIO:
        return Kind::AUDIO;
      case Format::VIDEO:
        return Kind::VIDEO;
      case Format::PHOTO:
        return Kind::PHOTO;
      default:
        return Kind::DOCUMENT;
    }
  };
  for (const auto& row : rows) {
    std::string_view rest = row.endings;
    while (!rest.empty()) {
      const std::string ending(rest.substr(0, rest.find(' ')));
      rest.remove_prefix(std::min(rest.size(), ending.size() + 1));
      const Format format = FormatOfName("a." + ending);
      // Lists of songs are text, and sound in a film's container is read as one.
      const bool is_other = format == Format::NONE || format == Format::TEXT ||
                            format == Format::XML ||
                            (format == Format::VIDEO && row.kind == Kind::AUDIO);
      if (!is_other) {
        EXPECT_EQ(kind_of(format), row.kind) << ending;
      }
    }
  }
}

TEST(FormatTableTest, EveryFormatOfDocumentsIsToldByItsEnding) {
  const struct {
    const char* names;
    Format format;
  } rows[] = {{"a.TXT", Format::TEXT},
              {"a.csv", Format::TEXT},
              {"a.log", Format::TEXT},
              {"a.md", Format::TEXT},
              {"a.cpp", Format::TEXT},
              {"a.htm", Format::HTML},
              {"a.svg", Format::XML},
              {"a.Pdf", Format::PDF},
              {"a.docx", Format::OFFICE_ZIP},
              {"a.xlsx", Format::OFFICE_ZIP},
              {"a.pptx", Format::OFFICE_ZIP},
              {"a.odt", Format::OFFICE_ZIP},
              {"a.ods", Format::OFFICE_ZIP},
              {"a.odp", Format::OFFICE_ZIP},
              {"a.epub", Format::EPUB},
              {"a.doc", Format::OLD_OFFICE},
              {"a.xls", Format::OLD_OFFICE},
              {"a.ppt", Format::OLD_OFFICE},
              {"a.rtf", Format::RTF},
              {"a.eml", Format::MESSAGE},
              {"a.mbox", Format::MAILBOX},
              {"a.tar.gz", Format::ARCHIVE},
              {"a.7z", Format::ARCHIVE},
              {"a.rar", Format::ARCHIVE},
              {"a.iso", Format::ARCHIVE},
              {"a.mp3", Format::AUDIO},
              {"a.wma", Format::AUDIO},
              {"a.mkv", Format::VIDEO},
              {"a.cr2", Format::PHOTO},
              {".txt", Format::NONE},
              {"a", Format::NONE},
              {"a.", Format::NONE},
              {"a.lzo", Format::NONE},  // its library reads it by a program alone
              {"a.exe", Format::NONE}};
  for (const auto& row : rows) {
    EXPECT_EQ(static_cast<int>(FormatOfName(row.names)), static_cast<int>(row.format)) << row.names;
  }
}

TEST(FormatTableTest, WhatNoReaderIsForIsNotClaimedByItsContent) {
  EXPECT_EQ(static_cast<int>(FormatOfMime("application/x-lzop")), static_cast<int>(Format::NONE));
  EXPECT_EQ(static_cast<int>(FormatOfMime("application/x-lzip")),
            static_cast<int>(Format::ARCHIVE));
}

// Magic numbers of a few letters begin notes as well.
TEST(ChoiceTest, ANoteWithoutAnEndingIsTextWhateverItBeginsWith) {
  std::string error;
  ASSERT_TRUE(LoadMagic(error)) << error;
  for (const std::string begin :
       {"Xref: see the other list", "<?xml is how such files begin", "%PDF-word is a word",
        "GIF89a is an old format", "!<arch>", "RIFF is a container", "%!PS-Adobe is a printer's"}) {
    const std::string note = begin + "\nand so on, said the harbour master.\n";
    const Found found = Read(
        [](const Document& document, ContentSink& sink, std::string& why) {
          return ReadDocument({document.file, "note", document.size, 0}, sink, why);
        },
        note);
    EXPECT_TRUE(found.is_read) << begin << ": " << found.why;
    EXPECT_NE(found.content.text.find("the harbour master"), std::string::npos) << begin;
    EXPECT_EQ(found.content.kind, Kind::DOCUMENT) << begin;
  }
}

TEST(ChoiceTest, WhatTheDiskDoesNotGiveAnyReaderIsNoted) {
  const int file = memfd_create("test", MFD_CLOEXEC);
  ASSERT_EQ(write(file, "words", 5), 5);
  const ScopedFd readable(file);
  const ScopedFd unreadable(open(("/proc/self/fd/" + std::to_string(file)).c_str(), O_WRONLY));
  for (const char* name :
       {"a.txt", "a.html", "a.xml", "a.pdf", "a.docx", "a.fodt", "a.epub", "a.doc", "a.rtf",
        "a.eml", "a.mbox", "a.zip", "a.mp3", "a.mkv", "a.jpg", "a"}) {
    ContentSink sink(1000);
    std::string why;
    int fault = 0;

    (void)ReadDocument({unreadable.fd, name, 5, 0, &fault}, sink, why);

    EXPECT_EQ(fault, EBADF) << name;
  }
}

}  // namespace

}  // namespace fileindexd
