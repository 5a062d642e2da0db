// SPDX-License-Identifier: GPL-2.0-or-later
// Single parts of a question: from what a user wrote to a node of the tree.
#pragma once

#include <ctime>

#include "index/query.h"
#include "index/query_fields.h"

namespace fileindexd {

struct Value;

// Sets all of the node but its place. False, and `error` says why.
bool FillField(const NamedField& field, const Value& value, time_t now, QueryNode& node,
               QueryError& error);

// Whether the tree says what to find: not all of it is negated.
bool IsPositive(const QueryNode& node);

}  // namespace fileindexd
