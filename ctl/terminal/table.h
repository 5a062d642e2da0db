// SPDX-License-Identifier: GPL-2.0-or-later
// Rows of figures with a name behind them.
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "ctl/terminal/screen.h"

namespace fileindexd {

// The last column is a name, all before it are figures.
using TableRow = std::vector<std::string>;

// On a screen: below their headings if there are any, figures to the right, names cut in the middle
// where they do not fit. On a narrow screen the columns of figures go, the last ones first, and the
// first one stays. Elsewhere: no headings, columns separated by a tabulator, control characters in
// digits.
std::vector<std::string> TableLines(const TableRow& headings, const std::vector<TableRow>& rows,
                                    const std::optional<Screen>& screen);

}  // namespace fileindexd
