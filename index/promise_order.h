// SPDX-License-Identifier: GPL-2.0-or-later
// Rowids in the order of what they promise (see WordSets), among equals the greatest first: what
// was read last. Only as many as are asked for are put in order: of ten million, a page needs a few
// hundred.
#pragma once

#include <cstdint>
#include <functional>
#include <utility>
#include <vector>

#include "index/id_set.h"

namespace fileindexd {

class PromiseOrder {
 public:
  using Promise = std::function<double(int64_t id)>;  // the same each time that it is asked

  // `of_ids` outlives it. What was given may be taken out of them.
  PromiseOrder(const IdSet& of_ids, Promise with_promise)
      : ids(of_ids), promise(std::move(with_promise)) {}

  int64_t Next();                   // -1: no more
  bool WasGiven(int64_t id) const;  // of those that are, or were, among them

 private:
  using Place = std::pair<double, int64_t>;  // the greater comes first

  void Collect();

  const IdSet& ids;
  const Promise promise;
  std::vector<Place> next;  // behind `given`, the first of them last
  size_t most = 1024;       // of them; all are looked at for each such piece
  bool is_new = true;
  Place given;  // the last
};

}  // namespace fileindexd
