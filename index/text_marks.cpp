// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/text_marks.h"

#include <algorithm>
#include <cmath>

namespace fileindexd {

void TextMarks::Add(int64_t text, uint32_t mark) {
  const auto at = static_cast<size_t>(text);
  const size_t number = at / CHUNK_TEXTS;
  if (number >= places.size()) {
    places.resize(std::max(number + 1, places.size() * 2));
  }
  if (places[number] == 0) {
    chunks.emplace_back();
    places[number] = static_cast<uint32_t>(chunks.size());
  }
  uint16_t& sum = chunks[places[number] - 1][at % CHUNK_TEXTS];
  sum = static_cast<uint16_t>(std::min<uint64_t>(MOST, uint64_t{sum} + mark));
}

void TextMarks::AddAll(const TextMarks& others, double factor) {
  for (size_t number = 0; number < others.places.size(); ++number) {
    if (others.places[number] == 0) {
      continue;
    }
    const Chunk& chunk = others.chunks[others.places[number] - 1];
    for (size_t i = 0; i < CHUNK_TEXTS; ++i) {
      if (chunk[i] != 0) {
        const double mark = std::min<double>(MOST, std::ceil(chunk[i] * factor));
        Add(static_cast<int64_t>(number * CHUNK_TEXTS + i), static_cast<uint32_t>(mark));
      }
    }
  }
}

uint16_t TextMarks::Of(int64_t text) const {
  const auto at = static_cast<size_t>(text);
  const size_t number = at / CHUNK_TEXTS;
  return number < places.size() && places[number] != 0
             ? chunks[places[number] - 1][at % CHUNK_TEXTS]
             : uint16_t{0};
}

}  // namespace fileindexd
