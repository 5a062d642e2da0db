// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/word_sets.h"

#include <algorithm>
#include <utility>

#include "index/entry_table.h"
#include "index/name_pattern.h"
#include "index/name_text.h"
#include "index/schema.h"
#include "index/text_tokenizer.h"

namespace fileindexd {

namespace {

// SQLITE_OK at the end, SQLITE_ROW where there are more than `most`.
int ReadIds(Statement& rows, int64_t most, IdSet& ids) {
  int64_t found = 0;
  int code = rows.Step();
  for (; code == SQLITE_ROW && found < most; code = rows.Step()) {
    const int64_t id = rows.Int(0);
    if (!IsRowid(id)) {
      return SQLITE_CORRUPT;
    }
    ids.Add(id);
    ++found;
  }
  return code == SQLITE_DONE ? SQLITE_OK : code;
}

}  // namespace

int WordSets::ReadAttributes(const QueryNode& node) {
  if (node.part == Part::SHARE) {
    WordSet& set = sets[&node];
    set.is_sure = true;  // all of this share, or nothing
    set.everything = std::find(node.names.begin(), node.names.end(), share) != node.names.end();
  }
  int code = node.part == Part::EXT     ? ReadEndings(node)
             : node.part == Part::UNDER ? ReadUnder(node)
             : node.part == Part::RANGE ? ReadRange(node)
                                        : SQLITE_OK;
  for (size_t i = 0; i < node.below.size() && code == SQLITE_OK; ++i) {
    code = ReadAttributes(node.below[i]);
  }
  return code;
}

// The ending of a name is its last word.
int WordSets::ReadEndings(const QueryNode& node) {
  NameFolder folder;
  WordSet& set = sets[&node];
  for (const std::string& ending : node.names) {
    const std::string words = folder.Words(ending);
    const bool has_word = std::any_of(words.begin(), words.end(), [](char c) {
      return (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9') || static_cast<signed char>(c) < 0;
    });
    if (!has_word) {
      set.everything = true;
      return SQLITE_OK;
    }
    const std::string query = Quoted(words + " " + NAME_END);
    Statement* match = nullptr;
    int code = statements.Find("SELECT rowid FROM names WHERE names MATCH ?1", match);
    if (code != SQLITE_OK) {
      return code;
    }
    match->BindText(1, query);
    code = ReadIds(*match, INT64_MAX, set.names);
    if (code != SQLITE_OK) {
      return code;
    }
  }
  return SQLITE_OK;
}

// Ids that an index alone gives. Of more than a bounded number nothing is known.
int WordSets::ReadFew(Statement& statement, WordSet& set) {
  constexpr int64_t MOST = 10000;
  int code = ReadIds(statement, MOST, set.names);
  if (code == SQLITE_ROW) {
    set = unknown;
    code = SQLITE_OK;
  }
  return code;
}

// What a small folder holds. As two statements in one it is read faster than with an OR.
int WordSets::ReadUnder(const QueryNode& node) {
  const PathRange range(node.names.front());
  Statement* below = nullptr;
  const int code = statements.Find(
      "SELECT id FROM entries WHERE path = ?1 UNION ALL "
      "SELECT id FROM entries WHERE path > ?2 AND path < ?3",
      below);
  if (code != SQLITE_OK) {
    return code;
  }
  range.Bind(*below);
  WordSet& set = sets[&node];
  set.is_sure = true;
  return ReadFew(*below, set);
}

// The large ones, and those of some weeks.
int WordSets::ReadRange(const QueryNode& node) {
  const bool by_size = node.column == Column::SIZE && node.lowest >= FILEINDEX_LARGE_BYTES;
  const bool by_week = node.column == Column::MODIFIED && node.lowest >= FILEINDEX_WEEK_NANOSECONDS;
  if (!by_size && !by_week) {
    return SQLITE_OK;
  }
  Statement* inside = nullptr;
  const int code = statements.Find(
      by_size
          ? "SELECT id FROM entries INDEXED BY entries_large "
            "WHERE " FILEINDEX_IS_LARGE " AND size >= ?1 AND size <= ?2"
          : "SELECT id FROM entries INDEXED BY entries_by_week WHERE mtime <> 0 AND " FILEINDEX_WEEK
            " >= ?1 AND " FILEINDEX_WEEK " <= ?2",
      inside);
  if (code != SQLITE_OK) {
    return code;
  }
  inside->BindInt(1, by_size ? node.lowest : node.lowest / FILEINDEX_WEEK_NANOSECONDS);
  inside->BindInt(2, by_size ? node.highest : node.highest / FILEINDEX_WEEK_NANOSECONDS);
  WordSet& set = sets[&node];
  set.is_sure = by_size;
  return ReadFew(*inside, set);
}

const WordSet& WordSets::Of(const QueryNode& leaf) const {
  const auto found = sets.find(&leaf);
  return found == sets.end() ? unknown : found->second;
}

// The rarest of what must be there; of those that names alone decide, what they have in common.
WordSet WordSets::UpperOfAll(const QueryNode& node) const {
  WordSet by_name = unknown;
  WordSet by_text = unknown;
  WordSet best = unknown;
  for (const QueryNode& below : node.below) {
    WordSet set = Upper(below);
    if (set.everything) {
      continue;
    }
    if (set.texts.IsEmpty()) {
      if (!by_name.everything) {
        set.names.Intersect(by_name.names);
      }
      by_name = std::move(set);
    } else if (set.names.IsEmpty()) {
      if (!by_text.everything) {
        set.texts.Intersect(by_text.texts);
      }
      by_text = std::move(set);
    } else if (best.everything || set.Count() < best.Count()) {
      best = std::move(set);
    }
  }
  if (!best.everything && !by_name.everything) {
    best.names.Intersect(by_name.names);
  }
  for (WordSet* other : {&by_name, &by_text}) {
    if (!other->everything && (best.everything || other->Count() < best.Count())) {
      best = std::move(*other);
    }
  }
  return best;
}

WordSet WordSets::Upper(const QueryNode& node) const {
  switch (node.part) {
    case Part::AND:
      return UpperOfAll(node);
    case Part::OR: {
      WordSet any;
      for (const QueryNode& below : node.below) {
        const WordSet set = Upper(below);
        any.names.Unite(set.names);
        any.texts.Unite(set.texts);
        any.everything = any.everything || set.everything;
      }
      return any;
    }
    case Part::NOT:
      return unknown;
    default:
      return Of(node).asks_names || Of(node).asks_texts ? unknown : Of(node);
  }
}

IdSet WordSets::Lower(const QueryNode& node) const {
  IdSet sure;
  switch (node.part) {
    case Part::AND: {
      bool is_first = true;
      for (const QueryNode& below : node.below) {
        const bool says_nothing = below.part == Part::SHARE && Of(below).everything;
        if (below.part == Part::NOT || says_nothing) {
          continue;
        }
        if (is_first) {
          sure = Lower(below);
        } else {
          sure.Intersect(Lower(below));
        }
        is_first = false;
      }
      // What is excluded by names alone is excluded for sure.
      for (const QueryNode& below : node.below) {
        if (below.part == Part::NOT && !sure.IsEmpty()) {
          const WordSet excluded = Upper(below.below.front());
          if (excluded.everything || !excluded.texts.IsEmpty()) {
            return {};
          }
          sure.Subtract(excluded.names);
        }
      }
      return sure;
    }
    case Part::OR:
      for (const QueryNode& below : node.below) {
        sure.Unite(Lower(below));
      }
      return sure;
    case Part::NOT:
      return sure;
    default:
      return Of(node).is_sure ? Of(node).names : sure;
  }
}

uint16_t WordSets::MarkOf(const WordLeaf& leaf, int64_t text) const {
  const uint16_t mark = marks[NumberOf(leaf)].Of(text);
  return mark != 0 || !Of(*leaf.node).texts.Has(text) ? mark : TextMark::Of(TextMark::TEXT, 1);
}

double WordSets::PromiseOfText(int64_t text) const {
  double promise = 0;
  for (const WordLeaf& leaf : asked.leaves) {
    promise +=
        leaf.is_positive ? WeightOf(leaf) * TextMark::Score(MarkOf(leaf, text), USUAL_LENGTH) : 0;
  }
  return promise;
}

double WordSets::PromiseOfName(int64_t entry) const {
  double promise = 0;
  for (const WordLeaf& leaf : asked.leaves) {
    promise += leaf.is_positive && Of(*leaf.node).names.Has(entry) ? WeightOf(leaf) : 0;
  }
  return promise;
}

}  // namespace fileindexd
