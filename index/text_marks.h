// SPDX-License-Identifier: GPL-2.0-or-later
// A small number for each of some texts, in chunks that are there only where some have one. A
// million neighbours take 2 MB; a few take 2 KB each at most, however large their rowids are.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <vector>

namespace fileindexd {

class TextMarks {
 public:
  static constexpr uint16_t MOST = UINT16_MAX;

  // Adds, up to MOST. `text`: 0 to MOST_ROWS.
  void Add(int64_t text, uint32_t mark);
  // Each of the others multiplied; what was more than nothing stays so.
  void AddAll(const TextMarks& others, double factor);
  uint16_t Of(int64_t text) const;  // 0: none

 private:
  static constexpr size_t CHUNK_TEXTS = 1024;
  using Chunk = std::array<uint16_t, CHUNK_TEXTS>;

  std::vector<uint32_t> places;  // by number of the chunk: its place, from 1; 0: none
  std::vector<Chunk> chunks;
};

}  // namespace fileindexd
