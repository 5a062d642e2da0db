// SPDX-License-Identifier: GPL-2.0-or-later
#include "ctl/terminal/table.h"

#include <algorithm>

#include "ctl/output.h"
#include "ctl/terminal/cells.h"

namespace fileindexd {

namespace {

constexpr size_t GAP = 2;

std::string PlainLine(const TableRow& row) {
  std::string line;
  for (const std::string& column : row) {
    line += (line.empty() ? "" : "\t") + OneLine(column);
  }
  return line;
}

std::vector<size_t> WidthsOf(const TableRow& headings, const std::vector<TableRow>& rows) {
  std::vector<size_t> widths;
  for (const std::string& heading : headings) {
    widths.push_back(heading.size());
  }
  for (const TableRow& row : rows) {
    widths.resize(std::max(widths.size(), row.size()));
    for (size_t i = 0; i < row.size(); ++i) {
      widths[i] = std::max(widths[i], row[i].size());
    }
  }
  return widths;
}

// How many columns of figures leave room for a name.
size_t FiguresShown(const std::vector<size_t>& widths, size_t columns) {
  constexpr size_t LEAST_NAME = 12;
  size_t used = LEAST_NAME + 1;
  size_t shown = 0;
  while (shown + 1 < widths.size() && (shown == 0 || used + widths[shown] + GAP <= columns)) {
    used += widths[shown] + GAP;
    ++shown;
  }
  return shown;
}

// The last column of the screen stays free.
std::string ScreenLine(const TableRow& row, const std::vector<size_t>& widths, size_t columns) {
  const size_t room = columns > 1 ? columns - 1 : 1;
  std::string line;
  for (size_t i = 0; i < FiguresShown(widths, columns); ++i) {
    line += std::string(widths[i] - row[i].size(), ' ') + row[i] + std::string(GAP, ' ');
  }
  if (line.size() >= room) {
    return ShowCells(CutAround(CellsOf(line), room), false);
  }
  return line + ShowCells(CutMiddle(CellsOf(row.back()), room - line.size()), false);
}

}  // namespace

std::vector<std::string> TableLines(const TableRow& headings, const std::vector<TableRow>& rows,
                                    const std::optional<Screen>& screen) {
  std::vector<std::string> lines;
  if (!screen.has_value()) {
    for (const TableRow& row : rows) {
      lines.push_back(PlainLine(row));
    }
    return lines;
  }

  const std::vector<size_t> widths = WidthsOf(headings, rows);
  if (!headings.empty()) {
    lines.push_back(ScreenLine(headings, widths, screen->columns));
  }
  for (const TableRow& row : rows) {
    lines.push_back(ScreenLine(row, widths, screen->columns));
  }
  return lines;
}

}  // namespace fileindexd
