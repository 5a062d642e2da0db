// SPDX-License-Identifier: GPL-2.0-or-later
// Changes of one share that wait for their look, each path once; see share_feed.h for how long.
#pragma once

#include <chrono>
#include <cstdint>
#include <deque>
#include <optional>
#include <set>
#include <string>
#include <unordered_map>
#include <utility>
#include <vector>

#include "notify/change.h"
#include "state/belonging.h"
#include "state/queue_folding.h"
#include "state/settings.h"

namespace fileindexd {

// A file that was changed at a path of the share and may have other names, as it was found when the
// path was looked at.
struct ChangedFile {
  std::vector<std::string> targets;  // handles of what was changed there; none where the watch
                                     // cannot tell
  uint64_t inode = 0;                // of what is there now and belongs; 0: nothing
  uint64_t links = 0;                // names that it has
};

// One thread. Takes the time from its callers.
class Gatherer {
 public:
  using Clock = std::chrono::steady_clock;
  using Time = Clock::time_point;

  explicit Gatherer(std::string name_of_share) : share(std::move(name_of_share)) {}
  Gatherer(const Gatherer&) = delete;
  Gatherer& operator=(const Gatherer&) = delete;

  // Takes in a change, if a path of it belongs to the share by its letters, or is a directory above
  // an indexed folder that comes or goes with it; then each such folder is looked at.
  //
  // Renames go on from each other: a to b to c is one from a to c, and back to a none. What is
  // gathered below a renamed directory stays and is looked at by its old name: what is gone there
  // becomes a delete, and the rename's line has the daemon walk the new place anyway.
  void Add(const Settings& settings, const Change& change, Time now);

  // Looks at what is due, or at everything, and adds its lines to `lines`. What is not looked at by
  // the deadline stays.
  void TakeDue(const Settings& settings, Time now, bool everything, std::vector<QueueLine>& lines,
               Time deadline = Time::max());

  // What TakeDue has found, and the changes that were too many to be kept for it. Whoever has them
  // empties it.
  std::vector<ChangedFile> changed;

  // None when nothing is gathered.
  std::optional<Time> NextDue() const;

  size_t Size() const { return pending.size(); }
  size_t Bytes() const { return bytes; }  // of paths and handles
  void Clear();

  uint64_t changes = 0;  // taken in
  uint64_t folded = 0;   // that met another one at their path, or came to nothing

 private:
  struct Pending {
    uint32_t what = 0;  // of Happening
    bool directory = false;
    std::string from;                  // of a rename
    bool changed = false;              // itself, and not its name alone
    std::vector<std::string> targets;  // handles of what was changed; a few, each once
    Time first;
    Time due;
  };
  using PendingMap = std::unordered_map<std::string, Pending>;

  bool Belongs(const Settings& settings, const std::string& path) const;
  bool AddFoldersBelow(const Settings& settings, const std::string& path, Time now);
  void AddRename(const Change& change, Time now);
  Pending& Gather(const std::string& path, uint32_t what, bool directory, Time now);
  void AddTarget(Pending& entry, const std::string& target);
  void NoteChanged(Pending& looked_at, const Look& look);
  static size_t BytesOf(const std::string& path, const Pending& entry);
  void SetFrom(Pending& rename, const std::string& from);
  void Drop(PendingMap::iterator dropped);

  Time DueOf(const std::string& path, const Pending& entry, Time now);
  Time Soon(Time now);
  void CountIntoBatch(size_t length, Time due, Time now);
  bool IsBusy(Time now) const;
  void NoteModify(const std::string& path, Time now);
  std::vector<PendingMap::node_type> TakeUntil(Time until);
  void PutBack(PendingMap::node_type&& entry);

  const std::string share;
  PendingMap pending;
  std::set<std::pair<Time, const std::string*>> by_due;  // all of `pending`
  size_t bytes = 0;

  std::deque<Time> recent;         // when the last lines were made, a load's worth at most
  Time batch_due;                  // of what is gathered under load
  size_t batch_bytes = 0;          // of paths in that batch
  std::optional<Time> batch_full;  // since when it is due before its time
  std::unordered_map<std::string, Time> modified;  // files held open, and their last modify line
  size_t modified_bytes = 0;
};

}  // namespace fileindexd
