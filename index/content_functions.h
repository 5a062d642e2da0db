// SPDX-License-Identifier: GPL-2.0-or-later
// What questions ask the full-text table of contents about a match.
//
//   word_hits(words)    how often the question's words stand there
//   word_places(words)  for each word of the question, where: see ReadWordPlaces
#pragma once

#include <sqlite3.h>

#include <cstdint>
#include <string_view>
#include <vector>

namespace fileindexd {

int RegisterContentFunctions(sqlite3* db);  // SQLite's code

// How often one word stands in each column.
struct WordPlaces {
  uint32_t title = 0;
  uint32_t fields = 0;
  uint32_t text = 0;
};
// All zero for words that are not among them.
std::vector<WordPlaces> ReadWordPlaces(std::string_view bytes, size_t words);

}  // namespace fileindexd
