// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/snippet.h"

#include <gtest/gtest.h>

#include <random>
#include <set>

#include "base/content.h"
#include "index/query.h"
#include "index/text_tokenizer.h"

namespace fileindexd {

namespace {

constexpr size_t SHOWN = 120;  // bytes from the first shown word on, in which all others end

struct Text {
  std::string text;
  std::vector<Snippet::Mark> places;  // of the words that are asked for
  std::vector<std::string> words;     // at those places
};

// No two fillers are the same, so a part of it is found again in one place alone.
Text MakeText(std::mt19937& random, size_t words, const char* between) {
  constexpr const char* ASKED[] = {"alpha", "beta", "gamma"};
  std::uniform_int_distribution<size_t> kind(0, 20);
  Text made;
  for (size_t i = 0; i < words; ++i) {
    const size_t chosen = kind(random);
    const std::string word = chosen < 3 ? ASKED[chosen] : "w" + std::to_string(1000 + i);
    if (chosen < 3) {
      made.places.push_back({made.text.size(), made.text.size() + word.size()});
      made.words.push_back(word);
    }
    made.text += word + between;
  }
  return made;
}

// The first place from which on most different words are shown.
size_t BestPlace(const Text& text) {
  size_t best = 0;
  size_t most = 0;
  for (size_t i = 0; i < text.places.size(); ++i) {
    std::set<std::string> shown;
    for (size_t j = i; j < text.places.size(); ++j) {
      if (text.places[j].end < text.places[i].start + SHOWN) {
        shown.insert(text.words[j]);
      }
    }
    best = shown.size() > most ? i : best;
    most = std::max(most, shown.size());
  }
  return best;
}

// The parameter is the number of words in a text.
class SnippetTest : public testing::TestWithParam<size_t> {
 protected:
  Snippet Make(const std::string& text) {
    QueryNode nodes[3];
    std::vector<const QueryNode*> words;
    constexpr const char* ASKED[] = {"alpha", "beta", "gamma"};
    for (size_t i = 0; i < 3; ++i) {
      nodes[i].text = ASKED[i];
      words.push_back(&nodes[i]);
    }
    Content content;
    content.text = text;
    return MakeSnippet(content, words, cutter);
  }

  TextCutter cutter{NO_LANGUAGE};
};

TEST_P(SnippetTest, FirstPlaceWithMostWordsIsShownWithAllThatStandThere) {
  std::mt19937 random(20);
  for (int round = 0; round < 200; ++round) {
    // Between blanks words are whole at both ends, elsewhere one may be cut.
    const Text text = MakeText(random, GetParam(), round % 2 == 0 ? " " : ",");
    const Snippet snippet = Make(text.text);
    ASSERT_EQ(snippet.text.empty(), text.places.empty());
    if (text.places.empty()) {
      continue;
    }
    const size_t at = text.text.find(snippet.text);
    const Snippet::Mark& best = text.places[BestPlace(text)];
    ASSERT_NE(at, std::string::npos);
    EXPECT_LE(at, best.start);
    EXPECT_GE(at + 40, best.start);

    std::vector<size_t> marked;
    for (const Snippet::Mark& mark : snippet.marks) {
      marked.push_back(at + mark.start);
    }
    std::vector<size_t> standing;
    for (const Snippet::Mark& place : text.places) {
      if (place.start >= at && place.end <= at + snippet.text.size()) {
        standing.push_back(place.start);
      }
    }
    EXPECT_EQ(marked, standing) << text.text;
  }
}

class SnippetMarksTest : public testing::Test {
 protected:
  // What is marked.
  std::vector<std::string> Marked(const std::vector<std::string>& words, const std::string& text) {
    std::vector<QueryNode> nodes(words.size());
    std::vector<const QueryNode*> asked;
    for (size_t i = 0; i < words.size(); ++i) {
      nodes[i].text = words[i];
      asked.push_back(&nodes[i]);
    }
    Content content;
    content.text = text;
    const Snippet snippet = MakeSnippet(content, asked, cutter);
    std::vector<std::string> marked;
    for (const Snippet::Mark& mark : snippet.marks) {
      marked.push_back(snippet.text.substr(mark.start, mark.end - mark.start));
    }
    return marked;
  }

  TextCutter cutter{"english"};
};

using Texts = std::vector<std::string>;

TEST_F(SnippetMarksTest, OneCharacterInPartsMarksThePairThatItBegins) {
  EXPECT_EQ(Marked({"\u1100\u116e\u11a8"}, "abc \uad6d\uc5b4 def"), Texts({"\uad6d\uc5b4"}));
}

TEST_F(SnippetMarksTest, OfAPhraseOnlyWholeOnesAreMarked) {
  EXPECT_EQ(Marked({"white whale"}, "A White fur. The white whales, and a whale of white."),
            Texts({"white", "whales"}));
  EXPECT_EQ(Marked({"white whale"}, "white white whale whale"), Texts({"white", "whale"}));
  EXPECT_EQ(Marked({"white whale"}, "a white whale, or a white whale"),
            Texts({"white", "whale", "white", "whale"}));
  EXPECT_EQ(Marked({"white-whale"}, "white; white/whale"), Texts({"white", "whale"}));
  EXPECT_EQ(Marked({"white whale", "white"}, "a white coat, a whale, a white whale"),
            Texts({"white", "white", "whale"}))
      << "what is asked for alone is marked there, too";
  EXPECT_EQ(Marked({"white whale"}, "a white coat, a whale"), Texts({"white", "whale"}))
      << "it stands further down";
  EXPECT_EQ(Marked({"new york new york"}, "new new york new york, york"),
            Texts({"new", "york", "new", "york"}));
  EXPECT_EQ(Marked({"very very"}, "a very very very old, very old"),
            Texts({"very", "very", "very"}));
  EXPECT_EQ(Marked({"white whale", "whale"}, "white"), Texts({"white"}));
}

TEST_F(SnippetMarksTest, APhraseIsShownThatStandsFarBehindItsWords) {
  std::string text = "Whale hunters wore white clothes, ";
  for (int word = 0; word < 1000; ++word) {
    text += "white " + std::to_string(word) + " ";
  }
  EXPECT_EQ(Marked({"white whale"}, text + "and then the white whale came."),
            Texts({"white", "whale"}));
}

TEST_F(SnippetMarksTest, APhraseOfWhichNoWholeOneIsReadIsShownByItsWords) {
  std::string text = "Whale hunters wore white clothes, ";
  text.append(1 << 18, '.');
  EXPECT_EQ(Marked({"white whale"}, text + "white whale"), Texts({"Whale", "white"}));
}

INSTANTIATE_TEST_SUITE_P(Lengths, SnippetTest, testing::Values(5, 50, 200));

}  // namespace

}  // namespace fileindexd
