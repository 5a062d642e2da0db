// SPDX-License-Identifier: GPL-2.0-or-later
// The queue lines that mend what a comparison found.
//
//   difference                                line                       mends also
//   missing file or link                      modify
//   missing directory                         reindex                    all below it
//   stale, a directory before or now          reindex                    all below it
//   stale, left over                          modify
//   left-over directory that is gone          reindex                    all below it
//   left-over directory that does not belong  modify                     what is left over below it
//   content                                   reindex                    stale at the same path
//
// The lines are about what was seen some time ago. Modify and reindex look at what is there when
// they are executed, and go on to do so whatever they displace at the same path in the batch. The
// others do not: a delete takes the entry away of a file that has come back, an add passes over
// what is gone by then, as does the update of a subtree.
#pragma once

#include <string>
#include <vector>

#include "index/compare.h"
#include "index/reader.h"
#include "state/queue_folding.h"

namespace fileindexd {

class Repair {
 public:
  // All three outlive it; the reader is open. One thread. Memory is bounded by `lines_kept`.
  Repair(const Settings& in_force, const Share& of_share, EntryReader& entries,
         size_t lines_kept = QUEUE_LINE_LIMIT);

  // Differences come in byte order of the paths, but what is missing may come at any time. False
  // for an entry that lies outside the share, where no event reaches it.
  bool Add(const Found& found);

  bool IsEmpty() const { return folding.Size() == 0; }

  // At most `most` lines, or one; sorted, see QueueFolding::Lines.
  std::vector<QueueLine> Lines(size_t most) { return folding.Lines(most); }

 private:
  void AddLeftOver(const Found& found);
  void AddLeftOverDirectory(const std::string& path);

  const Settings& settings;
  const Share& share;
  QueueFolding folding;
  std::vector<std::string> emptied;  // left-over directories whose line takes along those below
};

}  // namespace fileindexd
