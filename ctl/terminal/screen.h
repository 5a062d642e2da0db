// SPDX-License-Identifier: GPL-2.0-or-later
// The terminal that results go to, if they go to one.
#pragma once

#include <cstddef>
#include <optional>

namespace fileindexd {

struct Screen {
  size_t columns = 80;  // at least 1
  bool has_colours = false;
};

// None: standard output is no terminal. Its columns are those that the terminal tells, else those
// of COLUMNS, else 80. Colours unless NO_COLOR holds something, or TERM is "dumb" or not set.
std::optional<Screen> FindScreen();

}  // namespace fileindexd
