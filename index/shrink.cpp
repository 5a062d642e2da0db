// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/shrink.h"

#include <cstdint>
#include <utility>

#include "index/database.h"
#include "state/sqlite.h"

namespace fileindexd {

namespace {

// Below this number of removals the file is not worth the work.
constexpr int64_t LEAST_REMOVED = 1000;
// Removals for each entry that is left: a quarter of what there was.
constexpr int64_t LEFT_FOR_EACH_REMOVED = 3;
constexpr int64_t FREE_PAGES_KEPT = 16;  // for the next entries
// A second of work at most on a slow disk, so that a Worker can be stopped or paused in between.
constexpr int STEPS = 40;
// A reader that stays longer is come back to, pass after pass.
constexpr int READER_TIMEOUT_MS = 2000;

// Negative: all segments are merged into one, which is where records that cancel others end. Both
// numbers are pages for one transaction.
constexpr const char* MERGE_NAMES = "INSERT INTO names(names, rank) VALUES('merge', -200)";
constexpr const char* MERGE_PARTS = "INSERT INTO parts(parts, rank) VALUES('merge', -200)";
constexpr const char* CUT_PAGES = "PRAGMA incremental_vacuum(200)";

// -1 when it could not be read.
int64_t ReadNumber(sqlite3* db, const char* sql) {
  Statement statement;
  const bool read = statement.Prepare(db, sql) == SQLITE_OK && statement.Step() == SQLITE_ROW;
  return read ? statement.Int(0) : -1;
}

// Runs `sql` as one transaction. False when it failed: then it has done nothing.
bool RunAlone(sqlite3* db, const char* sql) {
  if (Execute(db, "BEGIN IMMEDIATE") != SQLITE_OK) {
    return false;
  }
  if (Execute(db, sql) == SQLITE_OK && Execute(db, "COMMIT") == SQLITE_OK) {
    return true;
  }
  if (sqlite3_get_autocommit(db) == 0) {
    (void)Execute(db, "ROLLBACK");
  }
  return false;
}

// A merge that finds nothing to do changes one row of its own, or none.
bool Merge(sqlite3* db, const char* sql, bool& merged) {
  const int64_t before = sqlite3_total_changes64(db);
  if (!RunAlone(db, sql)) {
    return false;
  }
  merged = sqlite3_total_changes64(db) - before < 2;
  return true;
}

// Copies the log back, which is when the file becomes shorter, and cuts it.
bool CopyLogBack(sqlite3* db, bool& copied) {
  sqlite3_busy_timeout(db, READER_TIMEOUT_MS);
  const int code =
      sqlite3_wal_checkpoint_v2(db, "main", SQLITE_CHECKPOINT_TRUNCATE, nullptr, nullptr);
  sqlite3_busy_timeout(db, BUSY_TIMEOUT_MS);
  copied = code == SQLITE_OK;
  return copied || (code & 0xff) == SQLITE_BUSY;
}

// One transaction's work. `done`: there was none left.
class Shrinker {
 public:
  explicit Shrinker(sqlite3* shrunk) : db(shrunk) {}

  bool Step(bool& done) {
    done = false;
    // A table that is found merged is not a step of its own: whoever is interrupted after each step
    // gets to the end all the same.
    for (const auto& [merged, sql] :
         {std::pair{&names_merged, MERGE_NAMES}, std::pair{&parts_merged, MERGE_PARTS}}) {
      if (!*merged && !Merge(db, sql, *merged)) {
        return false;
      }
      if (!*merged) {
        return true;
      }
    }

    const int64_t free_pages = ReadNumber(db, "PRAGMA freelist_count");
    if (free_pages > FREE_PAGES_KEPT) {
      return RunAlone(db, CUT_PAGES);
    }
    if (free_pages < 0) {
      return false;
    }
    bool copied = false;
    if (!CopyLogBack(db, copied)) {
      return false;
    }
    if (!copied) {
      reader_in_the_way = true;
      return true;
    }
    done = true;
    return RunAlone(db, "UPDATE meta SET removed = 0 WHERE id = 1");
  }

  bool reader_in_the_way = false;

 private:
  sqlite3* db;
  bool names_merged = false;
  bool parts_merged = false;
};

}  // namespace

Shrinking ShrinkDatabase(sqlite3* db, const std::function<void()>& between) {
  const int64_t removed = ReadNumber(db, "SELECT removed FROM meta WHERE id = 1");
  if (removed < LEAST_REMOVED) {
    return removed < 0 ? Shrinking::FAILED : Shrinking::DONE;
  }
  const int64_t left = ReadNumber(db, "SELECT entries FROM meta WHERE id = 1");
  if (left < 0 || left / LEFT_FOR_EACH_REMOVED > removed) {
    return left < 0 ? Shrinking::FAILED : Shrinking::DONE;
  }

  Shrinker shrinker(db);
  for (int i = 0; i < STEPS && !shrinker.reader_in_the_way; ++i) {
    bool done = false;
    if (!shrinker.Step(done)) {
      return Shrinking::FAILED;
    }
    if (done) {
      return Shrinking::DONE;
    }
    between();
  }
  return Shrinking::UNFINISHED;
}

}  // namespace fileindexd
