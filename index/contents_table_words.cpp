// SPDX-License-Identifier: GPL-2.0-or-later
// The table of words as a whole: made, made anew from what is stored, merged.
#include <algorithm>

#include "index/contents_table.h"

namespace fileindexd {

namespace {

constexpr size_t REWORD_BYTES = size_t{1} << 20;
constexpr size_t REWORD_ROW = 500;  // a text is not free, however short
constexpr const char* OLD_WORDS = "old_words";
// Pages of the old table, from its end: 2 MiB. Its first rows tell what it holds, and go with it.
constexpr const char* REMOVE_OLD_PAGES =
    "DELETE FROM old_words_data WHERE id IN "
    "(SELECT id FROM old_words_data WHERE id > 10 ORDER BY id DESC LIMIT 512)";

// Pages of one step: some hundredths of a second.
constexpr const char* MERGE_PAGES = "INSERT INTO words(words, rank) VALUES('merge', -256)";
constexpr int MERGED = 2;  // rows that change though nothing was left to merge: fewer
// Below that the segments are few or small.
constexpr int64_t LEAST_TO_MERGE = 256;

}  // namespace

int ContentsTable::HasTable(const char* name, bool& has) {
  Statement statement;
  has = false;
  int code = statement.Prepare(handle, "SELECT 1 FROM sqlite_master WHERE name = ?1");
  if (code == SQLITE_OK) {
    statement.BindText(1, name);
    code = statement.ReadOne(has, [] {});
  }
  return code;
}

int ContentsTable::PrepareWords() {
  std::string values = "?1";
  for (size_t i = 0; i <= TEXT_FIELD_COUNT + 1; ++i) {
    values += ", ?" + std::to_string(i + 2);
  }
  const std::string columns = std::string("rowid, ") + WORD_COLUMNS + ") VALUES(";
  const std::string insert_sql = "INSERT INTO words(" + columns + values + ")";
  const std::string remove_sql =
      "INSERT INTO words(words, " + columns + "'delete', " + values + ")";
  int code = insert_words.Prepare(handle, insert_sql.c_str());
  code = code == SQLITE_OK ? remove_words.Prepare(handle, remove_sql.c_str()) : code;
  return code == SQLITE_OK ? HasTable(OLD_WORDS, has_old_words) : code;
}

// What stands in the words by now is taken away in slices (see Reword): of many texts it would take
// long. There is one such table at most.
int ContentsTable::MakeWords(const std::string& language, const std::string& version) {
  bool has_words = false;
  int code = Begin();
  code = code == SQLITE_OK ? HasTable("words", has_words) : code;
  code = code == SQLITE_OK ? HasTable(OLD_WORDS, has_old_words) : code;
  if (code == SQLITE_OK && has_words && !has_old_words) {
    code = sqlite3_exec(handle, "ALTER TABLE words RENAME TO old_words", nullptr, nullptr, nullptr);
  }
  if (code == SQLITE_OK) {
    code = sqlite3_exec(handle, WordsSchema(language).c_str(), nullptr, nullptr, nullptr);
  }
  meta.language = language;
  meta.words_version = version;
  meta.reword_end = meta.last_text;
  meta.reworded = meta.last_text == 0 ? ALL_WORDS : 0;
  meta.merged = 0;
  return code;
}

int ContentsTable::RemoveOldWords() {
  int code = sqlite3_exec(handle, REMOVE_OLD_PAGES, nullptr, nullptr, nullptr);
  if (code == SQLITE_OK && sqlite3_changes(handle) == 0) {
    code = sqlite3_exec(handle, "DROP TABLE old_words", nullptr, nullptr, nullptr);
    has_old_words = code != SQLITE_OK;
  }
  return code;
}

int ContentsTable::Reword(bool& more) {
  more = meta.reworded != ALL_WORDS || has_old_words;
  int code = more ? Begin() : SQLITE_OK;
  code = code == SQLITE_OK && has_old_words ? RemoveOldWords() : code;
  if (code != SQLITE_OK || meta.reworded == ALL_WORDS) {
    return code;
  }

  next_texts.BindInt(1, meta.reworded);
  next_texts.BindInt(2, meta.reword_end);
  code = next_texts.Step();
  more = code == SQLITE_ROW;
  for (size_t bytes = 0; code == SQLITE_ROW && bytes < REWORD_BYTES;) {
    Content content;
    const int64_t text = next_texts.Int(0);
    if (!UnpackTexts(next_texts.Bytes(1), content)) {
      code = SQLITE_CORRUPT;
      break;
    }
    bytes += content.text.size() + REWORD_ROW;
    pending_bytes += content.text.size();
    code = AddWords(text, WordsOf(content));
    meta.reworded = text;
    code = code == SQLITE_OK ? next_texts.Step() : code;
  }
  next_texts.Reset();
  if (!more && code == SQLITE_DONE) {
    meta.reworded = ALL_WORDS;
    more = has_old_words;
  }
  return StepError(code);
}

// The table takes a segment for each transaction, merges those of a size when they are many, and
// stops there. In one segment each word stands once: it is smaller, and questions are quicker.
int ContentsTable::MergeWords(bool& more) {
  more = false;
  if (meta.reworded != ALL_WORDS || has_old_words) {
    return SQLITE_OK;
  }
  if (!merging) {
    const int code = IsWorthMerging(merging);
    if (code != SQLITE_OK || !merging) {
      more = code == SQLITE_OK && HasFreePages();
      return more ? Begin() : code;
    }
  }

  int code = Begin();
  const int before = sqlite3_total_changes(handle);
  code = code == SQLITE_OK ? sqlite3_exec(handle, MERGE_PAGES, nullptr, nullptr, nullptr) : code;
  if (code == SQLITE_OK && sqlite3_total_changes(handle) - before < MERGED) {
    meta.merged = meta.last_text;
    merging = false;
  }
  more = code == SQLITE_OK;  // what has become free is given back by commits
  return code;
}

// All is written once more: not before a quarter is new.
int ContentsTable::IsWorthMerging(bool& is_worth) {
  int code = count_done.Step();
  const int64_t done = code == SQLITE_ROW ? count_done.Int(0) : 0;
  count_done.Reset();
  is_worth = meta.last_text - meta.merged >= std::max(LEAST_TO_MERGE, done / 4);
  return code == SQLITE_ROW ? SQLITE_OK : code;
}

}  // namespace fileindexd
