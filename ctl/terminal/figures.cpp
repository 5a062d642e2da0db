// SPDX-License-Identifier: GPL-2.0-or-later
#include "ctl/terminal/figures.h"

#include <cstdio>

namespace fileindexd {

std::string ShortSize(int64_t bytes) {
  constexpr char UNITS[] = "BKMGTPE";
  auto size = static_cast<double>(bytes);
  size_t unit = 0;
  // From 1023.5 on it would be shown as 1024.
  while (size >= 1023.5 && unit + 2 < sizeof(UNITS)) {
    size /= 1024;
    ++unit;
  }

  char text[32];
  (void)snprintf(text, sizeof(text), unit > 0 && size < 9.95 ? "%.1f%c" : "%.0f%c", size,
                 UNITS[unit]);
  return text;
}

}  // namespace fileindexd
