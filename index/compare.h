// SPDX-License-Identifier: GPL-2.0-or-later
// Comparison of an index with the disk: a walk and the entries in step, both streaming in byte
// order of the paths. Memory grows with the largest directory and the depth, not with the share.
#pragma once

#include <cstdint>
#include <functional>
#include <string>

#include "index/entry.h"
#include "state/store.h"

namespace fileindexd {

enum class Difference {
  MISSING,    // on disk, belongs, not in the index
  LEFT_OVER,  // in the index, gone from the disk or no longer belonging
  STALE,      // attributes or the kind of thing differ
  CONTENT,    // content is wanted and should not be, or the other way
};
// "missing", "left-over", "stale", "content".
const char* DifferenceText(Difference difference);

struct Comparison {
  uint64_t entries = 0;  // entries read
  uint64_t seen = 0;     // things on disk that belong
  uint64_t differences = 0;
};

// Compares share `share_name` under the settings in force and calls `report` with each difference,
// until it returns false. False when the comparison could not be made (root missing or foreign,
// index unreadable), and `error` then says why; differences reported before still hold.
bool CompareShare(StateStore& store, const std::string& share_name,
                  const std::function<bool(Difference, const std::string& path)>& report,
                  Comparison& result, std::string& error);

}  // namespace fileindexd
