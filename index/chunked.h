// SPDX-License-Identifier: GPL-2.0-or-later
// Values by their number, in chunks that are there only where one was written. Beside them stand
// four bytes for each chunk that there could be up to the last one: a single value costs the more,
// the greater its number is.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <vector>

namespace fileindexd {

template <typename Value, size_t SIZE>
class Chunked {
 public:
  using Chunk = std::array<Value, SIZE>;

  // Zero where none was written.
  Value Get(size_t at) const {
    const Chunk* chunk = Find(at / SIZE);
    return chunk != nullptr ? (*chunk)[at % SIZE] : Value{};
  }
  // To be written to. Good until the next call.
  Value& At(size_t at) { return Make(at / SIZE)[at % SIZE]; }

  // By number of the chunk; null: nothing was written there.
  const Chunk* Find(size_t number) const {
    return number < places.size() && places[number] != 0 ? &chunks[places[number] - 1] : nullptr;
  }
  // Good until the next call.
  Chunk& Make(size_t number) {
    if (number >= places.size()) {
      places.resize(number + 1);
    }
    if (places[number] == 0) {
      chunks.emplace_back();
      places[number] = static_cast<uint32_t>(chunks.size());
    }
    return chunks[places[number] - 1];
  }
  // Chunks from this number on are not there.
  size_t End() const { return places.size(); }
  // Those that are there, in no order.
  const std::vector<Chunk>& All() const { return chunks; }

 private:
  std::vector<uint32_t> places;  // by number of the chunk: its place, from 1; 0: not there
  std::vector<Chunk> chunks;
};

}  // namespace fileindexd
