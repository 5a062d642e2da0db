// SPDX-License-Identifier: GPL-2.0-or-later
// Reading the leaves of a question out of the full-text tables.
//
// DESIGN: of words that all must be there, one may be rare. It is read first, and decides what can
// answer. A common one beside it is then read only where both are in one table: the full-text table
// skips from one to the next there. What is left is a word of each in different tables, the one in
// the name and the other in the text of the same file: that is asked entry by entry, by RowCheck,
// and only where reading the common word as a whole would cost more.
#include <algorithm>
#include <cmath>

#include "index/name_pattern.h"
#include "index/word_sets.h"

namespace fileindexd {

namespace {

// Parts of a question that are marked. Each may take two bytes for every text there is; of those
// beyond only counts that they are there.
constexpr size_t MOST_MARKED = 8;
constexpr int64_t FEW = 2000;  // names or texts of a rare word, each
// Asking for one row costs as much as reading so many.
constexpr double ROWS_OF_ONE = 300;

// Those are put together from all words that begin so each time that they are asked for.
bool IsBeginningLeaf(const WordLeaf& leaf) {
  return leaf.names_query.ends_with('*') || leaf.text_query.ends_with('*');
}

bool IsWordLeaf(const WordLeaf& leaf) {
  return leaf.node->part == Part::WORD || leaf.node->part == Part::EXACT_NAME;
}

}  // namespace

int WordSets::ReadAll() {
  size_t marked = 0;
  for (const WordLeaf& leaf : asked.leaves) {
    const bool marks_it = leaf.is_positive && !leaf.text_query.empty() && marked < MOST_MARKED;
    marked += marks_it ? 1 : 0;
    is_marked.push_back(marks_it);
  }
  counts.resize(asked.leaves.size());
  weights.resize(asked.leaves.size());
  marks.resize(asked.leaves.size());

  int code = rarest == nullptr ? SQLITE_OK : ReadLeaf(*rarest);
  for (size_t i = 0; i < asked.leaves.size() && code == SQLITE_OK; ++i) {
    const WordLeaf& leaf = asked.leaves[i];
    if (&leaf != rarest) {
      code = rarest == nullptr || IsBeginningLeaf(leaf) || !IsWordLeaf(leaf) ? ReadLeaf(leaf)
                                                                             : ReadBeside(leaf);
    }
    weights[i] = 1 / std::log2(2 + counts[i]);
  }
  return code == SQLITE_OK ? ReadAttributes(asked.tree) : code;
}

int WordSets::Read() {
  const int code = FindRarest();
  return code == SQLITE_OK ? ReadAll() : code;
}

bool WordSets::IsIn(const WordLeaf& leaf, Table table) const {
  return table == Table::NAMES ? !leaf.names_query.empty() && !leaf.tokens.empty()
                               : has_contents && !leaf.text_query.empty();
}

// Up to one more than FEW.
int WordSets::CountFew(const WordLeaf& leaf, Table table, int64_t& found) {
  found = 0;
  if (!IsIn(leaf, table)) {
    return SQLITE_OK;
  }
  const bool in_names = table == Table::NAMES;
  Statement* few = nullptr;
  int code = statements.Find(
      in_names
          ? "SELECT count(*) FROM (SELECT 1 FROM names WHERE names MATCH ?1 LIMIT ?2)"
          : "SELECT count(*) FROM (SELECT 1 FROM contents.words WHERE words MATCH ?1 LIMIT ?2)",
      few);
  if (code != SQLITE_OK) {
    return code;
  }
  few->BindText(1, in_names ? leaf.names_query : leaf.text_query);
  few->BindInt(2, FEW + 1);
  code = few->Step();
  found = code == SQLITE_ROW ? few->Int(0) : 0;
  return code == SQLITE_ROW ? SQLITE_OK : code;
}

int WordSets::FindRarest() {
  if (asked.tree.part != Part::AND || asked.leaves.size() < 2) {
    return SQLITE_OK;
  }
  int64_t least = INT64_MAX;
  for (const QueryNode& node : asked.tree.below) {
    const WordLeaf* leaf = asked.LeafOf(node);
    if (leaf == nullptr || !IsWordLeaf(*leaf) || IsBeginningLeaf(*leaf) ||
        (node.part == Part::EXACT_NAME && leaf->tokens.empty())) {
      continue;
    }
    int64_t names = 0;
    int64_t texts = 0;
    int code = CountFew(*leaf, Table::NAMES, names);
    code = code == SQLITE_OK && names <= FEW ? CountFew(*leaf, Table::TEXTS, texts) : code;
    if (code != SQLITE_OK) {
      return code;
    }
    if (names <= FEW && texts <= FEW && names + texts < least) {
      rarest = leaf;
      least = names + texts;
    }
  }
  return SQLITE_OK;
}

int WordSets::ReadLeaf(const WordLeaf& leaf) {
  WordSet& set = sets[leaf.node];
  int code = SQLITE_OK;
  set.is_sure = leaf.node->part != Part::EXACT_NAME;
  if (leaf.node->part == Part::NAME_PATTERN) {
    code = NamePattern(*leaf.node).Find(statements.db, set.names);
  } else {
    set.everything = !set.is_sure && leaf.tokens.empty();
    bool is_whole = false;
    for (const Table table : {Table::NAMES, Table::TEXTS}) {
      code = code == SQLITE_OK ? ReadTable(leaf, table, "", INT64_MAX, is_whole) : code;
    }
  }
  counts[NumberOf(leaf)] = static_cast<double>(set.Count());
  return code;
}

// Beside: only where that one stands too. Where there are more than `most`, none are kept, and how
// many there are is guessed from how far those reach.
int WordSets::ReadTable(const WordLeaf& leaf, Table table, const std::string& beside, int64_t most,
                        bool& is_whole) {
  is_whole = true;
  if (!IsIn(leaf, table)) {
    return SQLITE_OK;
  }
  const bool in_names = table == Table::NAMES;
  const bool marks_it = !in_names && is_marked[NumberOf(leaf)];
  Statement* match = nullptr;
  int code = statements.Find(
      in_names   ? "SELECT rowid FROM names WHERE names MATCH ?1"
      : marks_it ? "SELECT rowid, word_mark(words) FROM contents.words WHERE words MATCH ?1"
                 : "SELECT rowid FROM contents.words WHERE words MATCH ?1",
      match);
  if (code != SQLITE_OK) {
    return code;
  }
  const std::string& own = in_names ? leaf.names_query : leaf.text_query;
  const std::string query = beside.empty() ? own : "(" + own + ") AND (" + beside + ")";
  match->BindText(1, query);
  WordSet& set = sets[leaf.node];
  IdSet& ids = in_names ? set.names : set.texts;
  int64_t found = 0;
  int64_t id = 0;
  for (code = match->Step(); code == SQLITE_ROW && found < most; code = match->Step()) {
    id = match->Int(0);
    if (!IsRowid(id)) {
      return SQLITE_CORRUPT;
    }
    ++found;
    ids.Add(id);
    if (marks_it) {
      marks[NumberOf(leaf)].Set(id, static_cast<uint16_t>(match->Int(1)));
    }
  }
  is_whole = code == SQLITE_DONE;
  if (code == SQLITE_ROW) {
    int64_t last = 0;
    code = LastId(table, last);
    ids = IdSet();
    counts[NumberOf(leaf)] += static_cast<double>(found) * static_cast<double>(std::max(last, id)) /
                              static_cast<double>(std::max<int64_t>(id, 1));
    return code;
  }
  return StepError(code);
}

int WordSets::LastId(Table table, int64_t& last) {
  Statement* read = nullptr;
  int code = statements.Find(
      table == Table::NAMES ? "SELECT max(id) FROM entries" : "SELECT last_text FROM contents.meta",
      read);
  code = code == SQLITE_OK ? read->Step() : code;
  last = code == SQLITE_ROW ? read->Int(0) : 0;
  return StepError(code);
}

int WordSets::ReadBeside(const WordLeaf& leaf) {
  WordSet& set = sets[leaf.node];
  set.is_sure = leaf.node->part == Part::WORD;
  set.everything = !set.is_sure && leaf.tokens.empty();
  const int code = ReadTableBeside(leaf, Table::NAMES);
  return code == SQLITE_OK ? ReadTableBeside(leaf, Table::TEXTS) : code;
}

int WordSets::ReadTableBeside(const WordLeaf& leaf, Table table) {
  const bool in_names = table == Table::NAMES;
  const WordSet& rare = Rarest();
  WordSet& set = sets[leaf.node];
  const uint64_t elsewhere = in_names ? rare.texts.Count() : rare.names.Count();
  double& count = counts[NumberOf(leaf)];
  const double before = count;
  bool is_whole = false;
  int code = ReadTable(leaf, table, "", FEW, is_whole);
  if (code == SQLITE_OK && !is_whole &&
      count - before <= static_cast<double>(elsewhere) * ROWS_OF_ONE) {
    count = before;
    code = ReadTable(leaf, table, "", INT64_MAX, is_whole);
  }
  if (code != SQLITE_OK || is_whole) {
    count += static_cast<double>(in_names ? set.names.Count() : set.texts.Count());
    return code;
  }
  (in_names ? set.asks_names : set.asks_texts) = elsewhere > 0;
  if ((in_names ? rare.names : rare.texts).IsEmpty()) {
    return SQLITE_OK;
  }
  return ReadTable(leaf, table, in_names ? rarest->names_query : rarest->text_query, INT64_MAX,
                   is_whole);
}

int WordSets::AskName(const QueryNode& leaf, int64_t entry, bool& holds) {
  int code = SQLITE_OK;
  if (ask_name == nullptr) {
    code = statements.Find("SELECT 1 FROM names WHERE names MATCH ?1 AND rowid = ?2", ask_name);
  }
  if (code != SQLITE_OK) {
    return code;
  }
  ask_name->BindText(1, asked.LeafOf(leaf)->names_query);
  ask_name->BindInt(2, entry);
  return ask_name->ReadOne(holds, [] {});
}

int WordSets::AskText(const QueryNode& leaf, int64_t text, bool& holds) {
  int code = SQLITE_OK;
  if (ask_text == nullptr) {
    code = statements.Find(
        "SELECT word_mark(words) FROM contents.words WHERE words MATCH ?1 AND "
        "rowid = ?2",
        ask_text);
  }
  if (code != SQLITE_OK) {
    return code;
  }
  const WordLeaf& asked_leaf = *asked.LeafOf(leaf);
  ask_text->BindText(1, asked_leaf.text_query);
  ask_text->BindInt(2, text);
  return ask_text->ReadOne(holds, [&] {
    marks[NumberOf(asked_leaf)].Set(text, static_cast<uint16_t>(ask_text->Int(0)));
  });
}

}  // namespace fileindexd
