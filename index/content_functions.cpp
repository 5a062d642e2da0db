// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/content_functions.h"

#include <algorithm>
#include <climits>

#include "index/contents_schema.h"
#include "index/fts5_api.h"
#include "index/hit_score.h"
#include "index/text_marks.h"

namespace fileindexd {

namespace {

constexpr int TITLE_COLUMN = FIRST_FIELD_COLUMN;

// Only its first phrase counts: what stands behind it says where to look.
void WordMark(const Fts5ExtensionApi* api, Fts5Context* match, sqlite3_context* result,
              int /*count*/, sqlite3_value** /*arguments*/) {
  int all = 0;
  int code = api->xInstCount(match, &all);
  uint32_t hits = 0;
  auto where = TextMark::TEXT;
  for (int i = 0; i < all && code == SQLITE_OK; ++i) {
    int word = 0;
    int column = 0;
    int offset = 0;
    code = api->xInst(match, i, &word, &column, &offset);
    if (word != 0) {
      continue;
    }
    ++hits;
    where = column == TITLE_COLUMN                              ? TextMark::TITLE
            : column == TEXT_COLUMN || where == TextMark::TITLE ? where
                                                                : TextMark::FIELDS;
  }
  if (code == SQLITE_OK) {
    sqlite3_result_int(result, TextMark::Of(where, hits));
  } else {
    sqlite3_result_error_code(result, code);
  }
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
  sqlite3_result_double(result, rank + NAME_COVER * covered / (end + 1));
}

}  // namespace

int RegisterQuestionFunctions(sqlite3* db) {
  fts5_api* api = Fts5Of(db);
  if (api == nullptr) {
    return SQLITE_NOMEM;
  }
  const int code = api->xCreateFunction(api, "word_mark", nullptr, WordMark, nullptr);
  return code == SQLITE_OK ? api->xCreateFunction(api, "name_rank", nullptr, NameRank, nullptr)
                           : code;
}

}  // namespace fileindexd
