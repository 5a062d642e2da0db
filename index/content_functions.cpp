// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/content_functions.h"

#include <algorithm>
#include <cstring>
#include <exception>

#include "index/fts5_api.h"

namespace fileindexd {

namespace {

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
      (column == 0 ? place.title : column == 1 ? place.fields : place.text) += 1;
    }
  }
  return code;
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

int RegisterContentFunctions(sqlite3* db) {
  fts5_api* api = Fts5Of(db);
  if (api == nullptr) {
    return SQLITE_NOMEM;
  }
  const int code = api->xCreateFunction(api, "word_hits", nullptr, WordHits, nullptr);
  return code == SQLITE_OK
             ? api->xCreateFunction(api, "word_places", nullptr, PutWordPlaces, nullptr)
             : code;
}

std::vector<WordPlaces> ReadWordPlaces(std::string_view bytes, size_t words) {
  std::vector<WordPlaces> places(words);
  memcpy(places.data(), bytes.data(), std::min(bytes.size(), words * sizeof(WordPlaces)));
  return places;
}

}  // namespace fileindexd
