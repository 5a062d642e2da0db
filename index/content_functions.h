// SPDX-License-Identifier: GPL-2.0-or-later
// What questions ask the full-text tables about a match.
//
//   word_mark(words)    how well the question's words are answered there, of MOST_WORD_MARK: see
//                       PlacesScore
//   word_places(words)  for each word of the question, where: see ReadWordPlaces
//   name_rank(names)    how well the words answer as a name, the last of them being NAME_END: about
//                       what HitScore says
#pragma once

#include <sqlite3.h>

#include <cstdint>
#include <string_view>
#include <vector>

namespace fileindexd {

int RegisterQuestionFunctions(sqlite3* db);  // SQLite's code

// How often one word stands in each column.
struct WordPlaces {
  uint32_t title = 0;
  uint32_t fields = 0;
  uint32_t text = 0;
};
// All zero for words that are not among them.
std::vector<WordPlaces> ReadWordPlaces(std::string_view bytes, size_t words);

constexpr int MOST_WORD_MARK = 255;
constexpr double USUAL_LENGTH = 8192;
// 0 to 1: title above other fields above text, often above once. A long text holds a word more
// often by chance.
double PlacesScore(const WordPlaces& found, double length);

}  // namespace fileindexd
