// SPDX-License-Identifier: GPL-2.0-or-later
// How a part of a question stands in each of some texts, in two bytes, in chunks that are there
// only where some have one. A million neighbours take 2 MB. A few take 2 KB each, and 4 KB for each
// million of rowids up to the greatest. What has grown may take twice that.
#pragma once

#include <cstdint>

#include "index/chunked.h"

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
  // `text`: 0 to MOST_ROWS. 0: none.
  void Set(int64_t text, uint16_t mark) { marks.At(static_cast<size_t>(text)) = mark; }
  uint16_t Of(int64_t text) const { return marks.Get(static_cast<size_t>(text)); }

 private:
  Chunked<uint16_t, 1024> marks;
};

}  // namespace fileindexd
