// SPDX-License-Identifier: GPL-2.0-or-later
// What people would call a good order, written down before it was measured.
#include <algorithm>
#include <cmath>
#include <functional>

#include "base/utf8.h"
#include "index/asked.h"
#include "index/asked_share.h"
#include "index/name_marker.h"
#include "tests/unit/index/question_fixture.h"

namespace fileindexd {

namespace {

std::string Filler(int words) {
  std::string text;
  for (int i = 0; i < words; ++i) {
    text += " filler" + std::to_string(i % 50);
  }
  return text;
}

// A question, and what should come: 3 the very thing, 2 good, 1 has something to do with it.
struct Judged {
  std::string question;
  std::map<std::string, int> grades;
};

double GainAt(size_t place, int grade) {
  return (std::pow(2, grade) - 1) / std::log2(static_cast<double>(place) + 2);
}

}  // namespace

class QueryRankingTest : public QuestionTest {
 protected:
  void SetUp() override {
    QuestionTest::SetUp();
    Content moby = TextContent("call me ishmael whale" + Filler(3000));
    moby.texts = {{ContentField::TITLE, "Moby Dick, or the Whale"},
                  {ContentField::AUTHOR, "Herman Melville"}};
    Content album = Tagged(ContentField::ALBUM, "Budget Songs");
    album.kind = Kind::AUDIO;
    Store({
        {"budget.xlsx", TextContent("numbers")},
        {"budget 2024.xlsx", TextContent("numbers of the year")},
        {"draft budget 2023 old copy.xlsx", TextContent("numbers")},
        {"minutes.txt", TextContent("the budget was discussed, budget and budget")},
        {"letters.txt", TextContent("a budget once" + Filler(4000))},
        {"track 1.mp3", album},
        {"moby-dick.txt", moby},
        {"whales.txt", TextContent("the blue whale is a whale, the largest whale")},
        {"zoo.txt", TextContent("lions and one whale" + Filler(2000))},
        {"annual report.pdf", TextContent("x")},
        {"report annual.pdf", TextContent("x")},
        {"annual.pdf", TextContent("the report of the year")},
        {"notes.txt", TextContent("annual this, and a report that" + Filler(500))},
        {"invoice.pdf", TextContent("invoice number 17")},
        {"invoices.txt", TextContent("list of all")},
        {"readme.txt", TextContent("see invoice.pdf")},
        {"\u6771\u4eac\u65c5\u884c.txt", TextContent("x")},
        {"\u8a08\u753b.txt", TextContent("\u6771\u4eac\u65c5\u884c\u306e\u8a08\u753b")},
    });
  }

  // How much of the best order's gain the answer has, over its first ten places.
  double Quality(const Judged& judged) {
    const Names hits = Hits(judged.question);
    double gain = 0;
    for (size_t i = 0; i < hits.size() && i < 10; ++i) {
      const auto grade = judged.grades.find(hits[i]);
      gain += grade == judged.grades.end() ? 0 : GainAt(i, grade->second);
    }
    std::vector<int> grades;
    for (const auto& [name, grade] : judged.grades) {
      grades.push_back(grade);
    }
    std::sort(grades.rbegin(), grades.rend());
    double best = 0;
    for (size_t i = 0; i < grades.size() && i < 10; ++i) {
      best += GainAt(i, grades[i]);
    }
    return gain / best;
  }
};

TEST_F(QueryRankingTest, JudgedQuestionsComeInGoodOrder) {
  const std::vector<Judged> all = {
      {"budget",
       {{"budget.xlsx", 3},
        {"budget 2024.xlsx", 3},
        {"draft budget 2023 old copy.xlsx", 2},
        {"minutes.txt", 2},
        {"track 1.mp3", 1},
        {"letters.txt", 1}}},
      {"budget 2024", {{"budget 2024.xlsx", 3}}},
      {"whale", {{"moby-dick.txt", 3}, {"whales.txt", 3}, {"zoo.txt", 1}}},
      {"melville", {{"moby-dick.txt", 3}}},
      {"moby dick", {{"moby-dick.txt", 3}}},
      {"annual report",
       {{"annual report.pdf", 3}, {"report annual.pdf", 2}, {"annual.pdf", 2}, {"notes.txt", 1}}},
      {"\"annual report\"", {{"annual report.pdf", 3}}},
      {"invoice", {{"invoice.pdf", 3}, {"readme.txt", 1}}},
      {"invoice*", {{"invoice.pdf", 3}, {"invoices.txt", 3}, {"readme.txt", 1}}},
      {"\u6771\u4eac", {{"\u6771\u4eac\u65c5\u884c.txt", 3}, {"\u8a08\u753b.txt", 2}}},
      {"blue whale", {{"whales.txt", 3}}},
      {"budget OR invoice",
       {{"budget.xlsx", 3},
        {"invoice.pdf", 3},
        {"budget 2024.xlsx", 2},
        {"draft budget 2023 old copy.xlsx", 2},
        {"minutes.txt", 1},
        {"readme.txt", 1},
        {"track 1.mp3", 1},
        {"letters.txt", 1}}},
  };
  double sum = 0;
  for (const Judged& judged : all) {
    const double quality = Quality(judged);
    EXPECT_GT(quality, 0.85) << judged.question << ": "
                             << testing::PrintToString(Hits(judged.question));
    sum += quality;
  }
  EXPECT_GT(sum / static_cast<double>(all.size()), 0.95);
}

TEST_F(QueryRankingTest, TheVeryThingComesFirst) {
  const std::map<std::string, std::string> first = {
      {"budget", "budget.xlsx"},
      {"annual report", "annual report.pdf"},
      {"invoice", "invoice.pdf"},
      {"moby dick", "moby-dick.txt"},
      {"\u6771\u4eac\u65c5\u884c", "\u6771\u4eac\u65c5\u884c.txt"},
  };
  for (const auto& [text, name] : first) {
    const Names hits = Hits(text);
    ASSERT_FALSE(hits.empty()) << text;
    EXPECT_EQ(hits[0], name) << text;
  }
}

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
  constexpr time_t DAY = 86400;
  constexpr int FILES = 350;
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

  const Names hits = Hits("walrus");
  ASSERT_EQ(hits.size(), 20U);
  for (int i = 0; i < 20; ++i) {
    EXPECT_EQ(std::stoi(hits[static_cast<size_t>(i)].substr(1)) * 101 % FILES, i);
  }
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
