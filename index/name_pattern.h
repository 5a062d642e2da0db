// SPDX-License-Identifier: GPL-2.0-or-later
// Patterns of names: pieces with gaps between them.
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "index/id_set.h"
#include "index/name_text.h"
#include "index/query.h"
#include "state/sqlite.h"

namespace fileindexd {

// The pieces of one pattern, folded as the names are.
struct NamePieces {
  struct Place {
    size_t start;
    size_t end;
  };

  NamePieces(const QueryNode& pattern, NameFolder& folder);
  // `places`, if asked for: where the pieces stand; good only of what fits.
  bool Fits(std::string_view name, std::vector<Place>* places = nullptr) const;

  std::vector<std::string> folded;
  bool at_start;
  bool at_end;
};

// One thread.
class NamePattern {
 public:
  explicit NamePattern(const QueryNode& pattern);

  bool Fits(std::string_view folded) const { return pieces.Fits(folded); }  // of the folded name
  // The entries whose names fit. SQLite's code.
  int Find(sqlite3* db, IdSet& ids);

 private:
  std::string PartsQuery() const;
  int Keep(sqlite3* db, bool all, IdSet& ids);
  int Look(Statement& rows, const IdSet* among, IdSet& fitting);
  bool FitsName(std::string_view name);

  NameFolder folder;
  NamePieces pieces;
  std::string words_query;  // where trigrams are too long, and words are characters
};

}  // namespace fileindexd
