// SPDX-License-Identifier: GPL-2.0-or-later
// Random questions with everything that the language has, to several shares of thousands of entries
// whose contents wait, were read or failed, answered a second time in the plainest way.
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <iterator>
#include <map>

#include "index/contents_reader.h"
#include "index/reader.h"
#include "index/search.h"
#include "tests/unit/index/plain_questions.h"

namespace fileindexd {

namespace {

constexpr unsigned SEED = 20'261'121;

bool IsLong() {
  const char* scale = std::getenv("FILEINDEXD_TEST_SCALE");  // NOLINT(concurrency-mt-unsafe)
  return scale != nullptr && std::string(scale) == "long";
}

using Paths = std::vector<std::string>;

// How many are in the first alone, and some of them. Both are sorted.
std::string Few(const Paths& first, const Paths& second) {
  Paths others;
  std::set_difference(first.begin(), first.end(), second.begin(), second.end(),
                      std::back_inserter(others));
  std::string text = std::to_string(others.size());
  for (size_t i = 0; i < others.size() && i < 3; ++i) {
    text += "\n    " + others[i];
  }
  return text;
}

// All that was made up, but for numbers that the tables give.
std::string TextOf(const Entry& entry) {
  std::string text = entry.path;
  for (const int64_t number :
       {static_cast<int64_t>(entry.thing), static_cast<int64_t>(entry.kind),
        int64_t{entry.content_wanted}, static_cast<int64_t>(entry.inode), entry.size, entry.mtime,
        entry.ctime, entry.birth_time, entry.first_seen, int64_t{entry.owner}, int64_t{entry.group},
        int64_t{entry.mode}}) {
    text += " " + std::to_string(number);
  }
  return text;
}

std::string TextOf(const StoredContent& stored) {
  const Content& content = stored.content;
  std::map<int, std::string> fields;
  for (const TextField& field : content.texts) {
    fields[static_cast<int>(field.field)] += field.text;
  }
  for (const NumberField& field : content.numbers) {
    fields[static_cast<int>(field.field)] += std::to_string(field.number);
  }
  std::string text = ", " + stored.state + " " + stored.reason + " " +
                     std::to_string(static_cast<int>(content.kind)) + " " +
                     std::to_string(content.sample) + " " +
                     (stored.state == "waiting" ? "" : stored.language);
  for (const auto& [field, value] : fields) {
    text += ", " + std::to_string(field) + ": " + value;
  }
  return text + ", " + content.text;
}

StoredContent StoredOf(const PlainFile& file) {
  StoredContent stored;
  if (file.WasRead()) {
    stored.state = file.stage == PlainStage::DONE ? "done" : "failed";
    stored.reason = file.stage == PlainStage::DONE ? "" : "broken";
    stored.content = file.content;
    stored.language = "english";
  }
  return stored;
}

class QueryPlainTest : public testing::Test {
 protected:
  void SetUp() override {
    setenv("TZ", "UTC", 1);  // NOLINT(concurrency-mt-unsafe): one thread
    tzset();
  }
  void Make(size_t files) {
    world = std::make_unique<PlainWorld>(SEED, files);
    world->Store();
    question.shares = world->shares;
  }

  Paths Expected(const PlainTest& test) const {
    Paths paths;
    for (const PlainFile& file : world->files) {
      if (test(file)) {
        paths.push_back(file.entry.path);
      }
    }
    std::sort(paths.begin(), paths.end());
    return paths;
  }

  // In the order of the answer.
  Paths Ask(const std::string& text) {
    question.text = text;
    std::string error;
    if (!asker.Ask(question, answer, error)) {
      return {"error: " + error};
    }
    EXPECT_EQ(answer.failures, Paths()) << text;
    Paths paths;
    for (const Hit& hit : answer.hits) {
      paths.push_back(hit.entry.path);
    }
    return paths;
  }

  void CheckAll(const PlainQuestion& made, const Paths& expected) {
    question.limit = world->files.size();
    const Paths ordered = Ask(made.text);
    Paths found = ordered;
    std::sort(found.begin(), found.end());
    ASSERT_TRUE(found == expected) << made.text << "\n  too much: " << Few(found, expected)
                                   << "\n  missing: " << Few(expected, found);
    ASSERT_EQ(answer.total, expected.size()) << made.text;
    CheckPage(made, ordered);
  }

  // A page is a part of the whole, whether all is counted or not.
  void CheckPage(const PlainQuestion& made, const Paths& ordered) {
    question.offset = maker->chance.Below(10);
    question.limit = 5;
    question.count_all = maker->chance.OneOf(2);
    const size_t first = std::min<size_t>(question.offset, ordered.size());
    const size_t last = std::min<size_t>(first + 5, ordered.size());
    EXPECT_EQ(Ask(made.text), Paths(ordered.begin() + static_cast<std::ptrdiff_t>(first),
                                    ordered.begin() + static_cast<std::ptrdiff_t>(last)))
        << made.text << ", by " << static_cast<int>(question.sort) << ", from " << first;
    question.offset = 0;
    question.count_all = true;
  }

  void CheckQuestions(int questions) {
    maker = std::make_unique<QuestionMaker>(*world, SEED);
    question.suggests = false;
    int asked = 0;
    int answered = 0;
    for (int i = 0; i < questions; ++i) {
      const PlainQuestion made = maker->Tree(maker->chance.Below(4));
      question.sort = static_cast<SortBy>(maker->chance.Below(4));
      question.reverse = maker->chance.OneOf(4);
      if (!made.is_positive) {
        const Paths refused = Ask(made.text);
        ASSERT_FALSE(refused.empty()) << made.text;
        ASSERT_TRUE(refused[0].starts_with("error: ")) << made.text;
        continue;
      }
      const Paths expected = Expected(made.test);
      ASSERT_NO_FATAL_FAILURE(CheckAll(made, expected));
      ++asked;
      answered += expected.empty() || expected.size() == world->files.size() ? 0 : 1;
    }
    EXPECT_GT(asked, questions / 2);
    EXPECT_GT(answered, asked / 2) << "most questions tell files apart";
  }

  std::unique_ptr<PlainWorld> world;
  std::unique_ptr<QuestionMaker> maker;
  Asker asker;
  Question question;
  Answer answer;
};

}  // namespace

TEST_F(QueryPlainTest, TheIndexHoldsTheWorld) {
  Make(4'000);
  for (const std::string& share : world->shares) {
    ContentsReader reader;
    ASSERT_EQ(reader.Open(share), IndexError::NONE);
    EntryReader entries;
    ASSERT_EQ(entries.Open(share), IndexError::NONE);
    Paths held;
    ASSERT_TRUE(entries.ForEach("/world/" + share, [&](const Entry& entry) {
      StoredContent stored;
      EXPECT_EQ(reader.Find(entry, stored), IndexError::NONE) << entry.path;
      held.push_back(TextOf(entry) + TextOf(stored));
      return true;
    }));
    std::sort(held.begin(), held.end());
    Paths made;
    for (const PlainFile& file : world->files) {
      if (file.share == share) {
        made.push_back(TextOf(file.entry) + TextOf(StoredOf(file)));
      }
    }
    std::sort(made.begin(), made.end());
    ASSERT_TRUE(held == made) << "too much: " << Few(held, made)
                              << "\nmissing: " << Few(made, held);
  }
}

TEST_F(QueryPlainTest, TheEngineAndThePlainWayAgree) {
  Make(IsLong() ? 24'000 : 4'000);
  CheckQuestions(IsLong() ? 3'000 : 200);
}

// Where more questions can be asked in the same time.
TEST_F(QueryPlainTest, TheyAgreeOnFewFilesToo) {
  Make(150);
  CheckQuestions(IsLong() ? 50'000 : 2'000);
}

}  // namespace fileindexd
