// SPDX-License-Identifier: GPL-2.0-or-later
// Trees as text, so that a test compares a whole tree at once.
//
//   node = op " " path ["=" data] [" {" node {", " node} "}"]
#pragma once

#include <string>
#include <vector>

#include "optree/op_tree.h"

namespace fileindexd {

// The whole tree; "empty" without a root. A wrong parent pointer shows as "!".
std::string Render(const OpTree& tree);

// What the walk yields, as "op path", in order.
std::vector<std::string> Walk(OpTree& tree);

// Parses; a test's own text is never malformed.
Json::Value Parse(const std::string& text);

}  // namespace fileindexd
