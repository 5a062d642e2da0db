// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/text_order.h"

#include <algorithm>
#include <functional>

namespace fileindexd {

int64_t TextOrder::Next() {
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

bool TextOrder::WasGiven(int64_t text) const {
  return !is_new && Place(sets.Promise(text), text) >= given;
}

void TextOrder::Collect() {
  constexpr size_t GROWTH = 8;
  const auto cut = [this] {
    const auto end = next.begin() + static_cast<std::ptrdiff_t>(most);
    std::nth_element(next.begin(), end, next.end(), std::greater<>());
    next.erase(end, next.end());
  };
  for (int64_t text = texts.Next(-1); text >= 0; text = texts.Next(text)) {
    const Place place(sets.Promise(text), text);
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
