// SPDX-License-Identifier: GPL-2.0-or-later
// The best hits so far, a bounded number of them however many there are.
#pragma once

#include <cstdint>
#include <vector>

#include "index/search.h"

namespace fileindexd {

// The order in which hits are shown. Two are never equal: a path stands in one share once.
struct HitOrder {
  SortBy sort = SortBy::SCORE;
  bool reverse = false;

  bool operator()(const Hit& a, const Hit& b) const;
};

class BestHits {
 public:
  BestHits(uint64_t wanted_hits, const HitOrder& in_order) : order(in_order), wanted(wanted_hits) {}

  void Add(Hit&& hit);
  void Cut();  // to those that are wanted, in order
  // Where age alone decides: whether as many as are wanted are younger than that.
  bool AreYounger(int64_t mtime) const;

  std::vector<Hit> hits;
  HitOrder order;
  uint64_t wanted;

 private:
  bool are_full = false;  // the first of `hits` are the best of all but those behind them, in order
};

}  // namespace fileindexd
