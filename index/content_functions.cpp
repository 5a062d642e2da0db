// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/content_functions.h"

#include <algorithm>
#include <climits>
#include <cstring>
#include <exception>

#include "index/contents_schema.h"
#include "index/fts5_api.h"

namespace fileindexd {

namespace {

constexpr int TITLE_COLUMN = FIRST_FIELD_COLUMN;

void WordHits(const Fts5ExtensionApi* api, Fts5Context* match, sqlite3_context* result,
              int /*count*/, sqlite3_value** /*arguments*/) {
  int hits = 0;
  const int code = api->xInstCount(match, &hits);
  if (code == SQLITE_OK) {
    sqlite3_result_int(result, hits);
  } else {
    sqlite3_result_error_code(result, code);
  }
}

int CountPlaces(const Fts5ExtensionApi* api, Fts5Context* match, std::vector<WordPlaces>& places) {
  int hits = 0;
  int code = api->xInstCount(match, &hits);
  for (int i = 0; i < hits && code == SQLITE_OK; ++i) {
    int word = 0;
    int column = 0;
    int offset = 0;
    code = api->xInst(match, i, &word, &column, &offset);
    if (code == SQLITE_OK) {
      WordPlaces& place = places[static_cast<size_t>(word)];
      (column == TITLE_COLUMN  ? place.title
       : column == TEXT_COLUMN ? place.text
                               : place.fields) += 1;
    }
  }
  return code;
}

// The end of a name is the last phrase of the question.
void NameRank(const Fts5ExtensionApi* api, Fts5Context* match, sqlite3_context* result,
              int /*count*/, sqlite3_value** /*arguments*/) {
  int hits = 0;
  int code = api->xInstCount(match, &hits);
  const int last = api->xPhraseCount(match) - 1;
  int end = 0;
  int first = INT_MAX;
  int covered = 0;
  int before = -1;
  for (int i = 0; i < hits && code == SQLITE_OK; ++i) {
    int word = 0;
    int column = 0;
    int offset = 0;
    code = api->xInst(match, i, &word, &column, &offset);
    if (word == last) {
      end = offset;
    } else {
      first = std::min(first, offset);
      covered += offset > before ? api->xPhraseSize(match, word) : 0;  // each place once
      before = offset;
    }
  }
  if (code != SQLITE_OK) {
    sqlite3_result_error_code(result, code);
    return;
  }
  const int rank = covered >= end ? 3 : first != 0 ? 0 : covered + 1 == end ? 2 : 1;
  sqlite3_result_double(result, rank + static_cast<double>(covered) / (end + 1));
}

void PutWordPlaces(const Fts5ExtensionApi* api, Fts5Context* match, sqlite3_context* result,
                   int /*count*/, sqlite3_value** /*arguments*/) {
  try {
    std::vector<WordPlaces> places(static_cast<size_t>(api->xPhraseCount(match)));
    const int code = CountPlaces(api, match, places);
    if (code == SQLITE_OK) {
      sqlite3_result_blob64(result, places.data(), places.size() * sizeof(WordPlaces),
                            SQLITE_TRANSIENT);
    } else {
      sqlite3_result_error_code(result, code);
    }
  } catch (const std::exception&) {
    sqlite3_result_error_nomem(result);
  }
}

}  // namespace

int RegisterQuestionFunctions(sqlite3* db) {
  fts5_api* api = Fts5Of(db);
  if (api == nullptr) {
    return SQLITE_NOMEM;
  }
  int code = api->xCreateFunction(api, "word_hits", nullptr, WordHits, nullptr);
  code = code == SQLITE_OK
             ? api->xCreateFunction(api, "word_places", nullptr, PutWordPlaces, nullptr)
             : code;
  return code == SQLITE_OK ? api->xCreateFunction(api, "name_rank", nullptr, NameRank, nullptr)
                           : code;
}

std::vector<WordPlaces> ReadWordPlaces(std::string_view bytes, size_t words) {
  std::vector<WordPlaces> places(words);
  memcpy(places.data(), bytes.data(), std::min(bytes.size(), words * sizeof(WordPlaces)));
  return places;
}

}  // namespace fileindexd
