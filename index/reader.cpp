// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/reader.h"

#include <sys/stat.h>

#include <cerrno>
#include <chrono>
#include <thread>

#include "index/entry_table.h"
#include "index/read_transaction.h"
#include "index/schema.h"
#include "state/layout.h"
#include "state/sqlite.h"

namespace fileindexd {

namespace {

constexpr int MAKING_TRIES = 20;
constexpr std::chrono::milliseconds MAKING_PAUSE{10};

// False when reading failed. `going` is false once `visit` wanted no more.
bool VisitAll(Statement& statement, const std::function<bool(const Entry&)>& visit, bool& going) {
  Entry entry;
  while (going) {
    const int code = statement.Step();
    if (code != SQLITE_ROW) {
      return code == SQLITE_DONE;
    }
    ReadEntry(statement, entry);
    going = visit(entry);
  }
  return true;
}

}  // namespace

IndexError EntryReader::Open(const std::string& share_name) {
  first_written.reset();
  return database.OpenForReading(IndexPath(share_name));
}

bool EntryReader::IsMissing(const std::string& share_name) {
  struct stat status {};
  return lstat(IndexPath(share_name).c_str(), &status) != 0 && errno == ENOENT;
}

// Of a share without a folder there will be none.
IndexError EntryReader::OpenOnceMade(const std::string& share_name) {
  IndexError error = Open(share_name);
  for (int i = 0; i < MAKING_TRIES && error == IndexError::PATH_NOT_FOUND; ++i) {
    struct stat status {};
    if (stat(ShareFolder(share_name).c_str(), &status) != 0) {
      return error;
    }
    std::this_thread::sleep_for(MAKING_PAUSE);  // nothing tells when it is there
    error = Open(share_name);
  }
  return error;
}

bool EntryReader::Ends(bool is_read) {
  read_error = is_read ? IndexError::NONE : FromSqlite(sqlite3_errcode(database.db));
  return is_read;
}

bool EntryReader::Summarise(Summary& summary) {
  // Counting what is wanted reads its own small index alone.
  Statement statement;
  if (statement.Prepare(
          database.db,
          "SELECT entries, last_commit,"
          " (SELECT count(*) FROM entries WHERE content_wanted <> 0 AND content_wanted = 1)"
          " FROM meta WHERE id = 1") != SQLITE_OK ||
      statement.Step() != SQLITE_ROW) {
    return Ends(false);
  }

  summary.entries = static_cast<uint64_t>(statement.Int(0));
  summary.last_commit = statement.Int(1);
  summary.wanted = static_cast<uint64_t>(statement.Int(2));
  return Ends(true);
}

bool EntryReader::Count(uint64_t& entries) {
  Statement statement;
  if (statement.Prepare(database.db, "SELECT entries FROM meta WHERE id = 1") != SQLITE_OK ||
      statement.Step() != SQLITE_ROW) {
    return Ends(false);
  }
  entries = static_cast<uint64_t>(statement.Int(0));
  return Ends(true);
}

bool EntryReader::ForEach(const std::string& under,
                          const std::function<bool(const Entry&)>& visit) {
  Statement at;
  Statement below;
  const ReadTransaction transaction(database.db);
  if (transaction.code != SQLITE_OK ||
      at.Prepare(database.db, "SELECT " FILEINDEX_ENTRY_COLUMNS " FROM entries WHERE path = ?1") !=
          SQLITE_OK ||
      below.Prepare(database.db,
                    "SELECT " FILEINDEX_ENTRY_COLUMNS
                    " FROM entries WHERE path > ?2 AND path < ?3 ORDER BY path") != SQLITE_OK) {
    return Ends(false);
  }

  const PathRange range(under);
  at.BindBlob(1, under);
  range.Bind(below);
  bool going = true;
  const bool read = Ends(VisitAll(at, visit, going) && VisitAll(below, visit, going));
  at.Reset();
  below.Reset();
  return read;
}

bool EntryReader::ForEachOfInode(uint64_t inode, const std::function<bool(const Entry&)>& visit) {
  Statement statement;
  if (statement.Prepare(database.db, "SELECT " FILEINDEX_ENTRY_COLUMNS
                                     " FROM entries WHERE inode = ?1") != SQLITE_OK) {
    return false;
  }
  statement.BindInt(1, static_cast<int64_t>(inode));
  bool going = true;
  return VisitAll(statement, visit, going);
}

IndexError EntryReader::Find(const std::string& path, std::optional<Entry>& entry) {
  Statement statement;
  int code = statement.Prepare(database.db,
                               "SELECT " FILEINDEX_ENTRY_COLUMNS " FROM entries WHERE path = ?1");
  statement.BindBlob(1, path);
  code = code == SQLITE_OK ? statement.Step() : code;
  if (StepError(code) != SQLITE_OK) {
    return FromSqlite(code);
  }

  entry.reset();
  if (code == SQLITE_ROW) {
    ReadEntry(statement, entry.emplace());
  }
  return IndexError::NONE;
}

// There is one writer at a time: once anybody has committed, or nobody writes at this moment, the
// one of then has ended. Nothing is written here. (SQLite's own data_version also changes when a
// writer begins its log anew, before it has committed.) What shrinks the file commits without a
// note: it lets go of the lock after some tens of transactions.
bool EntryReader::HasWriterEnded(int milliseconds) {
  sqlite3* db = database.db;
  Statement ask;
  int64_t written = 0;
  bool found = false;
  const int code = ask.Prepare(db, "SELECT last_written FROM meta WHERE id = 1");
  if (code != SQLITE_OK || ask.ReadOne(found, [&] { written = ask.Int(0); }) != SQLITE_OK ||
      !found) {
    return true;
  }
  if (first_written.value_or(written) != written) {
    return true;
  }
  first_written = written;

  sqlite3_busy_timeout(db, milliseconds);
  (void)Execute(db, "PRAGMA query_only = 0");
  const int begun = Execute(db, "BEGIN IMMEDIATE");
  if (begun == SQLITE_OK) {
    (void)Execute(db, "ROLLBACK");
  }
  (void)Execute(db, "PRAGMA query_only = 1");
  sqlite3_busy_timeout(db, BUSY_TIMEOUT_MS);
  return (begun & 0xff) != SQLITE_BUSY;
}

bool EntryReader::CountBelow(const std::string& directory, uint64_t limit, uint64_t& below) {
  Statement statement;
  if (statement.Prepare(database.db,
                        "SELECT count(*) FROM"
                        " (SELECT 1 FROM entries WHERE path > ?2 AND path < ?3 LIMIT ?4)") !=
      SQLITE_OK) {
    return false;
  }

  const PathRange range(directory);
  range.Bind(statement);
  statement.BindInt(4, static_cast<int64_t>(limit));
  if (statement.Step() != SQLITE_ROW) {
    return false;
  }
  below = static_cast<uint64_t>(statement.Int(0));
  return true;
}

}  // namespace fileindexd
