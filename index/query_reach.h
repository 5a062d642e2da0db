// SPDX-License-Identifier: GPL-2.0-or-later
// Which shares a question can find anything in, as far as it says where to look.
#pragma once

#include <string>
#include <vector>

#include "index/query.h"

namespace fileindexd {

struct Question;

// Those of the question's shares that the tree does not rule out, in order of their names.
std::vector<std::string> ReachedShares(const QueryNode& tree, const Question& question);

}  // namespace fileindexd
