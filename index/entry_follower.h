// SPDX-License-Identifier: GPL-2.0-or-later
// Entries as whoever keeps contents looks at them: in the order in which they were written, and by
// what file they stand for. Reads alone; results are SQLite's codes.
#pragma once

#include <chrono>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "index/contents_writer.h"
#include "index/database.h"
#include "state/sqlite.h"

namespace fileindexd {

// A row that is wanted, or was.
struct FollowedEntry {
  FileIdentity identity;
  int64_t ctime = 0;
  Kind kind = Kind::OTHER;
  bool is_wanted = false;
  int64_t written = 0;
  int64_t reread = 0;
};

// How entries refer to a file.
enum class Reference {
  NONE,      // no entry stands for that file at all
  UNWANTED,  // some do, and none wants its content
  OTHER,     // one wants it, with another size or mtime
  WANTED,    // with just that identity
};

class EntryFollower {
 public:
  // Opens the share's entries, anew where the file at that path is another one by now.
  IndexError EnsureOpen(const std::string& share_name);
  void Close();

  // Up to `limit` rows after `written`, in that order.
  int Next(int64_t written, int64_t limit, std::vector<FollowedEntry>& entries);
  int Refer(const FileIdentity& identity, Reference& reference);
  // The wanted entry of that file that was written last.
  int Latest(uint64_t inode, int64_t birth_time, FollowedEntry& entry, bool& found);
  // Of wanted entries with that identity, a few of them.
  int Paths(const FileIdentity& identity, std::vector<std::string>& paths);

  int64_t made = 0;     // tells one entries database from another
  bool failed = false;  // whether the last operation did: the entries are to blame
  // The last EnsureOpen opened nothing, because somebody seems to be removing the index: for
  // ContentsWriter::LONGEST_REMOVAL at most.
  bool is_going = false;

 private:
  int End(Statement& statement, int code);
  bool IsBeingRemoved(const std::string& share_name);
  IndexDatabase database;
  Statement next, of_inode, latest_of, paths_of;
  // When the log went from under the open database, if it did not come back.
  std::optional<std::chrono::steady_clock::time_point> log_went;
};

}  // namespace fileindexd
