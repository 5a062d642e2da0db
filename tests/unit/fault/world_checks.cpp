// SPDX-License-Identifier: GPL-2.0-or-later
// What an index has to be once all is done. Nothing fails meanwhile.
#include <gtest/gtest.h>

#include <algorithm>
#include <filesystem>
#include <set>
#include <tuple>

#include "base/utf8.h"
#include "index/compare.h"
#include "index/entry_table.h"
#include "index/name_text.h"
#include "index/reader.h"
#include "index/schema.h"
#include "index/search.h"
#include "state/layout.h"
#include "state/sqlite.h"
#include "state/store.h"
#include "unit/fault/world.h"

namespace fileindexd::fault {

namespace {

constexpr const char* SHARE = "s";

using Words = std::set<std::tuple<std::string, int64_t, int64_t>>;  // word, row, place

void Execute(sqlite3* db, const std::string& sql) {
  ASSERT_EQ(sqlite3_exec(db, sql.c_str(), nullptr, nullptr, nullptr), SQLITE_OK)
      << sql << ": " << sqlite3_errmsg(db);
}

Words WordsOf(sqlite3* db, const std::string& table) {
  Execute(db, "CREATE VIRTUAL TABLE temp." + table + "_words USING fts5vocab(main, " + table +
                  ", instance)");
  Statement statement;
  const std::string sql =
      "SELECT term, doc, coalesce(\"offset\", -1) FROM temp." + table + "_words";
  EXPECT_EQ(statement.Prepare(db, sql.c_str()), SQLITE_OK) << sqlite3_errmsg(db);
  Words words;
  while (statement.Step() == SQLITE_ROW) {
    words.emplace(statement.Bytes(0), statement.Int(1), statement.Int(2));
  }
  return words;
}

}  // namespace

void World::ExpectNoDifference() {
  std::string error;
  const std::unique_ptr<StateStore> store = StateStore::Open(error);
  ASSERT_NE(store, nullptr) << error;
  Comparison result;
  EXPECT_TRUE(CompareShare(
      *store, SHARE,
      [](Difference difference, const std::string& path) {
        ADD_FAILURE() << DifferenceText(difference) << " " << path;
        return true;
      },
      result, error))
      << error;
}

void World::ExpectStatusClear() {
  std::string error;
  const std::unique_ptr<StateStore> store = StateStore::Open(error);
  ASSERT_NE(store, nullptr) << error;
  ShareStatus status;
  ASSERT_TRUE(store->GetStatus(SHARE, status)) << store->Error();
  EXPECT_FALSE(status.needs_reindex);
  EXPECT_FALSE(status.reindex_begun);
  EXPECT_FALSE(status.missing);
  EXPECT_FALSE(status.rebuild_wanted);
  EXPECT_FALSE(status.no_space);
}

void World::ExpectIntegrity() {
  for (const std::string& file : {IndexPath(SHARE) + "/" + ENTRIES_FILE, StateDatabasePath(),
                                  StateDatabasePath() + ".copy"}) {
    sqlite3* db = nullptr;
    ASSERT_EQ(sqlite3_open(file.c_str(), &db), SQLITE_OK) << file;
    {
      Statement check;
      ASSERT_EQ(check.Prepare(db, "PRAGMA integrity_check"), SQLITE_OK) << file;
      ASSERT_EQ(check.Step(), SQLITE_ROW) << file;
      EXPECT_EQ(check.Bytes(0), "ok") << file;
    }
    sqlite3_close(db);
  }
}

// The words are those that the same names give in tables that are filled at once.
void World::ExpectWordsOfNames() {
  sqlite3* fresh = nullptr;
  ASSERT_EQ(sqlite3_open(":memory:", &fresh), SQLITE_OK);
  Execute(fresh, ENTRIES_SCHEMA);
  EntryReader reader;
  ASSERT_EQ(reader.Open(SHARE), IndexError::NONE);
  Statement names;
  Statement parts;
  names.Prepare(fresh, "INSERT INTO names(rowid, name) VALUES(?1, ?2)");
  parts.Prepare(fresh, "INSERT INTO parts(rowid, name) VALUES(?1, ?2)");
  NameFolder folder;
  uint64_t entries = 0;
  EXPECT_TRUE(reader.ForEach(root, [&](const Entry& entry) {
    const std::string text = ToUtf8(LastComponent(entry.path));
    const std::string words = NameRow(folder, text);
    const std::string folded = folder.Parts(text);
    names.BindText(2, words);
    parts.BindText(2, folded);
    for (Statement* insert : {&names, &parts}) {
      insert->BindInt(1, entry.id);
      EXPECT_EQ(insert->Run(), SQLITE_OK);
    }
    ++entries;
    return true;
  }));
  EntryReader::Summary summary;
  EXPECT_TRUE(reader.Summarise(summary));
  EXPECT_EQ(summary.entries, entries);

  Execute(reader.database.db, "PRAGMA query_only = 0");  // for a temporary table
  for (const char* table : {"names", "parts"}) {
    EXPECT_TRUE(WordsOf(reader.database.db, table) == WordsOf(fresh, table)) << table;
  }
  sqlite3_close_v2(fresh);
}

void World::ExpectEachNameFound() {
  for (const auto& item : std::filesystem::recursive_directory_iterator(root)) {
    const std::string name = item.path().filename();
    Question question;
    question.text = name;
    question.shares = {SHARE};
    Answer answer;
    std::string error;
    ASSERT_TRUE(Ask(question, answer, error)) << error;
    EXPECT_EQ(answer.failures, std::vector<std::string>());
    EXPECT_EQ(std::count_if(answer.hits.begin(), answer.hits.end(),
                            [&](const Hit& hit) { return hit.entry.path == item.path(); }),
              1)
        << name;
  }
}

}  // namespace fileindexd::fault
