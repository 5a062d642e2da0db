// SPDX-License-Identifier: GPL-2.0-or-later
// Thin owners around SQLite's handles. Nothing here throws; results are SQLite's own codes.
#pragma once

#include <sqlite3.h>
#include <sys/types.h>

#include <cstdint>
#include <initializer_list>
#include <string>
#include <string_view>

namespace fileindexd {

// Of a step, or of the last one of a loop: SQLITE_OK where it came to a row or to the end, else
// what failed.
inline int StepError(int code) {
  return code == SQLITE_ROW || code == SQLITE_DONE ? SQLITE_OK : code;
}

// Whether a code says that the database is damaged, or none at all.
inline bool IsDamage(int code) {
  return (code & 0xff) == SQLITE_CORRUPT || (code & 0xff) == SQLITE_NOTADB;
}

// Statements separated by ';', whose rows nobody wants.
int Execute(sqlite3* db, const char* sql);

// Whether a regular file or nothing stands there. SQLite would wait for ever in a pipe, and fails
// without end at a folder.
bool IsFileOrNothing(const std::string& path);

// The inode of what stands there, a link itself; 0: nothing.
ino_t InodeOf(const std::string& path);

// Of the log that stands beside a database.
inline ino_t LogInode(const std::string& database) {
  return InodeOf(database + "-wal");
}

// The inodes of the log that stands beside a database, and of the memory that its users share; 0:
// none. While a connection is open nobody but SQLite's users removes them, and none of them does:
// another number says that one went all the same.
struct LogFiles {
  ino_t log = 0;
  ino_t memory = 0;

  bool operator==(const LogFiles&) const = default;
};
LogFiles LogFilesOf(const std::string& database);

// A prepared statement. Bind, then Step until it is not SQLITE_ROW, then Reset.
class Statement {
 public:
  Statement() = default;
  Statement(const Statement&) = delete;
  Statement& operator=(const Statement&) = delete;
  ~Statement() { sqlite3_finalize(handle); }

  int Prepare(sqlite3* db, const char* sql);
  // Numbered from 1. Bytes are bound without a copy: they must outlive the step.
  void BindInt(int column, int64_t value) { sqlite3_bind_int64(handle, column, value); }
  void BindInts(std::initializer_list<int64_t> values);  // the first ones
  void BindText(int column, std::string_view text);
  void BindBlob(int column, std::string_view bytes);
  int Step() { return sqlite3_step(handle); }
  // Steps once, resets, and returns the step's result; SQLITE_DONE of a statement without rows
  // comes as SQLITE_OK.
  int Run();
  void Reset() { sqlite3_reset(handle); }
  // Steps once, has `read` take the row if there is one, and resets. SQLITE_OK with and without.
  template <typename Read>
  int ReadOne(bool& found, const Read& read) {
    const int code = Step();
    found = code == SQLITE_ROW;
    if (found) {
      read();
    }
    Reset();
    return StepError(code);
  }
  // The same with each row.
  template <typename Read>
  int ReadAll(const Read& read) {
    int code = Step();
    for (; code == SQLITE_ROW; code = Step()) {
      read();
    }
    Reset();
    return StepError(code);
  }

  int64_t Int(int column) const { return sqlite3_column_int64(handle, column); }
  std::string Bytes(int column) const;

  sqlite3_stmt* handle = nullptr;
};

// Whether the database is sound: its pages, or with its indexes, which takes many times as long.
// SQLITE_OK and `ok`, or SQLite's reason.
int QuickCheck(sqlite3* db, bool& ok);
int FullCheck(sqlite3* db, bool& ok);

// The number that a program of ours left in the database; 0 where none did.
int SchemaVersion(sqlite3* db, int64_t& version);

}  // namespace fileindexd
