// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/edit_distance.h"
#include "index/suggestion.h"
#include "tests/unit/index/question_fixture.h"

namespace fileindexd {

class QuerySuggestionTest : public QuestionTest {};

TEST_F(QuerySuggestionTest, SuggestionsAreWordsThatTheIndexHas) {
  Store({{"holiday plans.txt", TextContent("the computer counts invoices")}});
  Empty({"holy.txt", "\u6771\u4eac.txt"});

  EXPECT_EQ(Suggested("holidya"), "holiday");
  EXPECT_EQ(Suggested("holidys plans"), "holiday plans");
  EXPECT_EQ(Suggested("ohliday"), "holiday");
  EXPECT_EQ(Suggested("computr"), "computer") << "not the stem alone";
  EXPECT_EQ(Suggested("invocies OR xyzzyx"), "invoices OR xyzzyx");
  EXPECT_EQ(Suggested("kind:document  invocies"), "kind:document  invoices");
  EXPECT_EQ(Suggested("\"holidya\""), "\"holiday\"");
  EXPECT_EQ(Suggested("zzzzzz"), "");
  EXPECT_EQ(Suggested("ho"), "");
  EXPECT_EQ(Suggested("kind:audio holidya"), "") << "would find nothing either";
  EXPECT_EQ(Suggested("kind:audio"), "");
  EXPECT_EQ(Hits("holiday"), Names({"holiday plans.txt"}));
  EXPECT_EQ(answer.suggestion, "");
}

TEST_F(QuerySuggestionTest, SuggestionsStandInTheirPlaceBehindFieldsAndInPhrases) {
  Content book = TextContent("the computer counts invoices");
  book.texts = {{ContentField::TITLE, "Annual Report of Whales"},
                {ContentField::AUTHOR, "Herman Melville"}};
  Store({{"holiday plans.txt", book}, {"song.mp3", Tagged(ContentField::ARTIST, "Beethoven")}});
  const std::map<std::string, std::string> suggested = {
      {"title:reprot", "title:report"},
      {"author:melvile kind:document", "author:melville kind:document"},
      {"artist:beethovn", "artist:beethoven"},
      {"text:compuetr", "text:computer"},
      {"name:holidya", "name:holiday"},
      {"kind:document name:holidya compuetr", "kind:document name:holiday computer"},
      {"\"annual reprot\"", "\"annual report\""},
      {"\"anual reprot\" whales", "\"annual report\" whales"},
      {"\"\u00e4nual r\u00e9prot\"", "\"annual report\""},
      {"\"annu\u0308l  -report\"", "\"annual  -report\""},
      {"title:\"anual rep\"*", "title:\"annual rep\"*"},
      {"title:\"reprot of whales\"", "title:\"report of whales\""},
      {"holiday-palns", "holiday-plans"},
      {"name:\"holidya plans.txt\"", "name:\"holiday plans.txt\""},
      {"name:(holidya plans)", "name:(holiday plans)"},
      {"name:(holidya OR \"holidya plans.txt\")", "name:(holiday OR \"holiday plans.txt\")"},
  };
  for (const auto& [text, better] : suggested) {
    EXPECT_EQ(Suggested(text), better) << text;
    EXPECT_EQ(Hits(better).size(), 1U) << better;
  }
}

TEST_F(QuerySuggestionTest, WordsThatNothingIsNearToKeepTheirPlace) {
  Store({{"holiday plans.txt", TextContent("the computer counts")}});
  const std::map<std::string, std::string> suggested = {
      {"holidya OR xyzzyx", "holiday OR xyzzyx"},
      {"xyzzyx OR holidya", "xyzzyx OR holiday"},
      {"kind:document (xyzzyx OR compuetr)", "kind:document (xyzzyx OR computer)"},
      {"holidya OR \"compuetr xyzzyx\"", "holiday OR \"computer xyzzyx\""},
      {"holidya xyzzyx", ""},
      {"(holidya xyzzyx) OR xyzzyq", ""},
      {"xyzzyx OR xyzzyq", ""},
  };
  for (const auto& [text, better] : suggested) {
    EXPECT_EQ(Suggested(text), better) << text;
  }
}

// The index keeps stems beside the words that they stand in for. Nobody writes them.
TEST_F(QuerySuggestionTest, StemsAloneAreNotSuggested) {
  Store({{"a.txt", TextContent("Companies are happy about nothing that the happiest company has")},
         {"b.txt", TextContent("their policies: contract, contracts")}});
  const std::map<std::string, std::string> suggested = {
      {"compny", "company"},
      {"text:compny", "text:company"},
      {"hapy", "happy"},
      {"hapi", "happy"},
      {"not", ""},
      {"noht", ""},
      {"polciy", "policies"},
      {"polcies", "policies"},
      {"nothng", "nothing"},
      {"contrat", "contract"},
  };
  for (const auto& [text, better] : suggested) {
    EXPECT_EQ(Suggested(text), better) << text;
  }
}

TEST_F(QuerySuggestionTest, WordsThatStandElsewhereAreNotSuggested) {
  Content book = TextContent("the computer counts invoices");
  book.texts = {{ContentField::TITLE, "Annual Report of Whales"}};
  Store({{"holiday plans.txt", book}});
  for (const char* text :
       {"title:compuetr", "author:reprot", "name:invocies", "text:reprot", "text:holidya",
        "\"report annual\"", "\"reprot annual\"", "title:\"anual xyzzyx\"", "name:\"holidya\"",
        "title:rerp*", "kind:audio title:reprot"}) {
    EXPECT_EQ(Suggested(text), "") << text;
  }
}

TEST_F(QuerySuggestionTest, OfWordsAsNearAsEachOtherTheMostFrequentIsSuggestedThenTheFirst) {
  Store({{"a.txt", TextContent("abcdefgoz abcdefgozh")},
         {"b abcdefgoz.txt", TextContent("abcdefgoz abcdefguz")},
         {"c abcdefgoa.txt", TextContent("abcdefgoqh")}});
  EXPECT_EQ(Suggested("text:abcdefgh"), "text:abcdefgoz");
  EXPECT_EQ(Suggested("name:abcdefgh"), "name:abcdefgoa");

  Store({{"d.txt", TextContent("abcdefgozh abcdefgoqh")},
         {"e.txt", TextContent("abcdefgozh abcdefgoqh")}});
  EXPECT_EQ(Suggested("text:abcdefgh"), "text:abcdefgoqh");
}

TEST_F(QuerySuggestionTest, WordsThatStandTogetherAreSuggestedBeforeMoreFrequentOnes) {
  Store({{"a.txt", TextContent("a white whale")},
         {"b.txt", TextContent("the wheel, a brown shale")},
         {"c.txt", TextContent("one wheel")},
         {"d.txt", TextContent("two kinds of whirl, wheal and whaer")}});
  EXPECT_EQ(Suggested("whael"), "wheel");
  EXPECT_EQ(Suggested("white whael"), "white whale");
  EXPECT_EQ(Suggested("\"white whael\""), "\"white whale\"");
  EXPECT_EQ(Suggested("whiet whael"), "white whale");
  EXPECT_EQ(Suggested("kinds whael"), "kinds whaer");
  EXPECT_EQ(Suggested("brown white whael"), "") << "no text has them all";
}

// Names and texts have words of their own: one that both have is one all the same, as frequent as
// it is where it is more frequent.
TEST_F(QuerySuggestionTest, AWordThatSeveralVocabulariesHaveStandsForOne) {
  Store({{"whaeb.txt", TextContent("whaeb")},
         {"whaeb 2.txt", TextContent("whaeb")},
         {"whaem.txt", TextContent("whaem")},
         {"whaem 2.txt", TextContent("whaem")},
         {"a.txt", TextContent("a white whaek")},
         {"tower.txt", TextContent("tower")},
         {"tower 2.txt", TextContent("towed")},
         {"tower 3.txt", TextContent("towed")}});
  EXPECT_EQ(Suggested("white whael"), "white whaek");
  EXPECT_EQ(Suggested("towex"), "tower");
}

TEST_F(QuerySuggestionTest, OnlyTheFirstWaysToPutNearWordsTogetherAreTried) {
  std::map<std::string, Content> files;
  for (const char* word : {"harb", "quay"}) {
    for (int rank = 0; rank < 4; ++rank) {
      for (int times = rank; times < 5; ++times) {
        const std::string text = word + std::string(1, static_cast<char>('a' + rank));
        files[text[0] + std::to_string(rank) + std::to_string(times) + ".txt"] = TextContent(text);
      }
    }
  }
  files["last.txt"] = TextContent("harbd quayd");
  Store(files);
  EXPECT_EQ(Suggested("harbx quayx"), "");
  Store({{"sixth.txt", TextContent("harbc quaya")}});
  EXPECT_EQ(Suggested("harbx quayx"), "harbc quaya");
}

// Here the stem is a word too, and the more frequent one.
TEST_F(QuerySuggestionTest, WordsThatOthersGoOnFromAreSuggestedWhereTheyAreTheMostFrequent) {
  Store({{"a.txt", TextContent("The carp is old")},
         {"b.txt", TextContent("A carp, a pike")},
         {"c.txt", TextContent("Two carps")}});
  EXPECT_EQ(Suggested("text:cars"), "text:carp");
}

// Each costs a look through the vocabularies.
TEST_F(QuerySuggestionTest, QuestionsFullOfSlipsGetNoSuggestion) {
  std::string text;
  std::string slips;
  for (char c = 'a'; c < 'a' + 11; ++c) {
    const std::string word = std::string(3, c) + "xyz";
    text += (text.empty() ? "" : " ") + word;
    slips += (slips.empty() ? "" : " ") + word.substr(0, 5);
  }
  Store({{"a.txt", TextContent(text)}});

  EXPECT_EQ(Suggested("\"" + slips + "\""), "");
  const size_t last = slips.rfind(' ');
  EXPECT_EQ(Suggested("\"" + slips.substr(0, last) + "\""),
            "\"" + text.substr(0, text.rfind(' ')) + "\"");
}

// Composed or parted, in the question or on disk: an accent is no slip.
TEST_F(QuerySuggestionTest, SuggestionsAreThoseOfTheLettersWithoutAccents) {
  Store({{"\u00dcberweisung.txt", TextContent("die Geb\u00fchren")},
         {"Re\u0301sume\u0301.txt", TextContent("\u041c\u043e\u0441\u043a\u0432\u0430")}});

  for (const char* slip : {"\u00fcberwiesung", "u\u0308berwiesung", "uberwiesung",
                           "\u00dcBERWIESUNG", "\u00fcberweisnug", "u\u0308berweisnug"}) {
    EXPECT_EQ(Suggested(slip), "uberweisung") << slip;
  }
  for (const char* slip : {"geb\u00fcrhen", "gebu\u0308rhen"}) {
    EXPECT_EQ(Suggested(slip), "gebuhren") << slip;
  }
  EXPECT_EQ(Suggested("r\u00e9smu\u00e9"), "resume");
  EXPECT_EQ(Suggested("re\u0301smue\u0301"), "resume");
  EXPECT_EQ(Suggested("\u043c\u043e\u0441\u043a\u0430\u0432"),
            "\u043c\u043e\u0441\u043a\u0432\u0430");
  EXPECT_EQ(Sorted("uberweisung"), Names({"\u00dcberweisung.txt"}));
}

TEST_F(QuerySuggestionTest, WordsThatLookLikeFieldsAreToldWhereNothingIsFound) {
  Store({{"holiday type:pdf.txt", TextContent("x")}});
  const std::map<std::string, std::string> told = {
      {"type:doc", "type:doc"},
      {"exr:pdf", "exr:pdf"},
      {"nothing (type:doc OR colour:red)", "type:doc"},
      {"nothing OR colour:red", "colour:red"},
      {"holidya type:pdf", ""},  // a suggestion says more
      {"type:pdf", ""},          // is found
      {"nothing", ""},
      {"nothing -type:doc", ""},
      {"\"type:doc\"", ""},
      {"name:type:doc", ""},
      {"fs::path", ""},
      {"http://x", ""},
      {"x:y", ""},
      {"12:30", ""},
      {"type: nothing", ""},
  };
  for (const auto& [text, word] : told) {
    (void)Hits(text);
    EXPECT_EQ(answer.word_like_field, word) << text;
  }
}

TEST_F(QuerySuggestionTest, WhatMayBeMeantForAnOperatorIsTold) {
  Store({{"holiday plans.txt", TextContent("this or that")}});
  question.kind = Kind::DOCUMENT;
  const std::map<std::string, std::string> told = {
      {"nothing or plans", "or"},
      {"nothing Or plans", "Or"},
      {"nothing and plans or x", "and"},
      {"nothing not plans", "not"},
      {"not nothing", "not"},
      {"x OR (nothing or y)", "or"},
      {"name:(nothing or plans)", "or"},
      {"holidya or nothing", "or"},
      {"holiday or that", ""},  // is found
      {"nothing or", ""},
      {"or nothing", ""},
      {"nothing not", ""},
      {"nothing \"or\" plans", ""},
      {"nothing name:or plans", ""},
      {"nothing orphans plans", ""},
      {"nothing", ""},
  };
  for (const auto& [text, word] : told) {
    (void)Hits(text);
    EXPECT_EQ(answer.small_operator, word) << text;
  }
}

TEST_F(QuerySuggestionTest, DistanceCountsSlips) {
  EXPECT_EQ(EditDistance("abc", "abc", 2), 0);
  EXPECT_EQ(EditDistance("abc", "acb", 2), 1);
  EXPECT_EQ(EditDistance("abc", "ab", 2), 1);
  EXPECT_EQ(EditDistance("abc", "xbc", 2), 1);
  EXPECT_EQ(EditDistance("abc", "abxc", 2), 1);
  EXPECT_EQ(EditDistance("abcd", "badc", 2), 2);
  EXPECT_EQ(EditDistance("abc", "xyz", 2), 3);
  EXPECT_EQ(EditDistance("\u00fcb", "\u00e4b", 2), 1);
  EXPECT_EQ(EditDistance("", "ab", 1), 2);
  EXPECT_EQ(EditDistance("", "", 1), 0);
}

}  // namespace fileindexd
