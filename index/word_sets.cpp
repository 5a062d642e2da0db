// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/word_sets.h"

#include <algorithm>
#include <utility>

#include "index/entry_table.h"
#include "index/name_text.h"

namespace fileindexd {

namespace {

constexpr int64_t MOST_ROWS = int64_t{1} << 32;  // a rowid beyond is damage

// Trigrams of the piece, all of which its names hold. Empty for a shorter one.
std::string PartsQuery(const std::string& folded, std::string query) {
  const std::vector<size_t> starts = CharacterStarts(folded);
  for (size_t i = 0; i + 3 < starts.size(); ++i) {
    query += (query.empty() ? "" : " AND ") +
             Quoted(std::string_view(folded).substr(starts[i], starts[i + 3] - starts[i]));
  }
  return query;
}

bool IsPaired(const std::string& folded) {
  CharacterTable characters;
  for (size_t at = 0; at < folded.size();) {
    const Character character = CharacterAt(folded, at);
    if (character.code < 0x80 || characters.Of(character.code).type != CharacterClass::PAIRED) {
      return false;
    }
    at += character.size;
  }
  return !folded.empty();
}

}  // namespace

int WordSets::Read() {
  for (const WordLeaf& leaf : asked.leaves) {
    const int code = ReadLeaf(leaf);
    if (code != SQLITE_OK) {
      return code;
    }
  }
  return ReadAttributes(asked.tree);
}

int WordSets::ReadAttributes(const QueryNode& node) {
  int code = node.part == Part::EXT     ? ReadEndings(node)
             : node.part == Part::UNDER ? ReadUnder(node)
                                        : SQLITE_OK;
  for (size_t i = 0; i < node.below.size() && code == SQLITE_OK; ++i) {
    code = ReadAttributes(node.below[i]);
  }
  return code;
}

int WordSets::Collect(const char* sql, const std::string& query, IdSet& ids, bool counts) {
  Statement match;
  int code = match.Prepare(db, sql);
  if (code != SQLITE_OK) {
    return code;
  }
  match.BindText(1, query);
  for (code = match.Step(); code == SQLITE_ROW; code = match.Step()) {
    const int64_t id = match.Int(0);
    if (id < 0 || id > MOST_ROWS) {
      return SQLITE_CORRUPT;
    }
    ids.Add(id);
    if (counts) {
      const auto at = static_cast<size_t>(id);
      hits.resize(std::max(hits.size(), at < hits.size() ? at : at * 2 + 64));
      hits[at] += static_cast<uint32_t>(match.Int(1));
    }
  }
  return code == SQLITE_DONE ? SQLITE_OK : code;
}

int WordSets::ReadLeaf(const WordLeaf& leaf) {
  WordSet& set = sets[leaf.node];
  if (leaf.node->part == Part::NAME_PATTERN) {
    return ReadParts(*leaf.node, set);
  }
  set.is_sure = leaf.node->part == Part::WORD;
  set.everything = !set.is_sure && leaf.tokens.empty();
  int code = SQLITE_OK;
  if (!leaf.names_query.empty() && !leaf.tokens.empty()) {
    code =
        Collect("SELECT rowid FROM names WHERE names MATCH ?1", leaf.names_query, set.names, false);
  }
  if (code == SQLITE_OK && has_contents && !leaf.text_query.empty()) {
    code = Collect("SELECT rowid, word_hits(words) FROM contents.words WHERE words MATCH ?1",
                   leaf.text_query, set.texts, leaf.is_positive);
  }
  return code;
}

int WordSets::ReadParts(const QueryNode& node, WordSet& set) {
  NameFolder folder;
  std::string query;
  for (const std::string& piece : node.pieces) {
    query = PartsQuery(folder.Parts(piece), std::move(query));
  }
  if (!query.empty()) {
    const std::vector<size_t> starts = CharacterStarts(folder.Parts(node.pieces.front()));
    // One trigram is the piece itself.
    set.is_sure = node.pieces.size() == 1 && starts.size() == 4 && !node.at_start && !node.at_end;
    return Collect("SELECT rowid FROM parts WHERE parts MATCH ?1", query, set.names, false);
  }

  // Short ones of Han and the like stand as rows of words.
  const std::string first = folder.Parts(node.pieces.front());
  if (IsPaired(first)) {
    return Collect("SELECT rowid FROM names WHERE names MATCH ?1",
                   Quoted(folder.Words(node.pieces.front())), set.names, false);
  }
  set.everything = true;
  return SQLITE_OK;
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
    const int code = Collect("SELECT rowid FROM names WHERE names MATCH ?1",
                             Quoted(words + " " + NAME_END), set.names, false);
    if (code != SQLITE_OK) {
      return code;
    }
  }
  return SQLITE_OK;
}

// What a small folder holds is read out of the index of paths alone.
int WordSets::ReadUnder(const QueryNode& node) {
  constexpr int64_t MOST = 10000;
  WordSet& set = sets[&node];
  const PathRange range(node.names.front());
  Statement below;
  int code = below.Prepare(db,
                           "SELECT id FROM entries WHERE path = ?1 UNION ALL "
                           "SELECT id FROM (SELECT id FROM entries WHERE path > ?2 AND path < ?3 "
                           "LIMIT ?4)");
  if (code != SQLITE_OK) {
    return code;
  }
  below.BindBlob(1, node.names.front());
  below.BindBlob(2, range.first);
  below.BindBlob(3, range.end);
  below.BindInt(4, MOST);
  int64_t found = 0;
  for (code = below.Step(); code == SQLITE_ROW && found < MOST; code = below.Step()) {
    const int64_t id = below.Int(0);
    if (id < 0 || id > MOST_ROWS) {
      return SQLITE_CORRUPT;
    }
    set.names.Add(id);
    ++found;
  }
  set.is_sure = found < MOST;
  set.everything = !set.is_sure;
  return code == SQLITE_ROW || code == SQLITE_DONE ? SQLITE_OK : code;
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
      return Of(node);
  }
}

IdSet WordSets::Lower(const QueryNode& node) const {
  IdSet sure;
  switch (node.part) {
    case Part::AND: {
      bool is_first = true;
      for (const QueryNode& below : node.below) {
        if (below.part == Part::NOT) {
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

int64_t WordSets::Hits(int64_t text) const {
  const auto at = static_cast<size_t>(text);
  return at < hits.size() ? hits[at] : 0;
}

}  // namespace fileindexd
