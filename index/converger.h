// SPDX-License-Identifier: GPL-2.0-or-later
// Brings entries in line with the disk, inside the caller's transaction.
//
// Nothing is removed unless the share's root is sound after the path was found gone, and nothing is
// added from a mount that was not seen below a sound root: an unmounted disk must not empty an
// index, nor what lies under its mount point fill it. An operation that fails may have changed rows
// already: `EntryTable::changes` tells, and the caller rolls back.
#pragma once

#include <functional>
#include <set>
#include <string>
#include <vector>

#include "index/database.h"
#include "index/entry_table.h"
#include "index/writer.h"

namespace fileindexd {

class Converger {
 public:
  // Both outlive it. `between_slices` may unwind.
  Converger(EntryTable& rows, const std::function<void()>& between_slices)
      : table(rows), between(between_slices) {}

  // `path` is normal and lies in `in_share`, one of `in_force`; both stay for the length of the
  // call. `seen` and `below` as for EntryWriter::Refresh. `added`: somebody wrote to it, so the
  // content counts as another when anything about it is.
  IndexError Refresh(const Settings& in_force, const Share& in_share, const std::string& path,
                     const ContentFlags& wanted, const ContentFlags& decide, const Look* seen,
                     bool added, Below below);
  IndexError Delete(const Settings& in_force, const Share& in_share, const std::string& path,
                    DeleteMode mode);

  bool sql_failed = false;  // whether the last failure was the database's

 private:
  static constexpr int SLICE = 500;  // rows, or things on disk, between two calls of `between`
  // NEW_ABOVE: new, with entries below that are left from a deletion of this entry alone.
  enum class Outcome { SAME, CHANGED, NEW, NEW_ABOVE, REPLACED };

  IndexError Sql(int code);
  IndexError CheckRoot();
  IndexError CheckMount(const Look& look);

  IndexError Settle(const std::string& path, const Look& look, const ContentFlags& wanted,
                    const ContentFlags& decide, Below below);
  IndexError Put(const std::string& path, const Look& look, const ContentFlags& wanted,
                 const ContentFlags& decide, Outcome& outcome);
  IndexError Change(const Entry& known, const Look& look, const ContentFlags& wanted,
                    const ContentFlags& decide, Outcome& outcome);

  IndexError NoteTwins(const std::string& path, const Look& look, bool is_new);
  IndexError NoteOtherPaths(const Entry& entry, const Look& look);
  IndexError SettleOtherPaths();

  using SliceStep = std::function<IndexError(const std::vector<Entry>& rows)>;
  IndexError ForEachSliceBelow(const std::string& path, const SliceStep& step);
  IndexError LookBelow(const std::string& path, std::vector<std::string>& replaced);
  IndexError SettleSlice(const std::vector<Entry>& rows, std::vector<std::string>& replaced);
  IndexError AddBelow(const std::string& directory);

  IndexError NoteLinks(const Entry& removed);
  IndexError RemoveAt(const std::string& path, bool root_counts);
  IndexError RemoveBelow(const std::string& path, bool even_what_belongs);
  IndexError RemoveFromSlice(const std::string& path, const std::vector<Entry>& rows,
                             bool even_what_belongs);

  bool IsLookedAt(const std::string& path) const;

  EntryTable& table;
  const std::function<void()>& between;
  const Settings* settings = nullptr;  // of the operation that runs
  const Share* share = nullptr;
  const std::string* added_path = nullptr;  // of the operation, if it is an add
  bool mount_known = false;
  uint64_t mount_id = 0;  // last mount and device that were seen below a sound root
  uint64_t device = 0;
  std::vector<std::string> other_paths;  // of what the operation added, changed or removed
  std::set<std::string> looked_at;       // subtrees, where the file system has no birth times
};

}  // namespace fileindexd
