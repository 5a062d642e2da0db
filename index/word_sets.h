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
  // How often the question's words stand in a text.
  int64_t Hits(int64_t text) const;

 private:
  int ReadLeaf(const WordLeaf& leaf);
  int ReadAttributes(const QueryNode& node);
  int ReadEndings(const QueryNode& node);
  int ReadUnder(const QueryNode& node);
  int ReadRange(const QueryNode& node);
  int ReadFew(Statement& statement, WordSet& set);
  int Collect(const char* sql, const std::string& query, IdSet& ids, bool counts);
  WordSet UpperOfAll(const QueryNode& node) const;

  sqlite3* db;
  bool has_contents;
  const Asked& asked;
  std::string share;
  std::unordered_map<const QueryNode*, WordSet> sets;
  WordSet unknown = {.names = {}, .texts = {}, .everything = true, .is_sure = false};
  std::vector<uint32_t> hits;  // by text
};

}  // namespace fileindexd
