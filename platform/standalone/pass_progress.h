// SPDX-License-Identifier: GPL-2.0-or-later
// How far the Worker of each share is with its pass, for people.
//
// A pass is an update, told by the number of its changes, until it indexes a directory again: from
// then on a reindex, told by the number of entries, of about as many as the index holds. A reindex
// of the share, or of an indexed folder, of which the index holds nothing is a first index; both
// are shown at once, everything else when it lasts longer than a second.
#pragma once

#include <cstdint>
#include <mutex>
#include <string>
#include <vector>

#include "state/progress.h"

namespace fileindexd {

// Thread-safe. With cancellation off. Counting takes a lock that nobody else wants.
class PassProgress {
 public:
  explicit PassProgress(const std::string& name)
      : share_name(name), writer(WorkerProgressPath(name)) {}

  // All that is known at and below `path` is about to be looked at, all that is there to be added.
  void BeginReindex(const std::string& path);
  void BeginShareReindex();
  void Count();  // one operation more
  // In the middle of a long operation.
  void Look();
  void End();

 private:
  void Begin(const std::string& path, bool at_once);
  void AddTotal(const std::string& path);
  void Write();

  std::mutex mutex;  // guards what follows
  const std::string share_name;
  ProgressWriter writer;
  std::string begun;                   // the path that a reindex began at last
  std::vector<std::string> uncounted;  // begun, and what is known there is not in the total yet
};

// Of the process; never destroyed.
PassProgress& ProgressOf(const std::string& share_name);

}  // namespace fileindexd
