// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/promise_order.h"

#include <algorithm>
#include <functional>

namespace fileindexd {

int64_t PromiseOrder::Next() {
  if (next.empty()) {
    Collect();
  }
  if (next.empty()) {
    return -1;
  }
  given = next.back();
  is_new = false;
  next.pop_back();
  return given.second;
}

bool PromiseOrder::WasGiven(int64_t id) const {
  return !is_new && Place(promise(id), id) >= given;
}

void PromiseOrder::Collect() {
  constexpr size_t GROWTH = 8;
  const auto cut = [this] {
    const auto end = next.begin() + static_cast<std::ptrdiff_t>(most);
    std::nth_element(next.begin(), end, next.end(), std::greater<>());
    next.erase(end, next.end());
  };
  for (int64_t id = ids.Next(-1); id >= 0; id = ids.Next(id)) {
    const Place place(promise(id), id);
    if (is_new || place < given) {
      next.push_back(place);
    }
    if (next.size() == 2 * most) {
      cut();
    }
  }
  if (next.size() > most) {
    cut();
  }
  std::sort(next.begin(), next.end());
  most *= GROWTH;
}

}  // namespace fileindexd
