// SPDX-License-Identifier: GPL-2.0-or-later
// The databases of one share, entries and contents: their files, their schemas, their opening.
#pragma once

#include <sqlite3.h>

#include <cstdint>
#include <string>
#include <vector>

#include "state/sqlite.h"

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

// What a database is known by, and how it is made.
struct DatabaseForm {
  const char* file;  // name in its folder
  int64_t application;
  int64_t version;
  const char* schema;           // makes the tables in an empty database, and sets both numbers
  const char* probe;            // a number that only our tables give, and
  const char* probed;           // the rows to ask for it
  const char* last_commit;      // a column there that grows with each commit, which is noted beside
                                // the database as well (see last_commit.h); null: there is none
  int (*prepare)(sqlite3* db);  // what the tables need of a connection; null: nothing
  int most_log_frames;          // of 4 KiB: where the disk has plenty of room, a log of so many is
                                // copied back and cut; else, one of LEAST_LOG_FRAMES
};
constexpr int LEAST_LOG_FRAMES = 1000;

extern const DatabaseForm ENTRIES_FORM;

constexpr int BUSY_TIMEOUT_MS = 5000;  // of every connection, but where it is said to be another

// Of the whole process: where all connections together hold so much memory, their page caches grow
// no further.
void LimitCaches(int64_t bytes);

// A connection to a share's database, that of the entries if nothing else is said. Nothing throws.
class IndexDatabase {
 public:
  IndexDatabase() = default;
  IndexDatabase(const IndexDatabase&) = delete;
  IndexDatabase& operator=(const IndexDatabase&) = delete;
  ~IndexDatabase() { Close(); }

  // For writing, exclusive of other writers by SQLite's own locks. With `create` a missing database
  // is made, and one that is there and cannot be used (damaged, of another schema version or
  // another program, without tables, a directory or a pipe in its place) is replaced. Without it
  // these are PATH_NOT_FOUND. Either way what holds something has been set aside, one copy, at most
  // once an hour.
  IndexError OpenForWriting(const std::string& index_path, bool create,
                            const DatabaseForm& form = ENTRIES_FORM);
  // For reading; never creates, moves or repairs anything.
  IndexError OpenForReading(const std::string& index_path, const DatabaseForm& form = ENTRIES_FORM);
  // What OpenForReading would open, beside what is open here, under that name. Not within a
  // transaction. Without success nothing is attached.
  IndexError Attach(const std::string& index_path, const char* name, const DatabaseForm& form);
  void Close();
  // Copies the log back and empties it, unless somebody is in the way.
  void CutLog();

  bool IsOpen() const { return db != nullptr; }
  // True when a file that is open here, or its log, or the memory that its users share, is no
  // longer the one at its path.
  bool HasMoved() const;

  sqlite3* db = nullptr;
  bool has_set_aside = false;  // the last OpenForWriting did, which the system log tells

 private:
  struct OpenedFile {
    std::string name;  // in this connection
    std::string file;
    LogFiles log;
  };
  void Remember(const char* name, const std::string& file);

  std::vector<OpenedFile> files;
};

}  // namespace fileindexd
