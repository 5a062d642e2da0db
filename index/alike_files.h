// SPDX-License-Identifier: GPL-2.0-or-later
// Files that are probably alike, of one share or of several.
//
// DESIGN: each share hands out what it knows of its files in one order, by size and by the hash of
// their samples; walked through side by side, those that are alike come one after the other. So
// nothing is kept but the set that is being walked through.
#pragma once

#include <deque>

#include "index/statistics_scan.h"

namespace fileindexd {

// Those of the shares whose contents are open. Each share that cannot be read to its end adds a
// line; what it had told until then stays.
void FindAlikeFiles(std::deque<OpenShare>& shares, Duplicates& duplicates,
                    std::vector<std::string>& failures);

}  // namespace fileindexd
