// SPDX-License-Identifier: GPL-2.0-or-later
// What the full-text tables of one share say about a question, before any row is looked at.
//
// A word may stand in the name of an entry or in its content, so it gives two sets: entries by
// their names, and texts. Which entries a text belongs to is told by rows alone.
#pragma once

#include <cstdint>
#include <string>
#include <unordered_map>
#include <vector>

#include "index/asked.h"
#include "index/id_set.h"
#include "index/text_marks.h"
#include "state/sqlite.h"

namespace fileindexd {

struct WordSet {
  IdSet names;              // entries
  IdSet texts;              // rowids of texts
  bool everything = false;  // the tables say nothing: any entry may answer
  bool is_sure = false;     // what is in `names` answers; without it, it only may

  uint64_t Count() const { return names.Count() + texts.Count(); }
};

class WordSets {
 public:
  WordSets(sqlite3* entries, bool with_contents, const Asked& in_question,
           const std::string& of_share)
      : db(entries), has_contents(with_contents), asked(in_question), share(of_share) {}

  int Read();  // SQLite's code

  const WordSet& Of(const QueryNode& leaf) const;
  // All that can answer is in it.
  WordSet Upper(const QueryNode& node) const;
  // All of it answers.
  IdSet Lower(const QueryNode& node) const;
  // A rare word says more. 0 to 1.
  double WeightOf(const WordLeaf& leaf) const { return weights[NumberOf(leaf)]; }
  // How a leaf that says what to find stands in a text.
  uint16_t MarkOf(const WordLeaf& leaf, int64_t text) const;
  // About how well a text answers all of them, by their weights.
  double Promise(int64_t text) const;

 private:
  int ReadLeaf(const WordLeaf& leaf);
  int ReadAttributes(const QueryNode& node);
  int ReadEndings(const QueryNode& node);
  int ReadUnder(const QueryNode& node);
  int ReadRange(const QueryNode& node);
  int ReadFew(Statement& statement, WordSet& set);
  int Collect(const char* sql, const std::string& query, IdSet& ids, TextMarks* marked);
  WordSet UpperOfAll(const QueryNode& node) const;
  size_t NumberOf(const WordLeaf& leaf) const {
    return static_cast<size_t>(&leaf - asked.leaves.data());
  }

  sqlite3* db;
  bool has_contents;
  const Asked& asked;
  std::string share;
  std::unordered_map<const QueryNode*, WordSet> sets;
  WordSet unknown = {.names = {}, .texts = {}, .everything = true, .is_sure = false};
  // Of the leaves, by number.
  std::vector<double> weights;
  std::vector<TextMarks> marks;  // of the first few that say what to find
  size_t marked_leaves = 0;
};

}  // namespace fileindexd
