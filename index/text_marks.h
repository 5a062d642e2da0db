// SPDX-License-Identifier: GPL-2.0-or-later
// How a part of a question stands in each of some texts, in two bytes, in chunks that are there
// only where some have one. A million neighbours take 2 MB; a few take 2 KB each at most, however
// large their rowids are.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <vector>

namespace fileindexd {

// How often, and where it says most: that above how often. 0: not at all.
struct TextMark {
  static constexpr uint32_t MOST_HITS = (1 << 14) - 1;
  enum Where : uint8_t { TEXT = 1, FIELDS = 2, TITLE = 3 };

  static uint16_t Of(Where where, uint32_t hits);
  // 0 to 1: title above other fields above text, often above once. A long text holds a word more
  // often by chance.
  static double Score(uint16_t mark, double length);
};

constexpr double USUAL_LENGTH = 8192;  // of a text whose length is not known

class TextMarks {
 public:
  void Set(int64_t text, uint16_t mark);  // `text`: 0 to MOST_ROWS
  uint16_t Of(int64_t text) const;        // 0: none

 private:
  static constexpr size_t CHUNK_TEXTS = 1024;
  using Chunk = std::array<uint16_t, CHUNK_TEXTS>;

  std::vector<uint32_t> places;  // by number of the chunk: its place, from 1; 0: none
  std::vector<Chunk> chunks;
};

}  // namespace fileindexd
