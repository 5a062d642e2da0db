// SPDX-License-Identifier: GPL-2.0-or-later
// The entries database of one share: its files, its schema, its opening.
#pragma once

#include <sqlite3.h>

#include <cstdint>
#include <string>

namespace fileindexd {

// What an opening, or an operation on an index, ended with. Numbers are shown in log lines.
enum class IndexError {
  NONE = 0,
  NO_MEMORY = 1,
  BUSY = 2,            // another program held the database for more than 5 s
  PATH_NOT_FOUND = 3,  // no database of our schema stands there
  IO = 4,              // the disk failed
  FULL = 5,            // the disk is full
  ROOT = 6,            // the share's root is missing or lies on another file system
  DAMAGED = 7,
  OTHER = 8,
};

IndexError FromSqlite(int code);
const char* IndexErrorText(IndexError error);

// A connection to INDEX/entries.db. Nothing throws.
class IndexDatabase {
 public:
  IndexDatabase() = default;
  IndexDatabase(const IndexDatabase&) = delete;
  IndexDatabase& operator=(const IndexDatabase&) = delete;
  ~IndexDatabase() { Close(); }

  // For writing, exclusive of other writers by SQLite's own locks. With `create` a missing database
  // is made, and one that is there and cannot be used (another schema version, damaged, a directory
  // or a pipe in its place) is replaced. Without it these are PATH_NOT_FOUND, and a damaged one has
  // been set aside, one copy, at most once an hour.
  IndexError OpenForWriting(const std::string& index_path, bool create);
  // For reading; never creates, moves or repairs anything.
  IndexError OpenForReading(const std::string& index_path);
  void Close();

  bool IsOpen() const { return db != nullptr; }
  // True when the file is no longer the one at its path.
  bool HasMoved() const;

  sqlite3* db = nullptr;
};

}  // namespace fileindexd
