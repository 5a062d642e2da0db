// SPDX-License-Identifier: GPL-2.0-or-later
// Answers as a whole: pages, failures, suggestions, reasons.
#include <filesystem>

#include "index/asked.h"
#include "index/asked_share.h"
#include "index/name_marker.h"
#include "state/layout.h"
#include "tests/unit/index/question_fixture.h"

namespace fileindexd {

class QueryAnswersTest : public QuestionTest {};

TEST_F(QueryAnswersTest, ReversedPagesBeginWithTheWorst) {
  Names names;
  for (int i = 0; i < 700; ++i) {
    names.push_back((i % 7 == 0 ? "x " : "a x ") + std::to_string(i));
  }
  Fill("a", names);
  question.shares = {"a"};
  question.limit = 1000;
  question.reverse = true;
  const Names whole = Paths("x");
  ASSERT_EQ(whole.size(), names.size());
  ASSERT_TRUE(whole.front().starts_with("/a/a x")) << whole.front();
  ASSERT_TRUE(whole.back().starts_with("/a/x")) << whole.back();

  question.limit = 10;
  for (const uint64_t offset : {0, 10, 350, 690}) {
    question.offset = offset;
    const auto first = whole.begin() + static_cast<std::ptrdiff_t>(offset);
    EXPECT_EQ(Paths("x"), Names(first, first + 10)) << offset;
  }
}

TEST_F(QueryAnswersTest, PagesOfContentsKeepTheirOrder) {
  std::map<std::string, Content> files;
  for (int i = 0; i < 650; ++i) {
    Content content;
    for (int times = 0; times <= i % 5; ++times) {
      content.text += "whale ";
    }
    content.text += std::string(static_cast<size_t>(i % 11) * 40, '.') + " end";
    if (i % 90 == 0) {
      content.texts.push_back({ContentField::TITLE, "whale"});
    }
    files.emplace("f" + std::to_string(i), content);
    if (files.size() == 65) {
      Store(files);
      files.clear();
    }
  }
  question.count_all = false;
  question.limit = 1000;
  const Names whole = Hits("whale");
  ASSERT_EQ(whole.size(), 650U);

  question.limit = 50;
  Names pages;
  for (question.offset = 0; question.offset < 650; question.offset += 50) {
    const Names page = Hits("whale");
    pages.insert(pages.end(), page.begin(), page.end());
  }
  EXPECT_EQ(pages, whole);
}

// However many of the others there are, and though they are come upon first.
TEST_F(QueryAnswersTest, TextsStandAboveWhatAnswersByItsAttributesOnEachPage) {
  std::map<std::string, Content> files;
  for (int i = 0; i < 500; ++i) {
    files.emplace("f" + std::to_string(i) + ".txt", TextContent("whale"));
    if (files.size() == 50) {
      Store(files);
      files.clear();
    }
  }
  Names others;
  for (int i = 0; i < 200; ++i) {
    others.push_back("f" + std::to_string(i) + ".md");
  }
  Empty(others);
  question.count_all = false;
  question.limit = 1000;
  const Names whole = Hits("whale OR ext:md");
  ASSERT_EQ(whole.size(), 700U);
  EXPECT_TRUE(whole[499].ends_with(".txt")) << whole[499];

  question.limit = 20;
  for (question.offset = 0; question.offset < 700; question.offset += 20) {
    const auto first = whole.begin() + static_cast<std::ptrdiff_t>(question.offset);
    EXPECT_EQ(Hits("whale OR ext:md"), Names(first, first + 20)) << question.offset;
  }
}

TEST_F(QueryAnswersTest, ANameThatAnswersAloneStandsAboveOthersWhateverItsContentHolds) {
  Content content;
  content.text = "an invoice";
  Store({{"budget.xlsx", content}, {"old draft budget copy.xlsx", {}}});

  EXPECT_EQ(Hits("budget OR invoice"), Names({"budget.xlsx", "old draft budget copy.xlsx"}));
}

// What its text alone makes an answer stands behind those whose names are one, though a part of the
// question is in its name.
TEST_F(QueryAnswersTest, TextsBesideAPieceOfTheNameKeepTheirPages) {
  Store({{"k.txt", TextContent("whale")},
         {"k first.md", TextContent("x")},
         {"k second.md", TextContent("x")},
         {"k third.md", TextContent("x")},
         {"other.txt", TextContent("whale")}});
  question.count_all = false;
  const Names whole = Hits("(ext:md OR whale) -(-name:*k*)");
  ASSERT_EQ(whole.size(), 4U);
  EXPECT_EQ(whole.back(), "k.txt");

  question.limit = 2;
  EXPECT_EQ(Hits("(ext:md OR whale) -(-name:*k*)"), Names(whole.begin(), whole.begin() + 2));
  question.offset = 2;
  EXPECT_EQ(Hits("(ext:md OR whale) -(-name:*k*)"), Names(whole.begin() + 2, whole.end()));
}

TEST_F(QueryAnswersTest, NoQuestionHoldsAZero) {
  question.shares = {"a"};
  question.text = std::string("\"a\0b\"", 5);
  std::string error;

  EXPECT_FALSE(Ask(question, answer, error));
  EXPECT_NE(error.find("(character 3"), std::string::npos) << error;
}

TEST_F(QueryAnswersTest, SharesAreMergedInOneOrder) {
  Fill("b", {"x one", "x", "y x"});
  Fill("a", {"x two", "x", "x y"});
  question.shares = {"b", "a"};

  EXPECT_EQ(Paths("x").size(), 6U);
  EXPECT_EQ(answer.total, 6U);
  EXPECT_EQ(answer.hits[0].entry.path, "/a/x");
  EXPECT_EQ(answer.hits[1].entry.path, "/b/x");
  const Names all = Paths("x");
  Names pages;
  question.limit = 2;
  for (question.offset = 0; question.offset < 6; question.offset += 2) {
    const Names page = Paths("x");
    pages.insert(pages.end(), page.begin(), page.end());
  }
  EXPECT_EQ(pages, all);
}

TEST_F(QueryAnswersTest, BrokenShareIsNamedAndTheOthersAnswer) {
  Fill("a", {"x"});
  Fill("b", {"x"});
  WriteFile(IndexPath("b") + "/entries.db", std::string(9000, 'x'));
  std::filesystem::remove(IndexPath("b") + "/entries.db-wal");
  std::filesystem::create_directories(IndexPath("none"));
  question.shares = {"a", "b", "none"};

  EXPECT_EQ(Paths("x"), Names({"/a/x"}));
  ASSERT_EQ(answer.failures.size(), 2U);
  EXPECT_TRUE(answer.failures[0].starts_with("share b: ")) << answer.failures[0];
  EXPECT_TRUE(answer.failures[1].starts_with("share none: ")) << answer.failures[1];
}

TEST_F(QueryAnswersTest, HitsOfManyAreWholeEntries) {
  Names names;
  for (int i = 0; i < 500; ++i) {
    names.push_back("whale " + std::to_string(i));
  }
  Fill("a", names);
  question.shares = {"a"};
  EntryReader reader;
  ASSERT_EQ(reader.Open("a"), IndexError::NONE);
  for (const bool shows : {true, false}) {
    question.shows = shows;
    ASSERT_EQ(Paths("whale").size(), 20U);
    for (const Hit& hit : answer.hits) {
      std::optional<Entry> entry;
      ASSERT_EQ(reader.Find(hit.entry.path, entry), IndexError::NONE);
      ASSERT_TRUE(entry);
      EXPECT_EQ(hit.entry.id, entry->id);
      EXPECT_EQ(hit.entry.thing, entry->thing);
      EXPECT_EQ(hit.entry.inode, entry->inode);
      EXPECT_EQ(hit.entry.mode, entry->mode);
      EXPECT_EQ(hit.entry.written, entry->written);
    }
  }
}

TEST_F(QueryAnswersTest, ManyHitsKeepTheirPages) {
  Names names;
  for (int i = 0; i < 2500; ++i) {
    names.push_back((i % 3 == 0 ? "whale " : "a whale ") + std::to_string(i));
  }
  names.emplace_back("old whale.txt");
  names.emplace_back("whale.txt");
  names.emplace_back("whale");
  Fill("a", names);
  question.shares = {"a"};
  question.count_all = false;
  question.limit = 5000;
  const Names all = Paths("whale");
  ASSERT_EQ(all.size(), names.size());
  EXPECT_EQ(all[0], "/a/whale") << "though thousands hold the word";
  EXPECT_EQ(all[1], "/a/whale.txt");
  double before = 10;
  for (const Hit& hit : answer.hits) {
    EXPECT_LE(hit.score, before);
    before = hit.score;
  }

  question.limit = 300;
  Names pages;
  for (question.offset = 0; question.offset < names.size(); question.offset += 300) {
    const Names page = Paths("whale");
    EXPECT_EQ(answer.total, names.size());
    pages.insert(pages.end(), page.begin(), page.end());
  }
  EXPECT_EQ(pages, all);
}

TEST_F(QueryAnswersTest, ShortNamesStandAboveLongOnesThoughHundredsHoldTheWordInTheirMiddle) {
  Names names = {"the whale.txt"};
  for (int i = 0; i < 300; ++i) {
    names.push_back("a long tale of a whale " + std::to_string(i) + ".txt");
  }
  Fill("a", names);
  question.shares = {"a"};
  EXPECT_EQ(Paths("whale").front(), "/a/the whale.txt");
}

TEST_F(QueryAnswersTest, RareWordsOfNamesStandAboveCommonOnesThoughThousandsHoldThose) {
  Names names = {"a walrus there.txt"};
  for (int i = 0; i < 2500; ++i) {
    names.push_back("a whale there " + std::to_string(i));
  }
  Fill("a", names);
  question.shares = {"a"};
  for (const char* text : {"walrus OR whale", "whale OR walr*"}) {
    EXPECT_EQ(Paths(text).front(), "/a/a walrus there.txt") << text;
  }

  names = {"walrus there.txt"};
  for (int i = 0; i < 2500; ++i) {
    names.push_back("whale there " + std::to_string(i));
  }
  Fill("b", names);
  question.shares = {"b"};
  EXPECT_EQ(Paths("whale OR walrus").front(), "/b/walrus there.txt") << "all begin with a word";
}

TEST_F(QueryAnswersTest, SharesThatStayOpenShowWhatIsCommittedAndWhatIsMadeAnew) {
  Store({{"whale.txt", TextContent("sea")}});
  Asker asker;
  question.shares = {"s"};
  question.text = "whale OR sea";
  std::string error;
  ASSERT_TRUE(asker.Ask(question, answer, error)) << error;
  EXPECT_EQ(answer.total, 1U);

  Store({{"other.txt", TextContent("whale")}});
  ASSERT_TRUE(asker.Ask(question, answer, error)) << error;
  EXPECT_EQ(answer.total, 2U);
  EXPECT_EQ(answer.hits[0].snippet.text, "sea");

  contents.reset();
  RemoveTree(ContentsPath("s"));
  ASSERT_TRUE(asker.Ask(question, answer, error)) << error;
  EXPECT_EQ(answer.total, 1U);
  EXPECT_EQ(answer.failures, Names());
  question.text = "(";
  EXPECT_FALSE(asker.Ask(question, answer, error));
  question.text = "whale";
  std::filesystem::create_directories(IndexPath("none"));
  question.shares = {"s", "none"};
  ASSERT_TRUE(asker.Ask(question, answer, error)) << error;
  EXPECT_EQ(answer.total, 1U);
  EXPECT_EQ(answer.failures.size(), 1U);
}

TEST_F(QueryAnswersTest, SharesAreNamedInQuestions) {
  Fill("a", {"x one"});
  Fill("b", {"x two"});
  question.shares = {"a", "b"};

  EXPECT_EQ(Paths("x share:b"), Names({"/b/x two"}));
  EXPECT_EQ(answer.total, 1U);
  EXPECT_EQ(Paths("x -share:b"), Names({"/a/x one"}));
  EXPECT_EQ(Paths("x share:a,b").size(), 2U);
  EXPECT_EQ(Paths("share:a"), Names({"/a/x one"}));
  EXPECT_EQ(Paths("two OR share:a").size(), 2U);
  question.known = {"a", "b", "new"};
  EXPECT_EQ(Paths("x share:b,new"), Names({"/b/x two"}));
  EXPECT_EQ(Paths("x share:new"), Names());
  question.text = "x share:c";
  std::string error;
  EXPECT_FALSE(Ask(question, answer, error));
  EXPECT_EQ(error, "x share:c: there is no such share (character 3, at: share:c)");
}

TEST_F(QueryAnswersTest, ReasonsTellWhyPartByPart) {
  Content content = TextContent("call me ishmael");
  content.texts = {{ContentField::AUTHOR, "Melville"}};
  content.numbers = {{ContentField::PAGES, 300}};
  Store({{"moby call.txt", content}});

  EXPECT_EQ(Reasons("moby call.txt", "call whale OR pages:>100"),
            Names({"call: name, text", "no whale: ", "pages:>100: 300"}));
  EXPECT_TRUE(explanation.matches);
  EXPECT_EQ(Reasons("moby call.txt", "melville -ishmael"),
            Names({"melville: author", "no -ishmael: "}));
  EXPECT_FALSE(explanation.matches);
  EXPECT_EQ(Reasons("moby call.txt", "call -(whale OR x) NOT (draft AND copy)"),
            Names({"call: name, text", "-(whale OR x): ", "NOT (draft AND copy): "}));
  EXPECT_EQ(Reasons("moby call.txt", "size:>1M kind:audio name:*oby*"),
            Names({"no size:>1M: 13 bytes", "no kind:audio: document", "name:*oby*: name"}));
  EXPECT_EQ(Reasons("moby call.txt", "duration:1m near:0,0,1km"),
            Names({"no duration:1m: none", "no near:0,0,1km: none"}));
  EXPECT_EQ(Reasons("none.txt", "a"), Names({"error: not in the index: " + At("none.txt")}));
  EXPECT_EQ(Reasons("moby call.txt", "(")[0].substr(0, 6), "error:");
}

TEST_F(QueryAnswersTest, ShareThatLeavesInBetweenIsNoFailureOnceItWasOpen) {
  Fill("a", {"pair first"});
  question.text = "pair";
  Asked asked;
  NameMarker marker;
  std::string error;
  ASSERT_TRUE(asked.Read(question, marker, error));
  AskedShare share("a");
  ASSERT_EQ(share.Open(true), IndexError::NONE);
  RemoveTree(ShareFolder("a"));

  BestHits best(20, {});
  uint64_t total = 0;
  ShareRun run(share.statements, share.has_contents, question, asked, "a", marker);
  EXPECT_EQ(run.Run(best, total), SQLITE_OK);
  EXPECT_EQ(total, 1U);
}

}  // namespace fileindexd
