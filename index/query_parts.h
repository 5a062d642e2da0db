// SPDX-License-Identifier: GPL-2.0-or-later
// Single parts of a question: from what a user wrote to a node of the tree.
#pragma once

#include <ctime>
#include <string>
#include <vector>

#include "index/query.h"
#include "index/query_fields.h"

namespace fileindexd {

// What stands behind a field's colon, or alone.
struct Value {
  std::string text;  // without its quotes
  size_t at = 0;     // byte of the question
  bool is_quoted = false;
  bool has_star = false;  // behind the quotes
  // Of a list, what stands in quotes and what stands bare in between, commas in it as well.
  std::vector<Value> listed;
};

// Sets all of the node but its place. False, and `error` says why.
bool FillField(const NamedField& field, const Value& value, time_t now, QueryNode& node,
               QueryError& error);

// Whether the tree says what to find: not all of it is negated.
bool IsPositive(const QueryNode& node);

}  // namespace fileindexd
