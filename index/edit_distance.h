// SPDX-License-Identifier: GPL-2.0-or-later
// How many slips of the fingers lie between two words.
#pragma once

#include <string>

namespace fileindexd {

// Insertions, deletions, changes and swaps of neighbours that lead from one to the other; more than
// `most` come as most + 1. By characters of valid UTF-8.
int EditDistance(const std::string& from, const std::string& to, int most);

}  // namespace fileindexd
