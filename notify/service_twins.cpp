// SPDX-License-Identifier: GPL-2.0-or-later
//
// DESIGN. A file with several names changes under all of them, and only one is told. What tells
// that there may be others: the change was made by a name that no share took; or what was changed
// has more names when it is looked at, or is no longer there. Its entries are then searched for in
// all shares of its file system.
#include <vector>

#include "notify/log.h"
#include "notify/service.h"

namespace fileindexd {

void Service::AddToDevice(const std::string& device, uint64_t inode) {
  for (auto& [name, share] : shares) {
    const ShareWatch& watch = watches.shares.at(name);
    if (watch.by == WatchedBy::FANOTIFY && watch.place.device == device) {
      share->twins.Add(inode, Twins::Asking::TWICE);
    }
  }
}

void Service::NoteChangedFile(const std::string& name, const ChangedFile& file) {
  const ShareWatch& watch = watches.shares.at(name);
  bool is_known = false;  // that the file at the path was what was changed
  for (const std::string& target : file.targets) {
    FanGroup::Target thing;
    if (!watches.LookAtTarget(name, target, thing)) {
      LogDebug("share %s: a changed file cannot be looked at: %m", name.c_str());
    } else if (thing.links > 0 && thing.inode != file.inode) {
      AddToDevice(watch.place.device, thing.inode);
    } else {
      is_known = is_known || thing.links > 0;
    }
  }
  if (file.links < 2 || (!file.targets.empty() && !is_known)) {
    return;
  }

  // The share's own line refreshes its entries of the file together, unless the name that the line
  // tells of is gone when it is executed.
  for (auto& [other_name, other] : shares) {
    const ShareWatch& other_watch = watches.shares.at(other_name);
    if (other_name == name) {
      other->twins.Add(file.inode, Twins::Asking::LATER);
    } else if (watch.by == WatchedBy::FANOTIFY && other_watch.by == WatchedBy::FANOTIFY &&
               other_watch.place.device == watch.place.device) {
      other->twins.Add(file.inode, Twins::Asking::TWICE);
    }
  }
}

void Service::SearchTwins(Clock::time_point now) {
  for (auto& [name, share] : shares) {
    for (const ChangedFile& file : share->feed.TakeChanged()) {
      NoteChangedFile(name, file);
    }
  }
  for (auto& [name, share] : shares) {
    if (watches.shares.at(name).by == WatchedBy::NOBODY) {
      share->twins.Clear();
      continue;
    }
    const auto is_indexed_anew = [this, &name = name] {
      ShareStatus status;
      return store->GetStatus(name, status) && (status.needs_reindex || status.reindex_begun);
    };
    std::vector<QueueLine> lines;
    share->twins.Pump(*settings, now, !syncing.empty(), is_indexed_anew, lines);
    if (!lines.empty()) {
      share->feed.AddLines(*settings, lines);
      share->feed.Work(*settings, now);
    }
    if (share->twins.TakeLoss()) {
      LogInfo("share %s: more files with other names were changed than are kept", name.c_str());
      WantComparison(name, "changes by other names were lost");
    }
  }
}

}  // namespace fileindexd
