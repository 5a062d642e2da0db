// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/repair.h"

#include "base/event_codes.h"
#include "index/entry_table.h"
#include "state/layout.h"

namespace fileindexd {

Repair::Repair(const Settings& in_force, const Share& of_share, EntryReader& entries,
               size_t lines_kept)
    : settings(in_force),
      share(of_share),
      folding(
          of_share.path,
          [&entries](const std::string& directory, uint64_t limit) {
            uint64_t below = 0;
            return entries.CountBelow(directory, limit, below) ? below : limit;
          },
          lines_kept) {}

bool Repair::Add(const Found& found) {
  if (!Covers(share.path, found.path)) {
    return false;
  }

  const bool was_directory = found.known == Thing::DIRECTORY;
  const bool is_directory = found.seen == Thing::DIRECTORY;
  switch (found.difference) {
    case Difference::MISSING:
      folding.Add(is_directory ? CUSTOM_EVENT_REINDEX : QLIB_NOTIFY_MODIFY, found.path);
      break;
    case Difference::LEFT_OVER:
      AddLeftOver(found);
      break;
    case Difference::STALE:
      folding.Add(was_directory || is_directory ? CUSTOM_EVENT_REINDEX : QLIB_NOTIFY_MODIFY,
                  found.path);
      break;
    case Difference::CONTENT:
      // Of a directory only its own entry is meant.
      if (is_directory) {
        folding.Add(QLIB_NOTIFY_MODIFY, found.path);
      } else {
        folding.Add(CUSTOM_EVENT_REINDEX, found.path);
      }
      break;
  }
  return true;
}

void Repair::AddLeftOver(const Found& found) {
  while (!emptied.empty() && PathRange(emptied.back()).EndsBefore(found.path)) {
    emptied.pop_back();
  }
  for (const std::string& directory : emptied) {
    if (Covers(directory, found.path)) {
      return;
    }
  }

  if (found.known == Thing::DIRECTORY) {
    AddLeftOverDirectory(found.path);
  } else {
    folding.Add(QLIB_NOTIFY_MODIFY, found.path);
  }
}

// A reindex of a directory that is there would walk all of it, for nothing if it does not belong.
void Repair::AddLeftOverDirectory(const std::string& path) {
  if (folding.IsTakenIn(path)) {
    return;
  }
  const Verdict verdict = LookAt(settings, path).verdict;
  if (verdict == Verdict::GONE || verdict == Verdict::BELONGS || verdict == Verdict::UNKNOWN) {
    folding.Add(CUSTOM_EVENT_REINDEX, path);
    return;
  }
  folding.Add(QLIB_NOTIFY_MODIFY, path);
  emptied.push_back(path);
}

}  // namespace fileindexd
