// SPDX-License-Identifier: GPL-2.0-or-later
// Statements that walk through rows where no words say which.
#pragma once

#include <string>

#include "index/query.h"
#include "index/search.h"

namespace fileindexd {

// All entries that may answer: what a question surely asks of rows is in it, the rest is not.
std::string RowsSql(const QueryNode& tree, bool has_contents);

// Entries from the top of that order, with a key behind their columns that falls slowly. Empty:
// nothing keeps them in that order. Not all are in it: those below are left out.
std::string OrderedSql(SortBy sort);

}  // namespace fileindexd
