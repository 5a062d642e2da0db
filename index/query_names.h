// SPDX-License-Identifier: GPL-2.0-or-later
// Parts of a question that are looked for by their letters: words, and names, paths and endings.
#pragma once

#include <string_view>

#include "index/query.h"
#include "index/query_piece.h"

namespace fileindexd {

// Whether the tables of words have any for it: it holds a letter or a digit.
bool HoldsWords(std::string_view text);
// Whether it begins as a word does. "camera:>5", "title:-moby", "ext:-pdf": beside letters a sign
// is of no account, and the opposite would be found. False, and `error` says so.
bool BeginsAsWord(const Value& value, const std::string& field, QueryError& error);

// Like FillField, each of what stands behind its own field; FillWords also of words without one.
bool FillWords(const Value& value, QueryNode& node, QueryError& error);
bool FillName(const Value& value, QueryNode& node, QueryError& error);
bool FillPath(const Value& value, QueryNode& node, QueryError& error);
bool FillExt(const Value& value, QueryNode& node, QueryError& error);

}  // namespace fileindexd
