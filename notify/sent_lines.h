// SPDX-License-Identifier: GPL-2.0-or-later
// Lines of a queue file that the daemon has not taken yet, and what becomes of them in one batch.
//
// A delete takes the entry away whatever the disk holds by then, and the daemon executes a batch
// from the top of its tree downwards: a delete that was queued before the reindex of a directory
// above it is executed after it, and takes away what came back with that directory. So whoever
// queues such a line has the deletes below it looked at again, and so does whoever compared.
//
// Of two lines at one path mostly the later is executed alone. An update displaces the walk of a
// directory that a rename brought, and the reading anew of a file that was written to: it has to
// ask for that as well. An update of a subtree is the other way: it swallows whatever comes behind
// it.
#pragma once

#include <set>
#include <string>
#include <vector>

#include "state/queue_folding.h"
#include "state/queued_lines.h"
#include "state/settings.h"

namespace fileindexd {

// Of one share. One thread.
class SentLines {
 public:
  // The lines were taken, or there is a new queue file.
  void Forget();
  // In the order of the file.
  void Note(const QueuedLine& line);

  // Lines that ask for what `line` does and for what it would displace, or be swallowed with.
  std::vector<QueueLine> WithDisplaced(const QueueLine& line) const;
  // For a line that has the daemon look at a directory and all below it: the lines to be queued
  // behind it, for what is there again.
  std::vector<QueueLine> LinesBehind(const Settings& settings, const QueueLine& line) const;
  // As it is to stand in the file.
  QueuedLine Written(const QueueLine& line) const;

 private:
  using Paths = std::set<std::string, ByComponents>;

  Paths deleted;
  Paths renamed;  // to there
  Paths written;
  QueuedUpdates updates;
};

// Lines for those of the paths that are there, sorted paths being the quickest.
std::vector<QueueLine> LinesOfReturned(const Settings& settings,
                                       const std::vector<std::string>& paths);

}  // namespace fileindexd
