// SPDX-License-Identifier: GPL-2.0-or-later
// Texts in the order of what they promise (see WordSets), among equals what was read last. Only as
// many as are asked for are put in order: of ten million, a page needs a few hundred.
#pragma once

#include <cstdint>
#include <utility>
#include <vector>

#include "index/word_sets.h"

namespace fileindexd {

class TextOrder {
 public:
  // Both outlive it.
  TextOrder(const IdSet& in_texts, const WordSets& of_sets) : texts(in_texts), sets(of_sets) {}

  int64_t Next();                     // -1: no more
  bool WasGiven(int64_t text) const;  // of those that are among them

 private:
  using Place = std::pair<double, int64_t>;  // the greater comes first

  void Collect();

  const IdSet& texts;
  const WordSets& sets;
  std::vector<Place> next;  // behind `given`, the first of them last
  size_t most = 1024;       // of them; all are looked at for each such piece
  bool is_new = true;
  Place given;  // the last
};

}  // namespace fileindexd
