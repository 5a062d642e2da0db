// SPDX-License-Identifier: GPL-2.0-or-later
// Delete lines that may not have been executed yet.
//
// A delete takes the entry away whatever the disk holds by then, and the daemon executes a batch
// from the top of its tree downwards: a delete that was queued before the reindex of a directory
// above it is executed after it, and takes away what came back with that directory. So whoever
// queues such a line has the deletes below it looked at again, and so does whoever compared.
#pragma once

#include <set>
#include <string>
#include <vector>

#include "state/queue_folding.h"
#include "state/settings.h"

namespace fileindexd {

// Of one share. One thread.
class SentDeletes {
 public:
  // The lines were taken, or there is a new queue file.
  void Forget() { paths.clear(); }
  void Note(const QueueLine& line);

  // For a line that has the daemon look at a directory and all below it: the lines to be queued
  // behind it, for what is there again.
  std::vector<QueueLine> LinesBehind(const Settings& settings, const QueueLine& line) const;

 private:
  std::set<std::string, ByComponents> paths;
};

// Paths of the delete lines in the share's queue file and its drained copy, whoever wrote them.
// What cannot be read is passed over.
std::vector<std::string> QueuedDeletes(const std::string& share_name);

// Lines for those of the paths that are there, sorted paths being the quickest.
std::vector<QueueLine> LinesOfReturned(const Settings& settings,
                                       const std::vector<std::string>& paths);

}  // namespace fileindexd
