// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/name_pattern.h"

#include <algorithm>
#include <array>
#include <utility>

#include "base/ascii.h"
#include "base/utf8.h"
#include "index/asked.h"
#include "index/entry_table.h"
#include "index/text_tokenizer.h"

namespace fileindexd {

namespace {

// Reading one row of eight costs as much as reading all in a row.
constexpr uint64_t SPARSE = 8;

bool IsAscii(std::string_view text) {
  return std::all_of(text.begin(), text.end(), [](char c) { return (c & 0x80) == 0; });
}

// Whether each character is a word to the table of names.
bool IsPaired(const std::string& folded) {
  for (size_t at = 0; at < folded.size();) {
    const Character character = CharacterAt(folded, at);
    if (character.code < 0x80 || ClassOf(character.code) != CharacterClass::PAIRED) {
      return false;
    }
    at += character.size;
  }
  return !folded.empty();
}

}  // namespace

NamePieces::NamePieces(const QueryNode& pattern, NameFolder& folder)
    : at_start(pattern.at_start), at_end(pattern.at_end) {
  for (const std::string& piece : pattern.pieces) {
    folded.push_back(folder.Parts(piece));
  }
}

// The earliest place of each piece leaves most room for the next; an anchored last one stands at
// the end.
bool NamePieces::Fits(std::string_view name, std::vector<Place>* places) const {
  size_t at = 0;
  for (size_t i = 0; i < folded.size(); ++i) {
    const std::string& piece = folded[i];
    const bool is_last = i + 1 == folded.size();
    size_t start = 0;
    if (is_last && at_end) {
      start = name.size() - std::min(name.size(), piece.size());
      if (start < at || !name.ends_with(piece) || (i == 0 && at_start && start != 0)) {
        return false;
      }
    } else {
      start = i == 0 && at_start ? (name.starts_with(piece) ? 0 : std::string_view::npos)
                                 : name.find(piece, at);
      if (start == std::string_view::npos) {
        return false;
      }
    }
    at = start + piece.size();
    if (places != nullptr) {
      places->push_back({start, at});
    }
  }
  return true;
}

NamePattern::NamePattern(const QueryNode& pattern) : pieces(pattern, folder) {
  const auto paired = std::find_if(pieces.folded.begin(), pieces.folded.end(), IsPaired);
  if (paired != pieces.folded.end()) {
    words_query = Quoted(folder.Words(*paired));
  }
}

// Trigrams, all of which the names hold. Empty for shorter pieces.
std::string NamePattern::PartsQuery() const {
  std::string query;
  for (const std::string& piece : pieces.folded) {
    const std::vector<size_t> starts = CharacterStarts(piece);
    for (size_t i = 0; i + 3 < starts.size(); ++i) {
      query += (query.empty() ? "" : " AND ") +
               Quoted(std::string_view(piece).substr(starts[i], starts[i + 3] - starts[i]));
    }
  }
  return query;
}

int NamePattern::Find(sqlite3* db, IdSet& ids) {
  const std::string parts = PartsQuery();
  const std::string& query = parts.empty() ? words_query : parts;
  if (query.empty()) {
    return Keep(db, true, ids);
  }
  Statement match;
  int code = match.Prepare(db, parts.empty() ? "SELECT rowid FROM names WHERE names MATCH ?1"
                                             : "SELECT rowid FROM parts WHERE parts MATCH ?1");
  match.BindText(1, query);
  for (code = code == SQLITE_OK ? match.Step() : code; code == SQLITE_ROW; code = match.Step()) {
    if (!IsRowid(match.Int(0))) {
      return SQLITE_CORRUPT;
    }
    ids.Add(match.Int(0));
  }
  if (code != SQLITE_DONE) {
    return code;
  }
  // One trigram is the piece itself.
  const bool is_sure = pieces.folded.size() == 1 && !pieces.at_start && !pieces.at_end &&
                       !parts.empty() && CharacterStarts(pieces.folded.front()).size() == 4;
  return is_sure ? SQLITE_OK : Keep(db, false, ids);
}

// Looks at the names of those in the set, or of all.
int NamePattern::Keep(sqlite3* db, bool all, IdSet& ids) {
  Statement count;
  int code = count.Prepare(db, "SELECT entries FROM main.meta WHERE id = 1");
  if (code != SQLITE_OK || count.Step() != SQLITE_ROW) {
    return code == SQLITE_OK ? SQLITE_CORRUPT : code;
  }
  IdSet fitting;
  Statement rows;
  if (all || ids.Count() > static_cast<uint64_t>(count.Int(0)) / SPARSE) {
    code = rows.Prepare(db, "SELECT id, path FROM entries");
    code = code == SQLITE_OK ? Look(rows, all ? nullptr : &ids, fitting) : code;
  } else {
    code = rows.Prepare(db, "SELECT id, path FROM entries WHERE id = ?1");
    const std::vector<int64_t> candidates = ids.Ids();
    for (size_t i = 0; i < candidates.size() && code == SQLITE_OK; ++i) {
      rows.BindInt(1, candidates[i]);
      code = Look(rows, nullptr, fitting);
    }
  }
  ids = std::move(fitting);
  return code;
}

int NamePattern::Look(Statement& rows, const IdSet* among, IdSet& fitting) {
  int code = rows.Step();
  for (; code == SQLITE_ROW; code = rows.Step()) {
    const int64_t id = rows.Int(0);
    if (!IsRowid(id)) {
      return SQLITE_CORRUPT;
    }
    if (among != nullptr && !among->Has(id)) {
      continue;
    }
    const std::string_view path(static_cast<const char*>(sqlite3_column_blob(rows.handle, 1)),
                                static_cast<size_t>(sqlite3_column_bytes(rows.handle, 1)));
    if (FitsName(LastComponent(path))) {
      fitting.Add(id);
    }
  }
  rows.Reset();
  return StepError(code);
}

bool NamePattern::FitsName(std::string_view name) {
  if (!IsAscii(name)) {
    return Fits(folder.Parts(ToUtf8(name)));
  }
  std::array<char, 256> folded;  // NOLINT: what is read has been written
  const size_t size = std::min(name.size(), folded.size());
  for (size_t i = 0; i < size; ++i) {
    folded[i] = LowerLetter(name[i]);
  }
  return name.size() <= folded.size() ? Fits({folded.data(), size}) : Fits(folder.Parts(name));
}

}  // namespace fileindexd
