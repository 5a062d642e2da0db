// SPDX-License-Identifier: GPL-2.0-or-later
// Lines of a queue file that the daemon has not taken yet, and what becomes of them in one batch.
//
// A delete takes the entry away whatever the disk holds by then, and the daemon executes a batch
// from the top of its tree downwards: a delete that was queued before the reindex of a directory
// above it is executed after it, and takes away what came back with that directory. So whoever
// queues such a line has the deletes below it looked at again, and so does whoever compared.
//
// A rename has the directory walked that it brought, and a later line about that directory itself
// takes the place of the walk: it has to ask for one as well.
#pragma once

#include <json/json.h>

#include <memory>
#include <set>
#include <string>
#include <string_view>
#include <vector>

#include "state/queue_folding.h"
#include "state/settings.h"

namespace fileindexd {

// Reads lines as whoever wrote them. One thread.
class LineReader {
 public:
  LineReader();
  // Event and normal path alone. False for what is no event.
  bool Read(std::string_view text, QueueLine& line) const;

 private:
  std::unique_ptr<Json::CharReader> reader;
};

// Of one share. One thread.
class SentLines {
 public:
  // The lines were taken, or there is a new queue file.
  void Forget();
  // In the order of the file.
  void Note(const QueueLine& line);

  // The line that asks for what `line` does, and for what it would displace.
  QueueLine WithDisplaced(const QueueLine& line) const;

  // For a line that has the daemon look at a directory and all below it: the lines to be queued
  // behind it, for what is there again.
  std::vector<QueueLine> LinesBehind(const Settings& settings, const QueueLine& line) const;

 private:
  using Paths = std::set<std::string, ByComponents>;

  Paths deleted;
  Paths renamed;  // to there
};

// Paths of the delete lines in the share's queue file and its drained copy, whoever wrote them.
// What cannot be read is passed over.
std::vector<std::string> QueuedDeletes(const std::string& share_name);

// Lines for those of the paths that are there, sorted paths being the quickest.
std::vector<QueueLine> LinesOfReturned(const Settings& settings,
                                       const std::vector<std::string>& paths);

}  // namespace fileindexd
