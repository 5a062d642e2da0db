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
#include "index/kept_statements.h"
#include "index/text_marks.h"

namespace fileindexd {

struct WordSet {
  IdSet names;              // entries
  IdSet texts;              // rowids of texts
  bool everything = false;  // the tables say nothing: any entry may answer
  bool is_sure = false;     // what is in `names` answers; without it, it only may
  // Beside a rare word, only what that one has of the same table was looked for. Whether it stands
  // in the names of entries whose text holds the rare word, or in the texts of those whose name
  // does, is then asked one by one.
  bool asks_names = false;
  bool asks_texts = false;

  uint64_t Count() const { return names.Count() + texts.Count(); }
};

class WordSets {
 public:
  WordSets(KeptStatements& in_statements, bool with_contents, const Asked& in_question,
           const std::string& of_share)
      : statements(in_statements),
        has_contents(with_contents),
        asked(in_question),
        share(of_share) {}

  // SQLite's codes. Where one word that must be there is rare, what the others have beside it is
  // left out; ReadAll leaves nothing out.
  int Read();
  int ReadAll();

  // Whether a leaf stands in the name of an entry, or in a text, that the rare word has elsewhere.
  int AskName(const QueryNode& leaf, int64_t entry, bool& holds);
  int AskText(const QueryNode& leaf, int64_t text, bool& holds);
  const WordSet& Rarest() const { return Of(*rarest->node); }  // where something is to be asked

  const WordSet& Of(const QueryNode& leaf) const;
  // All that can answer is in it.
  WordSet Upper(const QueryNode& node) const;
  // All of it answers.
  IdSet Lower(const QueryNode& node) const;
  // How many names and texts have it, about.
  double CountOf(const WordLeaf& leaf) const { return counts[NumberOf(leaf)]; }
  // A rare word says more. 0 to 1.
  double WeightOf(const WordLeaf& leaf) const { return weights[NumberOf(leaf)]; }
  // How a leaf that says what to find stands in a text.
  uint16_t MarkOf(const WordLeaf& leaf, int64_t text) const;
  // About how well a text answers all of them, by their weights.
  double PromiseOfText(int64_t text) const;
  // The same of a name: the weights of what it holds.
  double PromiseOfName(int64_t entry) const;

 private:
  // Where a leaf is looked for.
  enum class Table : uint8_t { NAMES, TEXTS };
  bool IsIn(const WordLeaf& leaf, Table table) const;

  int CountFew(const WordLeaf& leaf, Table table, int64_t& found);
  int FindRarest();
  int ReadLeaf(const WordLeaf& leaf);
  int ReadTable(const WordLeaf& leaf, Table table, const std::string& beside, int64_t most,
                bool& is_whole);
  int ReadBeside(const WordLeaf& leaf);
  int ReadTableBeside(const WordLeaf& leaf, Table table);
  int LastId(Table table, int64_t& last);
  int ReadAttributes(const QueryNode& node);
  int ReadEndings(const QueryNode& node);
  int ReadUnder(const QueryNode& node);
  int ReadRange(const QueryNode& node);
  int ReadFew(Statement& statement, WordSet& set);
  WordSet UpperOfAll(const QueryNode& node) const;
  size_t NumberOf(const WordLeaf& leaf) const {
    return static_cast<size_t>(&leaf - asked.leaves.data());
  }

  KeptStatements& statements;
  bool has_contents;
  const Asked& asked;
  std::string share;
  std::unordered_map<const QueryNode*, WordSet> sets;
  WordSet unknown = {.names = {}, .texts = {}, .everything = true, .is_sure = false};
  // Of the leaves, by number.
  std::vector<double> counts;
  std::vector<double> weights;
  std::vector<TextMarks> marks;  // of the first few that say what to find
  std::vector<bool> is_marked;
  const WordLeaf* rarest = nullptr;  // what all answers have, and few
  Statement* ask_name = nullptr;     // null: not asked for yet
  Statement* ask_text = nullptr;
};

}  // namespace fileindexd
