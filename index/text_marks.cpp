// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/text_marks.h"

#include <algorithm>

namespace fileindexd {

uint16_t TextMark::Of(Where where, uint32_t hits) {
  return static_cast<uint16_t>(uint32_t{where} << 14 | std::min(hits, MOST_HITS));
}

double TextMark::Score(uint16_t mark, double length) {
  const double hits = mark & MOST_HITS;
  const double often = hits / (hits + 1.2 * (0.25 + 0.75 * std::min(length / USUAL_LENGTH, 8.0)));
  switch (mark >> 14) {
    case TITLE:
      return 0.75 + 0.25 * often;
    case FIELDS:
      return 0.5 + 0.25 * often;
    case TEXT:
      return 0.5 * often;
    default:
      return 0;
  }
}

}  // namespace fileindexd
