// SPDX-License-Identifier: GPL-2.0-or-later
// What is on the way to a share's index: what waits in its queue for a path, and whether something
// makes an index that is not there.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "state/settings.h"
#include "state/store.h"

namespace fileindexd {

struct PendingEvent {
  std::string event;  // names joined by "|", see EventNames
  std::string path;   // as the line has it
  std::string path_old;
  bool above = false;  // the event is of a folder that holds the path
  bool begun = false;  // in the drained copy: a Worker has taken it
};

struct Pending {
  std::vector<PendingEvent> events;  // of the path itself and of folders above it, oldest first
  uint64_t below = 0;                // events of what lies below the path, counted
};

// Reads the queue and its drained copy without a lock: a line that is being written is passed over,
// and one that is taken meanwhile may be missed. `path` is normal.
Pending ReadPending(const std::string& share_name, const std::string& path);

// Whether a share's index would have to be there: it has indexed folders, and nothing is on the way
// that makes one, no line in its queue, no reindex that was asked for, and no Worker at work.
bool IsIndexExpected(StateStore& store, const Settings& settings, const std::string& share_name);
// Whether that share has no folder for one.
bool IsIndexLost(StateStore& store, const Settings& settings, const std::string& share_name);

}  // namespace fileindexd
