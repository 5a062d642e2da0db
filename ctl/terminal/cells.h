// SPDX-License-Identifier: GPL-2.0-or-later
// Text as a terminal shows it: in cells that are measured, cut and coloured.
//
// A cell is one character with the marks that stand upon it, so that a cut never parts them. Wide
// characters take two columns. What would move the cursor, or turn the line around, is shown in
// digits ("\x1b", "\u202e"), and so is each byte that is not UTF-8.
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "index/snippet.h"

namespace fileindexd {

struct Cell {
  std::string text;
  size_t columns = 0;
  bool is_marked = false;
};
using Cells = std::vector<Cell>;

// `marks`: bytes of the text, in order. What lies outside of it is left out of account.
Cells CellsOf(std::string_view text, const std::vector<Snippet::Mark>& marks = {});

size_t ColumnsOf(const Cells& cells);

// Each leaves alone what fits into that many columns, and shows a cut as "…".

// In the middle: as much of the marked cells stays as can, and of the rest the end more than the
// beginning, as a path tells most there.
Cells CutMiddle(const Cells& cells, size_t columns);
// At the end; also at the start where the first marked cells would not be seen otherwise.
Cells CutAround(const Cells& cells, size_t columns);

// The text in lines of less than that many columns, parted at blanks where that can be.
std::vector<std::string> WrappedLines(std::string_view text, size_t columns);

// Marked cells bright, if there are colours.
std::string ShowCells(const Cells& cells, bool has_colours);

// JSON text that means the same, with what would be shown in digits escaped.
std::string EscapedJson(std::string_view json);

}  // namespace fileindexd
