// SPDX-License-Identifier: GPL-2.0-or-later
// Rare words beside common ones, in names and in texts: what the common ones are not read for must
// not be missing.
#include <algorithm>
#include <memory>
#include <random>
#include <set>

#include "index/asked.h"
#include "index/asked_share.h"
#include "index/contents_table.h"
#include "index/entry_table.h"
#include "index/name_marker.h"
#include "index/search.h"
#include "index/words_version.h"
#include "state/layout.h"
#include "tests/unit/index/question_fixture.h"

namespace fileindexd {

namespace {

constexpr int FILES = 4000;

// Words, and in how many of a thousand names or texts each stands.
const std::vector<std::pair<std::string, int>> WORDS = {
    {"most", 800}, {"half", 600}, {"many", 450}, {"some", 30}, {"few", 3}, {"rare", 2}, {"lone", 1},
};

struct Written {
  std::set<std::string> name;
  std::set<std::string> text;

  bool Has(const std::string& word) const { return name.contains(word) || text.contains(word); }
};

std::string Joined(const Names& parts) {
  std::string text;
  for (const std::string& part : parts) {
    text += part;
  }
  return text;
}

}  // namespace

class QueryBesideTest : public QuestionTest {
 protected:
  void SetUp() override {
    QuestionTest::SetUp();
    std::mt19937 random(4711);
    const auto choose = [&random](std::set<std::string>& words) {
      std::string text;
      for (const auto& [word, often] : WORDS) {
        if (static_cast<int>(random() % 1000) < often) {
          words.insert(word);
          text += " " + word;
        }
      }
      return text;
    };
    std::vector<Entry> entries;
    std::vector<std::string> texts;
    for (int i = 0; i < FILES; ++i) {
      Entry& entry = entries.emplace_back();
      Written& one = files.emplace_back();
      entry.path = "/big/" + std::to_string(i) + choose(one.name);
      entry.thing = Thing::FILE;
      entry.inode = static_cast<uint64_t>(i) + 10;
      entry.birth_time = 1;
      entry.size = i;
      entry.mtime = int64_t{1'600'000'000'000'000'000} + i;
      entry.content_wanted = true;
      texts.push_back(i % 3 == 0 ? "" : "words" + choose(one.text));
    }
    WriteEntries(entries);
    WriteTexts(entries, texts);
  }

  static void WriteEntries(const std::vector<Entry>& entries) {
    std::string error;
    IndexDatabase database;
    EntryTable table;
    ASSERT_TRUE(MakeShareFolder("big", error)) << error;
    ASSERT_EQ(database.OpenForWriting(IndexPath("big"), true), IndexError::NONE);
    ASSERT_EQ(table.Prepare(database.db), SQLITE_OK);
    ASSERT_EQ(table.Begin(), SQLITE_OK);
    for (const Entry& entry : entries) {
      ASSERT_EQ(table.Insert(entry), SQLITE_OK);
    }
    ASSERT_EQ(table.Commit(1), SQLITE_OK);
  }

  static void WriteTexts(const std::vector<Entry>& entries, const std::vector<std::string>& texts) {
    IndexDatabase database;
    ContentsTable table;
    ASSERT_EQ(database.OpenForWriting(ContentsPath("big"), true, CONTENTS_FORM), IndexError::NONE);
    ASSERT_EQ(table.Prepare(database.db), SQLITE_OK);
    ASSERT_EQ(table.UseWords("english", WordsVersion("english")), SQLITE_OK);
    ASSERT_EQ(table.Begin(), SQLITE_OK);
    for (size_t i = 0; i < entries.size(); ++i) {
      ContentFile file;
      file.identity = {entries[i].inode, entries[i].birth_time, entries[i].size, entries[i].mtime};
      ASSERT_EQ(table.Insert(file), SQLITE_OK);
      bool found = false;
      ASSERT_EQ(table.Find(entries[i].inode, entries[i].birth_time, file, found), SQLITE_OK);
      ContentFile done = file;
      done.state = ContentState::DONE;
      if (!texts[i].empty()) {
        ASSERT_EQ(table.SetContent(file, TextContent(texts[i]), done), SQLITE_OK);
      }
      ASSERT_EQ(table.Update(file, done), SQLITE_OK);
    }
    ASSERT_EQ(table.Commit(1), SQLITE_OK);
  }

  std::set<size_t> Found(const std::string& text) {
    question.text = text;
    question.shares = {"big"};
    question.limit = FILES;
    std::string error;
    EXPECT_TRUE(Ask(question, answer, error)) << error;
    EXPECT_EQ(answer.failures, Names());
    std::set<size_t> found;
    for (const Hit& hit : answer.hits) {
      found.insert(static_cast<size_t>(hit.entry.size));
    }
    EXPECT_EQ(answer.total, found.size()) << text;
    return found;
  }

  template <typename Fits>
  std::set<size_t> Fitting(const Fits& fits) const {
    std::set<size_t> fitting;
    for (size_t i = 0; i < files.size(); ++i) {
      if (fits(files[i])) {
        fitting.insert(i);
      }
    }
    return fitting;
  }

  std::vector<Written> files;
};

TEST_F(QueryBesideTest, EachPairOfWordsFindsWhatHasBoth) {
  size_t both = 0;
  for (const auto& one : WORDS) {
    for (const auto& other : WORDS) {
      const std::string& first = one.first;
      const std::string& second = other.first;
      const auto fits = [&](const Written& file) { return file.Has(first) && file.Has(second); };
      EXPECT_EQ(Found(Joined({first, " ", second})), Fitting(fits)) << first << " " << second;
      const auto in_parts = [&](const Written& file) {
        return file.name.contains(first) && file.text.contains(second);
      };
      EXPECT_EQ(Found(Joined({"name:", first, " text:", second})), Fitting(in_parts));
      const auto without = [&](const Written& file) {
        return file.Has(first) && !file.Has(second);
      };
      EXPECT_EQ(Found(Joined({first, " -", second})), Fitting(without)) << first << " -" << second;
      both += Fitting(fits).size();
    }
  }
  EXPECT_GT(both, 1000U);
}

TEST_F(QueryBesideTest, GroupsBesideARareWordAreWhole) {
  EXPECT_EQ(Found("rare (most OR few)"), Fitting([](const Written& file) {
              return file.Has("rare") && (file.Has("most") || file.Has("few"));
            }));
  EXPECT_EQ(Found("few -(most half) many*"), Fitting([](const Written& file) {
              return file.Has("few") && !(file.Has("most") && file.Has("half")) && file.Has("many");
            }));
  EXPECT_EQ(Found("some half -name:most -text:many"), Fitting([](const Written& file) {
              return file.Has("some") && file.Has("half") && !file.name.contains("most") &&
                     !file.text.contains("many");
            }));
  EXPECT_EQ(Found("lone most half many"), Fitting([](const Written& file) {
              return file.Has("lone") && file.Has("most") && file.Has("half") && file.Has("many");
            }));
  question.sort = SortBy::MODIFIED;
  EXPECT_EQ(Found("rare -half name:*os*"), Fitting([](const Written& file) {
              return file.Has("rare") && !file.Has("half") && file.name.contains("most");
            }));
}

TEST_F(QueryBesideTest, CommonWordsAreReadOnlyBesideTheRareOne) {
  question.text = "lone most";
  Asked asked;
  NameMarker marker;
  std::string error;
  ASSERT_TRUE(asked.Read(question, marker, error)) << error;
  AskedShare share("big");
  share.Ask(question, asked, {}, 20);
  ASSERT_EQ(share.failures, Names());

  const WordSets& sets = share.run->Sets();
  const WordLeaf& rare = asked.leaves[0];
  const WordLeaf& common = asked.leaves[1];
  EXPECT_LE(sets.Of(*common.node).Count(), sets.Of(*rare.node).Count());
  double held = 0;
  for (const Written& file : files) {
    held += (file.name.contains("most") ? 1 : 0) + (file.text.contains("most") ? 1 : 0);
  }
  EXPECT_NEAR(sets.CountOf(common), held, held / 10) << "it is guessed, for its weight";
  EXPECT_LT(sets.WeightOf(common), sets.WeightOf(rare));
}

TEST_F(QueryBesideTest, ReasonsAreThoseOfTheEntryWhateverIsRare) {
  const auto name = std::find_if(files.begin(), files.end(), [](const Written& file) {
    return !file.Has("rare") && file.name.contains("most") && !file.text.contains("most");
  });
  ASSERT_NE(name, files.end());
  ASSERT_FALSE(Found("most").empty());
  const auto hit = std::find_if(answer.hits.begin(), answer.hits.end(), [&](const Hit& one) {
    return one.entry.size == name - files.begin();
  });
  ASSERT_NE(hit, answer.hits.end());

  question.text = "rare most";
  std::string error;
  ASSERT_EQ(Explain(question, hit->entry.path, explanation, error), IndexError::NONE) << error;
  ASSERT_EQ(explanation.reasons.size(), 2U);
  EXPECT_FALSE(explanation.reasons[0].matches);
  EXPECT_TRUE(explanation.reasons[1].matches);
  EXPECT_EQ(explanation.reasons[1].where, "name");
}

}  // namespace fileindexd
