// SPDX-License-Identifier: GPL-2.0-or-later
#include <filesystem>

#include "base/utf8.h"
#include "index/contents_reader.h"
#include "index/search.h"
#include "state/layout.h"
#include "tests/unit/index/contents_fixture.h"

namespace fileindexd {

class ContentSearchTest : public ContentsTest {
 protected:
  // Files with these texts, read.
  void Stored(const std::vector<std::pair<std::string, std::string>>& files) {
    for (const auto& [name, text] : files) {
      WriteFile(At(name), name);
      Add(name);
    }
    Commit();
    TakeIn();
    Jobs();
    for (const auto& [name, text] : files) {
      Finish(name, text);
    }
  }
};

TEST_F(ContentSearchTest, EachWordMayStandInNameOrContent) {
  Stored({{"report.txt", "blue whales swim"},
          {"notes.txt", "the report says blue"},
          {"whale.txt", "nothing of it"},
          {"blue report.txt", "green"}});

  EXPECT_EQ(Sorted("whales"), Names({"report.txt"}));
  EXPECT_EQ(Sorted("blue report"), Names({"blue report.txt", "notes.txt", "report.txt"}));
  EXPECT_EQ(Sorted("report swim"), Names({"report.txt"}));
  EXPECT_EQ(Sorted("swim report"), Names({"report.txt"}));
  EXPECT_EQ(Sorted("whale nothing"), Names({"whale.txt"}));
  EXPECT_EQ(Sorted("blue green notes"), Names());
  EXPECT_EQ(Sorted("txt blue report says"), Names({"notes.txt"}));
  EXPECT_EQ(answer.total, 1U);
  EXPECT_EQ(answer.failures, Names());
}

TEST_F(ContentSearchTest, NamesStandAboveContents) {
  Stored({{"old whale song.txt", "x"}, {"a.txt", "whale whale whale"}, {"b.txt", "a whale once"}});

  EXPECT_EQ(Hits("whale"), Names({"old whale song.txt", "a.txt", "b.txt"}));
  EXPECT_EQ(answer.total, 3U);
  EXPECT_GE(answer.hits[0].score, 1);
  EXPECT_LT(answer.hits[1].score, 1);
}

TEST_F(ContentSearchTest, NameHitIsOneHitWhateverItsContentHolds) {
  Stored({{"whale.txt", "whale"}});

  EXPECT_EQ(Hits("whale"), Names({"whale.txt"}));
  EXPECT_EQ(answer.total, 1U);
}

TEST_F(ContentSearchTest, TitlesCountMoreThanText) {
  Stored({{"a.txt", "x"}, {"b.txt", "x"}});
  File("a.txt", "again a");
  File("b.txt", "again b");
  ASSERT_EQ(Jobs().size(), 2U);
  Content titled = TextContent("of the sea");
  titled.texts = {{ContentField::TITLE, "Whales"}, {ContentField::AUTHOR, "Herman"}};
  ASSERT_TRUE(contents->Finish(JobOf("a.txt").file, titled));
  Finish("b.txt", "whales of the sea");

  EXPECT_EQ(Hits("whales"), Names({"a.txt", "b.txt"}));
  EXPECT_EQ(Hits("herman"), Names({"a.txt"}));
  EXPECT_EQ(answer.hits[0].snippet.text, "Herman");
}

TEST_F(ContentSearchTest, UnwantedAndChangedContentsDoNotMatch) {
  Stored({{"a.txt", "secret one"}, {"b.txt", "secret two"}});
  ASSERT_EQ(Sorted("secret"), Names({"a.txt", "b.txt"}));

  ContentFlags none;
  EXPECT_TRUE(writer->Refresh(At("a.txt"), none, {true, true, true, true}));
  WriteFile(At("b.txt"), "other bytes");
  Add("b.txt");
  Commit();

  EXPECT_EQ(Hits("secret"), Names()) << "before anybody took it in";
}

TEST_F(ContentSearchTest, KindAndFolderNarrow) {
  MakeFolder(At("d"));
  Add("d");
  Stored({{"d/a.txt", "whale"}, {"b.txt", "whale"}, {"plain", "whale"}});

  question.under = At("d");
  EXPECT_EQ(Hits("whale"), Names({"d/a.txt"}));
  question.under.clear();
  question.kind = Kind::DOCUMENT;
  EXPECT_EQ(Sorted("whale"), Names({"b.txt", "d/a.txt", "plain"}));
  EXPECT_EQ(Hits("plain"), Names({"plain"})) << "its kind was found inside";
  question.kind = Kind::OTHER;
  EXPECT_EQ(Hits("plain"), Names());
  question.kind = Kind::AUDIO;
  EXPECT_EQ(Hits("whale"), Names());
}

TEST_F(ContentSearchTest, SignsMustStandInTheName) {
  Stored({{"c++.txt", "whale"}, {"d.txt", "whale ++"}});

  EXPECT_EQ(Hits("whale ++"), Names({"c++.txt"}));
}

TEST_F(ContentSearchTest, AnyQuestionIsAnsweredOrRefusedInOneLine) {
  Stored({{"a.txt", "near or and not a b \u4e2d\u6587"}});
  for (const char* text : {"\"",      "\"\" a",   "( a",      "name:x",  "a NEAR b",
                           "NEAR(",   "a OR",     "NOT",      "AND",     "^a",
                           "-a",      "{name}",   "a + b",    "\\ b",    "a;",
                           "--a",     "a\"b",     "\"a",      "a\"",     "* a",
                           "a* b*",   "\xff\xfe", "\xc3 a",   "\u4e2d",  "\u6587 \u4e2d*",
                           "\u00b2",  "\u3099",   "\u3099 a", "a\u0301", "_",
                           "_ a",     "__",       "a_",       "..",      "1.",
                           "\u00ad a"}) {
    question.text = text;
    question.shares = {"s"};
    std::string error;
    if (!Ask(question, answer, error)) {
      EXPECT_FALSE(error.empty()) << text;
      EXPECT_EQ(error.find('\n'), std::string::npos) << error;
      continue;
    }
    EXPECT_EQ(answer.failures, Names()) << text;
  }
  EXPECT_EQ(Hits("\u6587"), Names({"a.txt"}));
  EXPECT_EQ(Hits("near not"), Names({"a.txt"}));
}

TEST_F(ContentSearchTest, SnippetShowsTheWordsInOneLine) {
  std::string text;
  for (int i = 0; i < 2000; ++i) {
    text += "filler ";
  }
  Stored({{"a.txt", text + "the\nblue\twhales swim " + text}});

  ASSERT_EQ(Hits("whale blue"), Names({"a.txt"}));
  const Snippet& snippet = answer.hits[0].snippet;
  EXPECT_NE(snippet.text.find("the blue whales swim"), std::string::npos) << snippet.text;
  EXPECT_LT(snippet.text.size(), 250U);
  Names marked;
  for (const Snippet::Mark& mark : snippet.marks) {
    marked.push_back(snippet.text.substr(mark.start, mark.end - mark.start));
  }
  EXPECT_EQ(marked, Names({"blue", "whales"}));
}

TEST_F(ContentSearchTest, SnippetsAreValidUtf8) {
  std::string text;
  for (int i = 0; i < 400; ++i) {
    text += "\u4e2d\u6587\U00020000";
  }
  for (int shift = 0; shift < 4; ++shift) {
    Stored({{"a" + std::to_string(shift) + ".txt",
             std::string(static_cast<size_t>(shift), 'x') + text + "\u9be8" + text}});
  }
  ASSERT_EQ(Hits("\u9be8").size(), 4U);
  for (const Hit& hit : answer.hits) {
    EXPECT_FALSE(hit.snippet.text.empty());
    EXPECT_TRUE(IsUtf8(hit.snippet.text));
  }
}

TEST_F(ContentSearchTest, BestOfVeryManyAreFound) {
  std::vector<std::pair<std::string, std::string>> files;
  for (int i = 0; i < 30; ++i) {
    files.emplace_back("f" + std::to_string(i), i == 17 ? "whale whale whale" : "a whale here");
  }
  Stored(files);

  question.limit = 1;
  EXPECT_EQ(Hits("whale"), Names({"f17"}));
  EXPECT_EQ(answer.total, 30U);
  question.count_all = false;
  EXPECT_EQ(Hits("whale"), Names({"f17"}));
}

TEST_F(ContentSearchTest, SecondLinkIsAHitOfItsOwn) {
  Stored({{"a.txt", "whale"}});
  std::filesystem::create_hard_link(At("a.txt"), At("b.txt"));
  Add("b.txt");
  Commit();

  EXPECT_EQ(Sorted("whale"), Names({"a.txt", "b.txt"}));
}

TEST_F(ContentSearchTest, ShareWithoutContentsAnswersByNames) {
  Stored({{"whale.txt", "x"}});
  contents.reset();
  RemoveTree(ContentsPath("s"));

  EXPECT_EQ(Hits("whale"), Names({"whale.txt"}));
  EXPECT_EQ(answer.failures, Names());
}

TEST_F(ContentSearchTest, BrokenContentsDoNotHideNames) {
  Stored({{"whale.txt", "x"}});
  contents.reset();
  question.shares = {"s"};
  const std::string file = ContentsPath("s") + "/contents.db";
  std::filesystem::remove(file + "-wal");
  WriteFile(file, std::string(9000, 'x'));

  EXPECT_EQ(Paths("whale"), Names({At("whale.txt")}));
  ASSERT_EQ(answer.failures.size(), 1U);
  EXPECT_NE(answer.failures[0].find("share s: contents: "), std::string::npos)
      << answer.failures[0];

  std::filesystem::remove(file);
  std::filesystem::create_directory(file);
  EXPECT_EQ(Paths("whale"), Names({At("whale.txt")}));
}

TEST_F(ContentSearchTest, ChangedLanguageMakesTheWordsAnew) {
  std::vector<std::pair<std::string, std::string>> files;
  for (int i = 0; i < 20; ++i) {
    files.emplace_back("f" + std::to_string(i), "viele H\u00e4user");
  }
  Stored(files);
  ASSERT_EQ(Hits("haus"), Names());
  ASSERT_TRUE(store->SetShareLanguage("s", "german")) << store->Error();
  OpenContents();
  TakeIn();

  EXPECT_EQ(Hits("haus").size(), 20U);
  File("f3", "other bytes");
  ASSERT_EQ(Jobs(), Names({"f3"}));
  Finish("f3", "ein Haus");
  EXPECT_EQ(Hits("hauser").size(), 20U);
  EXPECT_EQ(Holding("viele"), 19);
}

TEST_F(ContentSearchTest, ReaderTellsStatesAndCounts) {
  Stored({{"a.txt", "whale"}});
  File("b.txt");
  File("c.txt");
  ASSERT_EQ(Jobs(1).size(), 1U);
  const std::string failed = handed.contains("c.txt") ? "c.txt" : "b.txt";
  Content half = TextContent("half");
  half.texts = {{ContentField::TITLE, "T"}};
  half.numbers = {{ContentField::PAGES, 7}, {ContentField::RATING, 0}};
  ASSERT_TRUE(contents->Fail(JobOf(failed).file, "damaged", half, false));
  ASSERT_TRUE(contents->Commit());

  ContentsReader reader;
  ASSERT_EQ(reader.Open("s"), IndexError::NONE);
  ContentCounts counts;
  ASSERT_TRUE(reader.Count(counts));
  EXPECT_EQ(counts.all.waiting, 1U);
  EXPECT_EQ(counts.all.failed, 1U);
  EXPECT_EQ(counts.kinds[1].done, 1U);
  EXPECT_EQ(counts.done_last_minute, 1U);
  const std::vector<FailedContent> listed = Listed();
  ASSERT_EQ(listed.size(), 1U);
  EXPECT_EQ(listed[0].path + " " + listed[0].reason, At(failed) + " damaged");

  StoredContent stored;
  ASSERT_EQ(reader.Find(ContentsTest::Find(failed), stored), IndexError::NONE);
  EXPECT_EQ(stored.state + " " + stored.reason, "failed damaged");
  const Content& content = stored.content;
  ASSERT_EQ(content.texts.size(), 1U);
  EXPECT_EQ(content.texts[0].text, "T");
  ASSERT_EQ(content.numbers.size(), 2U);
  EXPECT_EQ(content.numbers[0].number, 7);
  EXPECT_EQ(content.numbers[1].field, ContentField::RATING);
  EXPECT_EQ(content.text, "half");
}

}  // namespace fileindexd
