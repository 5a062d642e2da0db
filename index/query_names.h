// SPDX-License-Identifier: GPL-2.0-or-later
// Parts of a question that are looked for by their letters: words, and names, paths and endings.
#pragma once

#include "index/query_parts.h"

namespace fileindexd {

// Like FillField, each of what stands behind its own field; FillWords also of words without one.
bool FillWords(const Value& value, QueryNode& node, QueryError& error);
bool FillName(const Value& value, QueryNode& node, QueryError& error);
bool FillPath(const Value& value, QueryNode& node, QueryError& error);
bool FillExt(const Value& value, QueryNode& node, QueryError& error);

}  // namespace fileindexd
