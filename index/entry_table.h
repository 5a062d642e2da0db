// SPDX-License-Identifier: GPL-2.0-or-later
// Rows of an entries database: the statements, prepared once for each connection.
//
// Results are SQLite's codes, SQLITE_OK for success. Every statement is reset when an operation
// returns. A change of several tables that fails in between leaves it half done: the caller then
// rolls its transaction back.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "index/entry.h"
#include "index/name_text.h"
#include "state/sqlite.h"

namespace fileindexd {

// The range of paths below normal path `at`: greater than `first`, less than `end`.
struct PathRange {
  explicit PathRange(const std::string& path);

  // The three as ?1 to ?3, of which a statement may leave some out. It outlives the step.
  void Bind(Statement& statement) const;
  // Whether all at or below `at` sorts before that absolute path.
  bool EndsBefore(std::string_view path) const { return end <= path; }

  std::string at;
  std::string first;
  std::string end;
};

// The condition that a row's path is `at` or lies below. The arguments are SQL.
std::string AtOrBelowSql(const std::string& at, const std::string& first, const std::string& end);

std::string_view LastComponent(std::string_view path);
// Reads the columns of FILEINDEX_ENTRY_COLUMNS.
void ReadEntry(const Statement& statement, Entry& entry);
// Binds the values of FILEINDEX_THAT_FILE.
void BindIdentity(Statement& statement, const FileIdentity& identity);

class EntryTable {
 public:
  int Prepare(sqlite3* db);

  int Begin();
  // Writes the number of entries and the time into `meta`, lets `last_written` grow, and commits.
  int Commit(int64_t now);
  void Rollback();

  int Find(const std::string& path, Entry& entry, bool& found);
  // The same, and whether there are entries below. Below a path that is found, nothing is looked
  // for: `below` is then false.
  int FindOrBelow(const std::string& path, Entry& entry, bool& found, bool& has_below);
  int HasBelow(const PathRange& range, bool& has);
  // Up to `limit` entries of paths greater than `after` and less than `end`, in byte order.
  int Slice(const std::string& after, const std::string& end, int limit,
            std::vector<Entry>& entries);
  // Other paths of the same inode whose attributes differ from those of `entry`.
  int StaleTwins(const Entry& entry, std::vector<std::string>& paths);
  // Paths of other entries with the same inode and birth time; which one is another, `id` tells.
  // `changed`: only those that were seen with another change time. `most`: -1 for all of them.
  int OtherPaths(const Entry& entry, bool changed, std::vector<std::string>& paths,
                 int64_t most = -1);

  int Insert(const Entry& entry);  // `id` does not count
  // By `id`; the path does not change. `reread`: somebody wrote to it: the content may be another.
  int Update(const Entry& entry, bool reread);
  int Remove(const Entry& entry);  // by `id`; needs the path
  // In the order of their ids. The full-text tables collect changes in memory while ids ascend, and
  // write a segment at each one that does not: in the order of paths, which is not the order in
  // which a directory was read, nearly each removal would write one.
  int RemoveAll(std::vector<const Entry*> leaving);

  uint64_t changes = 0;      // rows changed since Prepare
  int64_t entries = 0;       // rows, as this transaction sees them
  int64_t inserted = 0;      // `id` of the row that Insert made last
  int64_t last_written = 0;  // greater than each `written`; of the last commit, once it is made
  sqlite3* handle = nullptr;

 private:
  int64_t NextStamp();
  void BindAttributes(Statement& statement, int column, const Entry& entry, bool reread);
  static int CollectPaths(Statement& statement, std::vector<std::string>& paths);
  int RunTexts(Statement& name, Statement& part, int64_t id, const std::string& path);
  int GiveBackPages();

  Statement begin, commit, read_meta, write_meta, free_pages, give_back;
  Statement find, next, row, below, slice, twins, other_paths;
  Statement insert, update, remove;
  Statement insert_name, insert_part, remove_name, remove_part;
  NameFolder folder;
  int64_t removed = 0;  // rows since room was last given back, the same
};

}  // namespace fileindexd
