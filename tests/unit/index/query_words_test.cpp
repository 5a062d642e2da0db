// SPDX-License-Identifier: GPL-2.0-or-later
// Words of questions, in names and contents.
#include "tests/unit/index/question_fixture.h"

namespace fileindexd {

class QueryWordsTest : public QuestionTest {};

TEST_F(QueryWordsTest, OperatorsCombineNamesAndContents) {
  Store({{"blue.txt", TextContent("whale")},
         {"green.txt", TextContent("whale and shark")},
         {"red.txt", TextContent("shark")},
         {"blue green.txt", TextContent("nothing")}});

  EXPECT_EQ(Sorted("blue OR red"), Names({"blue green.txt", "blue.txt", "red.txt"}));
  EXPECT_EQ(Sorted("whale -green"), Names({"blue.txt"}));
  EXPECT_EQ(Sorted("txt -whale"), Names({"blue green.txt", "red.txt"}));
  EXPECT_EQ(Sorted("txt -(whale OR shark)"), Names({"blue green.txt"}));
  EXPECT_EQ(Sorted("(blue OR green) whale"), Names({"blue.txt", "green.txt"}));
  EXPECT_EQ(Sorted("whale shark OR name:blue nothing"), Names({"blue green.txt", "green.txt"}));
  EXPECT_EQ(Sorted("blue NOT NOT whale"), Names({"blue.txt"}));
  EXPECT_EQ(Sorted("shark -blue -whale"), Names({"red.txt"}));
  EXPECT_EQ(Sorted("name:blue -name:green"), Names({"blue.txt"}));
  EXPECT_EQ(Sorted("name:blue -name:*gre*"), Names({"blue.txt"}));
  EXPECT_EQ(Sorted("name:txt -ext:txt"), Names());
}

TEST_F(QueryWordsTest, WhatIsNotShownIsNotLookedFor) {
  Store({{"whale.txt", TextContent("a blue whale sings")}});
  ASSERT_EQ(Hits("whale sings"), Names({"whale.txt"}));
  EXPECT_EQ(answer.hits[0].snippet.text, "a blue whale sings");
  EXPECT_EQ(answer.hits[0].marks.size(), 1u);

  question.shows = false;

  ASSERT_EQ(Hits("whale sings"), Names({"whale.txt"}));
  EXPECT_EQ(answer.hits[0].snippet.text, "");
  EXPECT_TRUE(answer.hits[0].marks.empty());
}

TEST_F(QueryWordsTest, PhrasesStandInARow) {
  Store({{"a.txt", TextContent("the old blue whale sings")},
         {"b.txt", TextContent("blue is the whale")},
         {"blue whale.txt", TextContent("x")},
         {"whale blue.txt", TextContent("y")}});

  EXPECT_EQ(Sorted("\"blue whale\""), Names({"a.txt", "blue whale.txt"}));
  EXPECT_EQ(Sorted("\"old blue wha\"*"), Names({"a.txt"}));
  EXPECT_EQ(Sorted("name:\"blue whale\""), Names()) << "the whole name";
  EXPECT_EQ(Sorted("text:\"blue whale\""), Names({"a.txt"}));
  EXPECT_EQ(Sorted("\"whale is\""), Names());
}

TEST_F(QueryWordsTest, ScopesTellWhereToLook) {
  Content tagged = Tagged(ContentField::AUTHOR, "Herman Melville");
  tagged.texts.push_back({ContentField::TITLE, "Moby Dick"});
  tagged.text = "call me ishmael";
  Store({{"book.txt", tagged}, {"melville.txt", TextContent("moby")}});

  EXPECT_EQ(Sorted("melville"), Names({"book.txt", "melville.txt"}));
  EXPECT_EQ(Hits("name:melville"), Names({"melville.txt"}));
  EXPECT_EQ(Hits("author:melville"), Names({"book.txt"}));
  EXPECT_EQ(Hits("author:\"herman melville\""), Names({"book.txt"}));
  EXPECT_EQ(Hits("author:mel*"), Names({"book.txt"}));
  EXPECT_EQ(Hits("title:melville"), Names());
  EXPECT_EQ(Hits("text:moby"), Names({"melville.txt"}));
  EXPECT_EQ(Hits("title:moby"), Names({"book.txt"}));
  EXPECT_EQ(Hits("text:ishmael"), Names({"book.txt"}));
}

TEST_F(QueryWordsTest, EachTextFieldIsFoundByItsName) {
  const std::vector<std::pair<std::string, ContentField>> fields = {
      {"title", ContentField::TITLE},
      {"author", ContentField::AUTHOR},
      {"subject", ContentField::SUBJECT},
      {"description", ContentField::DESCRIPTION},
      {"keywords", ContentField::KEYWORDS},
      {"from", ContentField::FROM},
      {"to", ContentField::TO},
      {"attachment", ContentField::ATTACHMENTS},
      {"member", ContentField::MEMBERS},
      {"artist", ContentField::ARTIST},
      {"album", ContentField::ALBUM},
      {"albumartist", ContentField::ALBUM_ARTIST},
      {"genre", ContentField::GENRE},
      {"composer", ContentField::COMPOSER},
      {"codec", ContentField::CODECS},
      {"camera", ContentField::CAMERA},
      {"lens", ContentField::LENS},
      {"caption", ContentField::CAPTION}};
  std::map<std::string, Content> files;
  for (const auto& [name, field] : fields) {
    files["f " + name] = Tagged(field, "walrus");
  }
  Store(files);

  for (const auto& [name, field] : fields) {
    EXPECT_EQ(Hits(name + ":walrus"), Names({"f " + name}));
    EXPECT_EQ(Hits("has:" + name), Names({"f " + name}));
    EXPECT_EQ(answer.total, 1U);
    EXPECT_EQ(Reasons("f " + name, "walrus"), Names({"walrus: " + name}));
  }
  question.limit = 100;
  EXPECT_EQ(Hits("walrus").size(), fields.size());
}

TEST_F(QueryWordsTest, NamesAreFoundByPieces) {
  Empty({"annual report.pdf", "Reporting.PDF", "\u00dcbung.txt", "port", "a.tar.gz", "data_2024"});

  EXPECT_EQ(Sorted("name:*port*"), Names({"Reporting.PDF", "annual report.pdf", "port"}));
  EXPECT_EQ(Sorted("name:*PORT"), Names({"port"}));
  EXPECT_EQ(Sorted("name:*.pdf"), Names({"Reporting.PDF", "annual report.pdf"}));
  EXPECT_EQ(Sorted("name:a*f"), Names({"annual report.pdf"}));
  EXPECT_EQ(Sorted("name:a*t*r*.gz"), Names({"a.tar.gz"}));
  EXPECT_EQ(Sorted("name:*ubu*"), Names({"\u00dcbung.txt"}));
  EXPECT_EQ(Sorted("name:*u\u0308b*"), Names({"\u00dcbung.txt"}));
  EXPECT_EQ(Sorted("name:*gz*tar*"), Names());
  EXPECT_EQ(Sorted("name:*t*"), Names({"Reporting.PDF", "a.tar.gz", "annual report.pdf",
                                       "data_2024", "port", "\u00dcbung.txt"}));
  EXPECT_EQ(Sorted("name:*_2*"), Names({"data_2024"}));
  EXPECT_EQ(Sorted("name:rt*rt"), Names());
}

TEST_F(QueryWordsTest, ExactNamesAreWholeNames) {
  Empty({"report.pdf", "my report.pdf", "REPORT.pdf.bak", "++", "a b  c"});

  EXPECT_EQ(Hits("name:\"REPORT.pdf\""), Names({"report.pdf"}));
  EXPECT_EQ(Hits("name:\"report\""), Names());
  EXPECT_EQ(Hits("name:\"++\""), Names({"++"}));
  EXPECT_EQ(Hits("name:\"a b  c\""), Names({"a b  c"}));
  EXPECT_EQ(Hits("name:\"a b c\""), Names());
  EXPECT_EQ(Hits("name:\"my rep\"*"), Names({"my report.pdf"}));
  EXPECT_EQ(Hits("name:\"*b  c\""), Names({"a b  c"}));
}

// Composed and parted accents, wide and narrow letters, ligatures, voiced kana, parted syllables.
TEST_F(QueryWordsTest, FormsOfALetterAreOne) {
  const std::vector<Names> forms = {
      {"caf\u00e9", "cafe\u0301", "CAF\u00c9", "cafe", "\uff43\uff41\uff46\uff45"},
      {"\ufb01ne", "fine", "FINE"},
      {"\u30ac\u30b9", "\u30ab\u3099\u30b9"},
      {"\ud55c\uae00", "\u1112\u1161\u11ab\u1100\u1173\u11af"},
      {"stra\u00dfe", "STRASSE"},
  };
  for (size_t i = 0; i < forms.size(); ++i) {
    for (size_t j = 0; j < forms[i].size(); ++j) {
      Store({{std::to_string(i) + "-" + std::to_string(j) + "-" + forms[i][j] + ".txt",
              TextContent("x")},
             {std::to_string(i) + "+" + std::to_string(j) + ".txt", TextContent(forms[i][j])}});
    }
  }
  question.limit = 100;
  for (const Names& group : forms) {
    for (const std::string& form : group) {
      EXPECT_EQ(Hits(form).size(), group.size() * 2) << form;
      EXPECT_EQ(Hits("name:" + form).size(), group.size()) << form;
      EXPECT_EQ(Hits("name:*" + form + "*").size(), group.size()) << form;
      EXPECT_EQ(Hits("text:" + form).size(), group.size()) << form;
    }
  }
}

TEST_F(QueryWordsTest, NamesWithoutBlanksAreFoundByTheirCharacters) {
  Empty({"\u6771\u4eac\u65c5\u884c2024.txt", "\u4eac\u90fd.txt", "\ud55c\uad6d\uc5b4.txt",
         "x\u6771y.txt"});

  EXPECT_EQ(Sorted("\u4eac").size(), 2U);
  EXPECT_EQ(Hits("\u65c5\u884c"), Names({"\u6771\u4eac\u65c5\u884c2024.txt"}));
  EXPECT_EQ(Hits("\u6771\u4eac\u65c5\u884c"), Names({"\u6771\u4eac\u65c5\u884c2024.txt"}));
  EXPECT_EQ(Hits("\u884c\u65c5"), Names());
  EXPECT_EQ(Hits("\u6771\u884c"), Names());
  EXPECT_EQ(Sorted("\u6771").size(), 2U);
  EXPECT_EQ(Hits("\uad6d"), Names({"\ud55c\uad6d\uc5b4.txt"}));
  EXPECT_EQ(Hits("name:*\u4eac\u65c5*"), Names({"\u6771\u4eac\u65c5\u884c2024.txt"}));
  EXPECT_EQ(Hits("name:*\u90fd*"), Names({"\u4eac\u90fd.txt"}));
  EXPECT_EQ(Hits("2024"), Names({"\u6771\u4eac\u65c5\u884c2024.txt"}));
  EXPECT_EQ(Marked("\u65c5\u884c"), "\u65c5\u884c");
}

TEST_F(QueryWordsTest, NamesThatAreNotTextAreFoundByWhatIs) {
  Empty({"whale \xff.txt", "\xee\x80\x80.txt", "a\xee\x80\x80whale"});

  EXPECT_EQ(Sorted("whale").size(), 2U);
  EXPECT_EQ(Marked("name:*whale*"), "whale|whale");
  EXPECT_EQ(Hits("\xee\x80\x80"), Names());
}

// "Grüße vom Hafen", in Latin-1.
TEST_F(QueryWordsTest, MarksInNamesThatAreNotTextAreTheirBytes) {
  Empty(
      {"Gr\xfc\xdf"
       "e vom Hafen.PDF",
       "cut\xe2\x82 \xc9t\u00e9\u0301.txt"});

  EXPECT_EQ(Marked("hafen"), "Hafen");
  EXPECT_EQ(Marked("ha*"), "Ha");
  EXPECT_EQ(Marked("gr hafen"), "Gr|Hafen");
  EXPECT_EQ(Marked("name:*om*fen*"), "om|fen");
  EXPECT_EQ(Marked("name:gr*pdf"), "Gr|PDF");
  EXPECT_EQ(Marked("ext:pdf"), "PDF");
  EXPECT_EQ(Marked("path:share/gr*vom"), "share/Gr|vom");
  EXPECT_EQ(Marked("name:\"Gr\xfc\xdf"
                   "e vom Hafen.PDF\""),
            "Gr\xfc\xdf"
            "e vom Hafen.PDF");
  EXPECT_EQ(Marked("cut txt"), "cut|txt");
  EXPECT_EQ(Marked("te"), "t\u00e9\u0301");
}

TEST_F(QueryWordsTest, MarksAreTheBytesThatAnswer) {
  Empty({"Old Caf\u00e9 report.pdf"});

  EXPECT_EQ(Marked("cafe"), "Caf\u00e9");
  EXPECT_EQ(Marked("ca*"), "Ca");
  EXPECT_EQ(Marked("old report"), "Old|report");
  EXPECT_EQ(Marked("\"cafe report\""), "Caf\u00e9 report");
  EXPECT_EQ(Marked("name:*fe\u0301*ort*"), "f\u00e9|ort");
  EXPECT_EQ(Marked("name:*.pdf"), ".pdf");
  EXPECT_EQ(Marked("name:\"old cafe report.pdf\""), "Old Caf\u00e9 report.pdf");
  EXPECT_EQ(Marked("report -blue OR ext:pdf"), "report|pdf");
  EXPECT_EQ(Marked("ext:txt,PDF"), "pdf");
  EXPECT_EQ(Marked("report -ext:txt"), "report");
  EXPECT_EQ(Marked("ext:pdf name:*.pdf"), ".pdf");
  EXPECT_EQ(Marked("path:share/old*rep"), "share/Old|rep");
  EXPECT_EQ(Marked("path:CAF\u00c9"), "Caf\u00e9");
  EXPECT_EQ(Marked("report OR path:*old*nothing*"), "report") << "only half of it is there";
  EXPECT_EQ(Marked("name:*report OR old"), "Old") << "it is not at the end";
  EXPECT_EQ(Marked("name:*pdf*pdf OR old"), "Old") << "it is there once";
}

TEST_F(QueryWordsTest, SignsBesideLettersAreNoPartOfAWord) {
  Store({{"c.txt", TextContent("x")},
         {"C++ primer.txt", TextContent("x")},
         {"a.txt", TextContent("a book on C# and others")},
         {"b.txt", TextContent("written in C++")},
         {"cc.txt", TextContent("x")}});

  const Names all = {"C++ primer.txt", "a.txt", "b.txt", "c.txt"};
  for (const char* text : {"C++", "c++", "c#", "C#", "\"c++\"", "c", "(c++)", ".c"}) {
    EXPECT_EQ(Sorted(text), all) << text;
  }
  EXPECT_EQ(Sorted("text:c++"), Names({"a.txt", "b.txt"}));
  EXPECT_EQ(Sorted("name:c#"), Names({"C++ primer.txt", "c.txt"}));
  EXPECT_EQ(Sorted("name:*c++*"), Names({"C++ primer.txt"}));
  EXPECT_EQ(Sorted("c ++"), Names({"C++ primer.txt"}));
}

TEST_F(QueryWordsTest, StarsInQuotesSayNothing) {
  Store({{"reports.txt", TextContent("x")},
         {"rep.txt", TextContent("y")},
         {"a.txt", TextContent("reports of whales")},
         {"b.txt", TextContent("a rep")}});

  EXPECT_EQ(Sorted("\"rep*\""), Names({"b.txt", "rep.txt"}));
  EXPECT_EQ(Sorted("text:\"rep*\""), Names({"b.txt"}));
  EXPECT_EQ(Sorted("\"rep\"*"), Names({"a.txt", "b.txt", "rep.txt", "reports.txt"}));
  EXPECT_EQ(Marked("name:reports \"rep*\" OR name:reports"), "reports");
}

}  // namespace fileindexd
