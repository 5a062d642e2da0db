// SPDX-License-Identifier: GPL-2.0-or-later
// Charsets of texts and pages, guessed and declared.
#include <iconv.h>

#include "tests/unit/extract/reader_fixture.h"

namespace fileindexd {

namespace {

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

TEST(CharsetTest, CharsetsAreTold) {
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
TEST(CharsetTest, AFewAccentsAreWestern) {
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

TEST(CharsetTest, ManyAccentsAreNotTakenForWestern) {
  for (const char* text :
       {"Wszyscy ludzie rodzą się wolni i równi pod względem swej godności i swych praw.",
        "Sva ljudska bića rađaju se slobodna i jednaka u dostojanstvu i pravima. Ona su obdarena "
        "razumom i sviješću i trebaju jedna prema drugima postupati u duhu bratstva."}) {
    EXPECT_EQ(Read(ReadText, InCharset("WINDOWS-1250", text)).content.text, text);
  }
}

TEST(CharsetTest, WideTextWithoutAMarkIsTold) {
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

TEST(CharsetTest, KoreanWithShiftsIsRead) {
  EXPECT_EQ(Read(ReadText, InCharset("ISO-2022-KR", KOREAN)).content.text, KOREAN);
}

TEST(CharsetTest, TheLargerOfTwoCharsetsIsMeant) {
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

// Controls in the standards' charsets, which a guess names first.
TEST(CharsetTest, SignsThatOnlyTheLargerCharsetHasAreTold) {
  const struct {
    const char* charset;
    const char* text;
  } rows[] = {{"WINDOWS-1253", "2004 1821 – 1821 – “Άλλα” 2004 … … – Η"},
              {"WINDOWS-1252", "med fornuft og samvittighet – … og “bør” handle mot"},
              {"WINDOWS-1252", "Le cœur des élèves bat où sa sœur préfère étudier l’œuvre."}};
  for (const auto& row : rows) {
    EXPECT_EQ(Read(ReadText, InCharset(row.charset, row.text)).content.text, row.text);
  }
}

// What begins a character at a piece's or the file's end tells nothing of the charset yet.
TEST(CharsetTest, ACharacterThatTheEndCutsSettlesNoCharset) {
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

TEST(CharsetTest, MarksOfByteOrderAreNoText) {
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

TEST(CharsetTest, CharactersAreWholeAcrossThePiecesOfAFile) {
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

TEST(CharsetTest, ACharsetIsToldByTheFirstPieceThatTells) {
  const std::string plain(200'000, 'a');
  const Found found = Read(ReadText, plain + " " + InCharset("ISO-8859-1", FRENCH), 1'000'000);
  EXPECT_TRUE(found.content.text == plain + " " + FRENCH);
}

TEST(CharsetTest, AWrongUnitCostsItsLetterAlone) {
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

TEST(CharsetTest, ABadByteDoesNotMakeItAnotherCharset) {
  const std::string text = JAPANESE;
  EXPECT_EQ(Read(ReadText, text + "\xE9 " + text).content.text, text + " " + text);
  // Much of Latin text is ASCII, and a pair of its letters may look like UTF-8.
  const std::string french = InCharset("WINDOWS-1252", FRENCH);
  EXPECT_EQ(Read(ReadText, french + " \xC3\xA9").content.text, std::string(FRENCH) + " Ã©");
}

TEST(CharsetTest, ThePagesCharsetIsBelieved) {
  for (const char* declared : {"<meta charset=koi8-r>", "<meta charset = \"KOI8-R\">",
                               "<?xml version='1.0' encoding='koi8-r'?>",
                               "<meta http-equiv=content-type content='text/html; charset=koi8-r'>",
                               "<meta charset=nonsense>", "<meta charset=utf-16>", ""}) {
    const Found found =
        Read(ReadHtml, std::string(declared) + "<p>" + InCharset("KOI8-R", RUSSIAN));
    EXPECT_EQ(found.content.text, RUSSIAN) << declared;
  }
}

TEST(CharsetTest, CharsetsAreWhatPeopleMeanByTheirNames) {
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

}  // namespace

}  // namespace fileindexd
