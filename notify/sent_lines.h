// SPDX-License-Identifier: GPL-2.0-or-later
// Lines of a queue file that the daemon has not taken yet, and what becomes of them in one batch.
//
// A delete takes the entry away whatever the disk holds by then, and the daemon executes a batch
// from the top of its tree downwards: a delete that was queued before the reindex of a directory
// above it may be executed after it, and takes away what came back with that directory. So the
// service has the deletes below such a line looked at again, and those that wait when it compared.
//
// Of two lines at one path mostly the later is executed alone. A modify, or a change of attributes,
// displaces the walk of a directory that a rename brought, and the reading anew of a file that was
// written to: a line that asks for that takes its place. An update of a subtree is the other way:
// it swallows whatever comes behind it.
#pragma once

#include <set>
#include <string>
#include <vector>

#include "state/queue_content.h"
#include "state/queue_folding.h"
#include "state/settings.h"

namespace fileindexd {

// Of one share. One thread.
class SentLines {
 public:
  // The lines were taken, or there is a new queue file.
  void Forget();
  // In the order of the file.
  void Note(const LineInFile& line);

  // Lines in the place of `line`, that ask for what it does and for what it would displace, or for
  // what would be swallowed.
  std::vector<QueueLine> InPlaceOf(const QueueLine& line) const;
  // For a line that has the daemon look at a directory and all below it: the lines to be queued
  // behind it, for what is there again.
  std::vector<QueueLine> LinesBehind(const Settings& settings, const QueueLine& line) const;
  std::string PathInFile(const QueueLine& line) const;

 private:
  using Paths = std::set<std::string, ByComponents>;

  Paths deleted;
  Paths renamed;  // to there
  Paths written;  // made, or closed after writing: to be read anew
  WaitingUpdates updates;
};

// Lines for those of the paths that are there, sorted paths being the quickest.
std::vector<QueueLine> LinesOfReturned(const Settings& settings,
                                       const std::vector<std::string>& paths);

}  // namespace fileindexd
