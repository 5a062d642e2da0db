// SPDX-License-Identifier: GPL-2.0-or-later
// One comparison of one share, in pieces, and what mends it.
#pragma once

#include <chrono>
#include <memory>
#include <string>
#include <vector>

#include "index/compare.h"
#include "index/reader.h"
#include "index/repair.h"
#include "notify/healer.h"
#include "state/progress.h"

namespace fileindexd {

// One thread. The store outlives it.
class ShareComparison {
 public:
  // `patience`: how long it waits for what is being written to end.
  ShareComparison(StateStore& state, const std::string& share_name,
                  std::chrono::milliseconds patience = std::chrono::milliseconds::max());
  ShareComparison(const ShareComparison&) = delete;
  ShareComparison& operator=(const ShareComparison&) = delete;

  // Goes on for about a tenth of a second. False when there is nothing more to do: `healing` is
  // then complete.
  bool GoOn();

  Healing healing;

 private:
  bool MayBegin();
  bool HasWriterEnded();
  bool Begin();
  bool Fail(const std::string& why);
  void Finish();

  StateStore& store;
  std::chrono::milliseconds writer_patience;  // that is left
  Comparer comparer;
  std::shared_ptr<const Settings> settings;  // outlives `repair`, as does `reader`
  EntryReader reader;                        // counts for the repair, beside the comparison's own
  std::unique_ptr<Repair> repair;
  ProgressWriter progress;
  std::vector<std::string> deletes;  // that waited in the queue when it began
  bool mended = true;
  uint64_t piece;  // paths
};

}  // namespace fileindexd
