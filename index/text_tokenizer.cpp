// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/text_tokenizer.h"

#include "index/fts5_api.h"

namespace fileindexd {

int RegisterTextTokenizer(sqlite3* db) {
  fts5_api* api = Fts5Of(db);
  void* context = nullptr;
  static fts5_tokenizer functions;
  if (api == nullptr || api->xFindTokenizer(api, "unicode61", &context, &functions) != SQLITE_OK) {
    return SQLITE_NOMEM;
  }
  static fts5_tokenizer ours = functions;
  ours.xCreate = [](void* inner, const char** /*arguments*/, int /*count*/, Fts5Tokenizer** made) {
    const char* plain[] = {"remove_diacritics", "2"};
    return functions.xCreate(inner, plain, 2, made);
  };
  return api->xCreateTokenizer(api, TEXT_TOKENIZER, context, &ours, nullptr);
}

}  // namespace fileindexd
