// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/search.h"

#include <sys/stat.h>
#include <sys/time.h>

#include <filesystem>

#include "state/layout.h"
#include "tests/unit/index/fixture.h"

namespace fileindexd {

class SearchTest : public IndexTest {
 protected:
  void Files(const Names& names) {
    for (const std::string& name : names) {
      WriteFile(At(name), "");
      timeval old[2] = {{1000, 0}, {1000, 0}};
      ASSERT_EQ(utimes(At(name).c_str(), old), 0);
    }
    AddAll();
  }

  // Names of the hits; "error" and its text when the question was refused.
  Names Hits(const std::string& text) {
    question.text = text;
    question.shares = {"s"};
    std::string error;
    if (!Ask(question, answer, error)) {
      EXPECT_FALSE(error.empty());
      return {"error"};
    }
    EXPECT_EQ(answer.failures, Names());
    Names names;
    for (const Hit& hit : answer.hits) {
      names.push_back(hit.entry.path.substr(root.size() + 1));
    }
    return names;
  }

  Question question;
  Answer answer;
};

TEST_F(SearchTest, AllWordsMustMatch) {
  Files({"annual report.pdf", "annual plan.pdf", "reporting.pdf"});

  EXPECT_EQ(Hits("report annual"), Names({"annual report.pdf"}));
  EXPECT_EQ(Hits("REPORT"), Names({"annual report.pdf"}));
  EXPECT_EQ(Hits("annual missing"), Names());
}

TEST_F(SearchTest, StarMatchesBeginnings) {
  Files({"annual report.pdf", "reporting.pdf"});

  EXPECT_EQ(Hits("rep*").size(), 2U);
  EXPECT_EQ(Hits("rep"), Names());
  EXPECT_EQ(Hits("*port"), Names({"error"}));
}

TEST_F(SearchTest, CaseAndAccentsDoNotCount) {
  Files(
      {"\xc3\x9c"
       "bung.txt",
       "u\xcc\x88"
       "bung 2.txt"});

  EXPECT_EQ(Hits("UBUNG").size(), 2U);
  EXPECT_EQ(Hits("\xc3\xbc"
                 "bung")
                .size(),
            2U);
}

TEST_F(SearchTest, NoTextReachesTheQueryLanguage) {
  Files({"near.txt", "or and not.txt", "name.txt", "a b.txt", "quote\"d.txt", "col:umn.txt"});
  for (const char* text :
       {"\"",  "\"\"", "'",  "(",      ")",     "name:x",   "a NEAR b", "NEAR(", "a OR", "NOT",
        "AND", "^a",   "-a", "{name}", "a + b", "\\",       ";",        "--",    "%",    "a\"b",
        "\"a", "a\"",  "*",  "**",     "* *",   "\xff\xfe", "\xc3",     "\x01",  ""}) {
    (void)Hits(text);  // no share fails
  }

  EXPECT_EQ(Hits("a NEAR b"), Names());
  EXPECT_EQ(Hits("^a"), Names({"a b.txt"}));
  EXPECT_EQ(Hits("{name}"), Names({"name.txt"}));
  EXPECT_EQ(Hits("a + b"), Names());
  EXPECT_EQ(Hits("name:x"), Names());
  EXPECT_EQ(Hits("col:umn"), Names({"col:umn.txt"}));
  EXPECT_EQ(Hits("quote\"d"), Names({"quote\"d.txt"}));
  EXPECT_EQ(Hits("OR"), Names({"or and not.txt"}));
  EXPECT_EQ(Hits("colour:umn"), Names());
  EXPECT_EQ(Hits("\"near\" txt"), Names({"near.txt"}));
}

TEST_F(SearchTest, SenselessQuestionsAreRefused) {
  for (const std::string& text :
       Names({"", " ", "\t\n", "\x01\x02", std::string(1, '\0'), std::string(5000, 'a'), [] {
                std::string words;
                for (int i = 0; i < 200; ++i) {
                  words += "a ";
                }
                return words;
              }()})) {
    EXPECT_EQ(Hits(text), Names({"error"})) << text;
  }
  for (const char* under : {"relative", "/a/../b", "/a/", "//a", "/a/."}) {
    question.under = under;
    EXPECT_EQ(Hits("a"), Names({"error"})) << under;
  }
}

TEST_F(SearchTest, SignsAreLookedForInTheName) {
  Files({"c++.txt", "c.txt", "+++---.txt"});

  EXPECT_EQ(Hits("++"), Names({"+++---.txt", "c++.txt"}));
  EXPECT_EQ(Hits("c ++"), Names({"c++.txt"}));
  EXPECT_EQ(Hits("+---"), Names({"+++---.txt"}));
  EXPECT_EQ(Hits("%"), Names());
}

TEST_F(SearchTest, WholeNamesStartsAndShortNamesComeFirst) {
  Files({"old blue house.txt", "blue house", "blue house.txt", "blue house in the wood.txt"});

  EXPECT_EQ(Hits("blue house"), Names({"blue house", "blue house.txt", "blue house in the wood.txt",
                                       "old blue house.txt"}));
}

TEST_F(SearchTest, YoungerStandsAboveOlderAmongEquals) {
  MakeFolder(At("x"));
  Files({"a.txt", "x/a.txt"});
  timeval young[2] = {{2000, 0}, {2000, 0}};
  ASSERT_EQ(utimes(At("x/a.txt").c_str(), young), 0);
  AddAll();

  EXPECT_EQ(Hits("a"), Names({"x/a.txt", "a.txt"}));
}

TEST_F(SearchTest, KindAndPlaceNarrowTheAnswer) {
  MakeFolder(At("a"));
  MakeFolder(At("a!b"));
  Files({"a/x.txt", "a/x.jpg", "a!b/x.txt"});

  question.kind = Kind::PHOTO;
  EXPECT_EQ(Hits("x"), Names({"a/x.jpg"}));
  question.kind = Kind::DOCUMENT;
  question.under = At("a");
  EXPECT_EQ(Hits("x"), Names({"a/x.txt"}));
  question.kind = Kind::FOLDER;
  EXPECT_EQ(Hits("a"), Names({"a"}));
}

TEST_F(SearchTest, LimitAndOffsetCutTheSameOrder) {
  Names names;
  for (int i = 0; i < 30; ++i) {
    names.push_back("n " + std::to_string(100 + i));
  }
  Files(names);
  question.limit = 0;
  EXPECT_EQ(Hits("n"), Names());
  EXPECT_EQ(answer.total, 30U);
  question.limit = 7;
  Names all;
  for (question.offset = 0; question.offset < 40; question.offset += 7) {
    const Names hits = Hits("n");
    all.insert(all.end(), hits.begin(), hits.end());
  }
  EXPECT_EQ(all, names);
  question.limit = UINT64_MAX;
  question.offset = UINT64_MAX;
  EXPECT_EQ(Hits("n"), Names());
}

TEST_F(SearchTest, ShareThatCannotBeAskedIsNamed) {
  Files({"a.txt"});
  question.text = "a";
  std::filesystem::create_directories(IndexPath("none"));
  question.shares = {"s", "none", "s"};
  std::string error;

  ASSERT_TRUE(Ask(question, answer, error));
  EXPECT_EQ(answer.total, 1U);
  ASSERT_EQ(answer.failures.size(), 1U);
  EXPECT_NE(answer.failures[0].find("none"), std::string::npos);
}

TEST_F(SearchTest, NameThatLeavesIsNotFoundAnyMore) {
  Files({"blue.txt", "+++.txt"});
  RemoveTree(At("blue.txt"));
  RemoveTree(At("+++.txt"));
  Delete("blue.txt");
  Delete("+++.txt");
  Commit();

  EXPECT_EQ(Hits("blue"), Names());
  EXPECT_EQ(Hits("+++"), Names());
}

}  // namespace fileindexd
