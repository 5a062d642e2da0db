// SPDX-License-Identifier: GPL-2.0-or-later
// What stands above what, however many answer. What people expect: query_judged_test.cpp.
#include <functional>

#include "base/utf8.h"
#include "index/asked.h"
#include "index/asked_share.h"
#include "index/name_marker.h"
#include "tests/unit/index/question_fixture.h"

namespace fileindexd {

class QueryRankingTest : public QuestionTest {};

TEST_F(QueryRankingTest, YoungerContentsStandAboveOlderOnesThatSayTheSame) {
  constexpr time_t DAY = 86400;
  const time_t now = time(nullptr);
  // Neither in the order of their names nor in that in which they are read.
  const std::vector<std::pair<std::string, time_t>> ages = {
      {"b", 400 * DAY}, {"e", 2 * DAY}, {"a", 3000 * DAY}, {"d", 30 * DAY}, {"c", 4000 * DAY}};
  for (const auto& [name, age] : ages) {
    OldFile(name, now - age);
  }
  TakeIn();
  Jobs();
  for (const auto& [name, age] : ages) {
    Finish(name, "a walrus once");
  }

  const Names order = {"e", "d", "b", "a", "c"};
  for (const char* text : {"walrus", "text:walrus", "walr*", "walrus OR nothing", "walrus once"}) {
    EXPECT_EQ(Hits(text), order) << text;
  }
}

class QueryManyTextsTest : public QuestionTest {
 protected:
  // More than are looked at closely.
  void StoreMany(int number, const std::function<Content(int)>& content_of) {
    std::map<std::string, Content> files;
    for (int i = 0; i < number; ++i) {
      files.emplace("f" + std::to_string(i), content_of(i));
      if (files.size() == 80 || i + 1 == number) {
        Store(files);
        files.clear();
      }
    }
  }

  // The numbers of FILES follow no order of their ages, i * 101 % FILES.
  void StoreManyOfAllAges() {
    constexpr time_t DAY = 86400;
    const time_t now = time(nullptr);
    for (int i = 0; i < FILES; ++i) {
      OldFile("f" + std::to_string(i), now - (i * 101 % FILES) * 10 * DAY);
    }
    TakeIn();
    Jobs(FILES);
    for (const auto& [name, job] : handed) {
      EXPECT_TRUE(contents->Finish(job.file, TextContent("one walrus")));
    }
    EXPECT_TRUE(contents->Commit());
  }

  // Pages that a question reads, of both databases.
  int64_t PagesRead(const std::string& text) {
    question.text = text;
    Asked asked;
    NameMarker marker;
    std::string error;
    EXPECT_TRUE(asked.Read(question, marker, error)) << error;
    AskedShare share("s");
    share.Ask(question, asked, {}, 20);
    EXPECT_EQ(share.failures, Names());
    EXPECT_EQ(share.hits.size(), 20U) << text;
    int read = 0;
    int highest = 0;
    (void)sqlite3_db_status(share.reader.database.db, SQLITE_DBSTATUS_CACHE_HIT, &read, &highest,
                            0);
    return read;
  }

  static constexpr int FILES = 350;
};

TEST_F(QueryManyTextsTest, BeginningsAreNotPutTogetherForEachHit) {
  question.count_all = false;
  StoreMany(400, [](int i) {
    std::string text = "common";
    for (int word = 0; word < 40; ++word) {
      text += " inv" + std::to_string((i * 40 + word) * 7919) + " \u6771";
      AppendUtf8(static_cast<char32_t>(0x4e00 + i * 40 + word), text);
    }
    return TextContent(text);
  });

  const int64_t of_a_word = PagesRead("common");
  EXPECT_LT(PagesRead("inv*"), of_a_word * 3 / 2);
  EXPECT_LT(PagesRead("inv* common"), of_a_word * 3 / 2);
  EXPECT_LT(PagesRead("\u6771"), of_a_word * 3 / 2);
}

TEST_F(QueryManyTextsTest, TitlesStandAboveWhatIsSaidOftenHoweverManySayIt) {
  StoreMany(700, [](int i) {
    return i == 0   ? Tagged(ContentField::TITLE, "whale")
           : i == 1 ? Tagged(ContentField::AUTHOR, "whale")
                    : TextContent("whale whale whale and whale");
  });

  for (const char* text : {"whale", "whal*", "whale OR none"}) {
    const Names hits = Hits(text);
    EXPECT_EQ(Names(hits.begin(), hits.begin() + 2), Names({"f0", "f1"})) << text;
  }
}

TEST_F(QueryManyTextsTest, TheYoungestOfManyThatSayTheSameComeFirst) {
  StoreManyOfAllAges();
  const Names hits = Hits("walrus");
  ASSERT_EQ(hits.size(), 20U);
  for (int i = 0; i < 20; ++i) {
    EXPECT_EQ(std::stoi(hits[static_cast<size_t>(i)].substr(1)) * 101 % FILES, i);
  }
}

TEST_F(QueryManyTextsTest, SharesThatAreRuledOutChangeNoHits) {
  StoreManyOfAllAges();
  question.shares = {"s"};
  const Names alone = Paths("walrus");
  question.shares = {"s", "a", "b", "c", "d", "e", "f", "g", "h", "i"};

  EXPECT_EQ(Paths("walrus share:s"), alone);
}

TEST_F(QueryManyTextsTest, RareWordsCountMoreThanCommonOnesHoweverManyHoldThose) {
  StoreMany(700, [](int i) {
    return TextContent(i == 3   ? "one walrus"
                       : i == 4 ? "one whale and one walrus"
                                : "whale whale whale and whale");
  });

  for (const char* text : {"walrus OR whale", "walru* OR whale", "walrus OR whal*"}) {
    const Names hits = Hits(text);
    EXPECT_EQ(Names(hits.begin(), hits.begin() + 2), Names({"f4", "f3"})) << text;
  }
}

}  // namespace fileindexd
