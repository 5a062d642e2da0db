// SPDX-License-Identifier: GPL-2.0-or-later
// A question as it is put to the shares: its tree, and the words in it.
//
// Made once, then only read: by one thread for each share.
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "index/query.h"

namespace fileindexd {

class NameMarker;
struct Question;

// A leaf that is looked up by its words or by pieces of names.
struct WordLeaf {
  const QueryNode* node = nullptr;
  bool is_positive = true;          // not below an odd number of NOT
  std::vector<std::string> tokens;  // of its words, as the table of names has them
  // In the full-text tables' own language, where every text of a user is a quoted literal. Empty:
  // it is not looked for there.
  std::string names_query;
  std::string text_query;
};

class Asked {
 public:
  Asked() = default;
  Asked(const Asked&) = delete;  // leaves point into the tree
  Asked& operator=(const Asked&) = delete;

  // False when the question makes no sense, and `error` then says why, in one line.
  bool Read(const Question& question, NameMarker& names, std::string& error);
  const WordLeaf* LeafOf(const QueryNode& node) const;  // null: none

  std::string text;  // valid UTF-8
  QueryNode tree;
  std::vector<WordLeaf> leaves;     // WORD, NAME_PATTERN and EXACT_NAME, in order
  bool needs_contents = false;      // some part asks for more than names and attributes
  std::vector<std::string> shares;  // of the question, but those that the tree rules out; in order
};

// The column of the contents' table that a text field stands in.
std::string ColumnName(ContentField field);
// Of a WORD, in the contents' table's own language. Empty: it is looked for in names alone.
std::string TextQueryOf(const QueryNode& word);

}  // namespace fileindexd
