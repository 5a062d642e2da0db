// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/best_hits.h"

#include <algorithm>
#include <string_view>
#include <utility>

#include "index/entry_table.h"

namespace fileindexd {

namespace {

// Less than 0: `a` stands before `b`.
int Compare(int64_t a, int64_t b) {
  return a < b ? -1 : a > b ? 1 : 0;
}

int CompareBy(SortBy sort, const Hit& a, const Hit& b) {
  switch (sort) {
    case SortBy::SCORE:
      return a.score != b.score ? (a.score > b.score ? -1 : 1)
                                : Compare(b.entry.mtime, a.entry.mtime);
    case SortBy::NAME:
      return LastComponent(a.entry.path).compare(LastComponent(b.entry.path));
    case SortBy::SIZE:
      return Compare(b.entry.size, a.entry.size);
    case SortBy::MODIFIED:
      return Compare(b.entry.mtime, a.entry.mtime);
  }
  return 0;
}

}  // namespace

bool HitOrder::operator()(const Hit& a, const Hit& b) const {
  const int key = CompareBy(sort, a, b);
  if (key != 0) {
    return reverse ? key > 0 : key < 0;
  }
  return a.entry.path != b.entry.path ? a.entry.path < b.entry.path : a.share < b.share;
}

// Hits are many and large: what stands behind as many as are wanted is not even moved.
void BestHits::Add(Hit&& hit) {
  constexpr uint64_t SLACK = 64;
  if (wanted == 0 || (are_full && !order(hit, hits[wanted - 1]))) {
    return;
  }
  hits.push_back(std::move(hit));
  if (hits.size() > wanted && hits.size() - wanted > wanted + SLACK) {
    Cut();
  }
}

void BestHits::Cut() {
  const auto kept = static_cast<std::ptrdiff_t>(std::min<uint64_t>(wanted, hits.size()));
  std::partial_sort(hits.begin(), hits.begin() + kept, hits.end(), order);
  hits.erase(hits.begin() + kept, hits.end());
  are_full = hits.size() == wanted;
}

bool BestHits::AreYounger(int64_t mtime) const {
  return are_full && wanted > 0 && mtime < hits[wanted - 1].entry.mtime;
}

}  // namespace fileindexd
