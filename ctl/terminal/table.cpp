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

std::string ScreenLine(const TableRow& row, const std::vector<size_t>& widths, size_t columns) {
  std::string line;
  for (size_t i = 0; i + 1 < row.size(); ++i) {
    line += std::string(widths[i] - row[i].size(), ' ') + row[i] + std::string(GAP, ' ');
  }
  const size_t room = columns > line.size() + 1 ? columns - line.size() - 1 : 1;
  return line + ShowCells(CutMiddle(CellsOf(row.back()), room), false);
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
