// SPDX-License-Identifier: GPL-2.0-or-later
// The numbers of one share: a walk through its entries in the order in which they lie on disk, and
// another one where there are more names of groups than are kept.
#pragma once

#include <memory>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "index/read_transaction.h"
#include "index/reader.h"
#include "index/statistics.h"

namespace fileindexd {

// A share that is being read: one state of its entries, and of its contents if there are any.
class OpenShare {
 public:
  explicit OpenShare(const Share& opened) : share(opened) {}

  // False when the entries cannot be read. Each trouble adds its line, that with contents too: the
  // entries are good without them. A share that is not indexed yet is none.
  bool Open(bool with_contents, std::vector<std::string>& failures);

  Share share;
  bool has_contents = false;
  EntryReader reader;

 private:
  std::unique_ptr<ReadTransaction> transaction;  // goes before the connection
};

// An entry as statistics see it.
struct CountedEntry {
  std::string_view path;
  Thing thing = Thing::NONE;
  Kind kind = Kind::OTHER;
  int64_t owner = 0;
  int64_t mtime = 0;
  int64_t born = 0;
  int64_t size = 0;
  bool is_further_name = false;  // of a file that counted already
};

// Groups by their names, at most twice MOST_GROUPS of them: of more, the lesser half goes. What has
// gone may come again, so after that only a second count is right.
class GroupCounts {
 public:
  void Add(std::string_view name, const CountedEntry& entry);
  // Once all were added. True when all have to be added again, now to the greatest names alone.
  bool Settle();

  std::unordered_map<std::string, EntryGroup> groups;

 private:
  void KeepGreatest();

  bool was_cut = false;
  bool is_settled = false;  // no name comes any more
  std::string key;          // kept for its memory
};

class StatisticsScan {
 public:
  StatisticsScan(const StatisticsWish& asked, OpenShare& opened) : wish(asked), open(opened) {}

  int Run();  // SQLite's code; the results are whole only after SQLITE_OK

  ShareTotals totals;
  GroupCounts groups;
  GroupCounts born;
  std::vector<LargeFile> largest;

 private:
  int FindFurtherNames();
  int Walk(void (StatisticsScan::*count)(const CountedEntry& entry));
  std::string EntriesSql() const;
  void Count(const CountedEntry& entry);
  void CountTotals(const CountedEntry& entry);
  void CountGroups(const CountedEntry& entry);
  void CountGroup(const CountedEntry& entry);
  void CountLarge(const CountedEntry& entry);
  std::string_view FolderOf(const CountedEntry& entry) const;

  const StatisticsWish& wish;
  OpenShare& open;
  std::vector<int64_t> further_names;  // rowids, ascending
  bool counts_groups = true;
  bool counts_born = true;
};

// "pdf" of "a.PDF"; empty where there is none: no dot but at the front, or nothing like an ending
// behind it.
std::string ExtensionOf(std::string_view path);
const char* AgeName(int64_t mtime, int64_t now);  // nanoseconds

// In the order in which they are told.
bool IsGreater(const EntryGroup& a, const EntryGroup& b);
bool IsLarger(const LargeFile& a, const LargeFile& b);

}  // namespace fileindexd
