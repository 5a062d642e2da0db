// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/name_tokens.h"

#include "index/fts5_api.h"

namespace fileindexd {

namespace {

int Collect(void* context, int /*flags*/, const char* token, int size, int /*start*/, int /*end*/) {
  static_cast<std::vector<std::string>*>(context)->emplace_back(token, static_cast<size_t>(size));
  return SQLITE_OK;
}

int CollectPlaces(void* context, int /*flags*/, const char* token, int size, int start, int end) {
  static_cast<std::vector<NameTokenizer::Place>*>(context)->push_back(
      {std::string(token, static_cast<size_t>(size)), static_cast<size_t>(start),
       static_cast<size_t>(end)});
  return SQLITE_OK;
}

}  // namespace

NameTokenizer::~NameTokenizer() {
  if (tokenizer != nullptr) {
    functions.xDelete(tokenizer);
  }
  sqlite3_close_v2(db);
}

bool NameTokenizer::Open() {
  if (sqlite3_open_v2(":memory:", &db, SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE, nullptr) !=
      SQLITE_OK) {
    return false;
  }

  fts5_api* api = Fts5Of(db);
  void* context = nullptr;
  if (api == nullptr || api->xFindTokenizer(api, "unicode61", &context, &functions) != SQLITE_OK) {
    return false;
  }

  // The arguments of the schema's `names`.
  const char* arguments[] = {"remove_diacritics", "2"};
  return functions.xCreate(context, arguments, 2, &tokenizer) == SQLITE_OK;
}

std::vector<std::string> NameTokenizer::Tokens(std::string_view text) const {
  constexpr size_t USUAL = 8;
  std::vector<std::string> tokens;
  tokens.reserve(USUAL);
  (void)functions.xTokenize(tokenizer, &tokens, FTS5_TOKENIZE_QUERY, text.data(),
                            static_cast<int>(text.size()), Collect);
  return tokens;
}

std::vector<NameTokenizer::Place> NameTokenizer::Places(std::string_view text) const {
  std::vector<Place> places;
  (void)functions.xTokenize(tokenizer, &places, FTS5_TOKENIZE_QUERY, text.data(),
                            static_cast<int>(text.size()), CollectPlaces);
  return places;
}

}  // namespace fileindexd
