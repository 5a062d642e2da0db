// SPDX-License-Identifier: GPL-2.0-or-later
// The table of words as a whole: made, made anew from what is stored, merged.
#include <algorithm>

#include "index/contents_table.h"
#include "index/words_version.h"

namespace fileindexd {

namespace {

constexpr size_t REWORD_BYTES = size_t{1} << 20;
constexpr size_t REWORD_ROW = 500;  // a text is not free, however short
constexpr const char* NEW_WORDS = "new_words";
constexpr const char* OLD_WORDS = "old_words";
// Pages of the old table, from its end: 2 MiB. Its first rows tell what it holds, and go with it.
constexpr const char* REMOVE_OLD_PAGES =
    "DELETE FROM old_words_data WHERE id IN "
    "(SELECT id FROM old_words_data WHERE id > 10 ORDER BY id DESC LIMIT 512)";
// Its parts have such names, too, and are no virtual tables.
constexpr const char* OTHER_OLD_WORDS =
    "SELECT name FROM sqlite_master WHERE name GLOB 'old_words[0-9]*'"
    " AND sql LIKE 'CREATE VIRTUAL%' LIMIT 1";

// Pages of one step: some hundredths of a second.
constexpr const char* MERGE_PAGES = "INSERT INTO words(words, rank) VALUES('merge', -256)";
constexpr int MERGED = 2;  // rows that change though nothing was left to merge: fewer
// Below that the segments are few or small.
constexpr int64_t LEAST_TO_MERGE = 256;

}  // namespace

int ContentsTable::Exists(const char* name, bool& has) {
  Statement statement;
  has = false;
  int code = statement.Prepare(handle, "SELECT 1 FROM sqlite_master WHERE name = ?1");
  if (code == SQLITE_OK) {
    statement.BindText(1, name);
    code = statement.ReadOne(has, [] {});
  }
  return code;
}

int ContentsTable::PrepareInto(const std::string& table, sqlite3* db, Statement& insert,
                               Statement& remove) {
  std::string values = "?1";
  for (size_t i = 0; i <= TEXT_FIELD_COUNT + 1; ++i) {
    values += ", ?" + std::to_string(i + 2);
  }
  const std::string columns = std::string("rowid, ") + WORD_COLUMNS + ") VALUES(";
  const std::string into = "INSERT INTO " + table + "(";
  const int code = insert.Prepare(db, (into + columns + values + ")").c_str());
  return code == SQLITE_OK
             ? remove.Prepare(db,
                              (into + table + ", " + columns + "'delete', " + values + ")").c_str())
             : code;
}

int ContentsTable::PrepareWords() {
  const int code = PrepareInto("words", handle, insert_words, remove_words);
  return code == SQLITE_OK && !new_language.empty()
             ? PrepareInto(NEW_WORDS, handle, insert_new_words, remove_new_words)
             : code;
}

int ContentsTable::ReadWordsToBe(Words& to_be, bool& found) {
  int code = Exists("words_to_be", found);
  if (code != SQLITE_OK || !found) {
    return code;
  }
  Statement statement;
  code = statement.Prepare(handle, "SELECT language, version FROM words_to_be");
  return code == SQLITE_OK ? statement.ReadOne(found,
                                               [&] {
                                                 to_be = {statement.Bytes(0), statement.Bytes(1)};
                                               })
                           : code;
}

int ContentsTable::UseWords(const std::string& language, const std::string& version) {
  const Words wanted = {language, version};
  const Words current = {meta.language, meta.words_version};
  Words to_be;
  bool is_making = false;
  int code = ReadWordsToBe(to_be, is_making);
  code = code == SQLITE_OK ? Exists(OLD_WORDS, has_old_words) : code;
  // Older versions made new words in the place of the old ones: what is there lacks some, and what
  // is not there must not be taken out.
  const bool is_partial = !is_making && meta.reworded != ALL_WORDS;
  if (code == SQLITE_OK && is_making && (to_be != wanted || current == wanted)) {
    code = DropNewWords();
    is_making = false;
  }
  if (code == SQLITE_OK && !is_making && (current != wanted || meta.reworded != ALL_WORDS)) {
    meta.words_version = is_partial ? "" : meta.words_version;
    code = BeginWords(wanted);
  } else if (is_making) {
    new_language = language;
  }
  may_remove = WordsVersion(meta.language) == meta.words_version;
  return code == SQLITE_OK ? PrepareWords() : code;
}

// Without texts there is nothing to make anew.
int ContentsTable::BeginWords(const Words& to_be) {
  bool has_words = false;
  int code = Begin();
  code = code == SQLITE_OK ? Exists("words", has_words) : code;
  if (code != SQLITE_OK) {
    return code;
  }
  if (meta.last_text == 0 || !has_words) {
    meta.language = to_be.language;
    meta.words_version = to_be.version;
    meta.reworded = ALL_WORDS;
    meta.merged = 0;
    // With texts and without words it is not whole.
    return meta.last_text == 0 ? Execute(handle, WordsSchema("words", to_be.language).c_str())
                               : SQLITE_ERROR;
  }
  const std::string make = WordsSchema(NEW_WORDS, to_be.language) +
                           ";CREATE TABLE words_to_be(language TEXT, version TEXT)";
  code = Execute(handle, make.c_str());
  Statement note;
  code = code == SQLITE_OK ? note.Prepare(handle, "INSERT INTO words_to_be VALUES(?1, ?2)") : code;
  if (code == SQLITE_OK) {
    note.BindText(1, to_be.language);
    note.BindText(2, to_be.version);
    code = note.Run();
  }
  new_language = to_be.language;
  meta.reword_end = meta.last_text;
  meta.reworded = 0;
  return code;
}

// What was made is taken away in slices (see Reword), as of many texts it would take long; where
// there is such a table, behind it.
int ContentsTable::DropNewWords() {
  int code = Begin();
  std::string aside = OLD_WORDS;
  bool taken = has_old_words;
  for (int number = 2; code == SQLITE_OK && taken; ++number) {
    aside = OLD_WORDS + std::to_string(number);
    code = Exists(aside.c_str(), taken);
  }
  const std::string rename = "ALTER TABLE new_words RENAME TO " + aside + ";DROP TABLE words_to_be";
  code = code == SQLITE_OK ? Execute(handle, rename.c_str()) : code;
  has_old_words = true;
  new_language.clear();
  meta.reworded = ALL_WORDS;
  return code;
}

int ContentsTable::ReplaceWords() {
  Words made;
  bool found = false;
  int code = ReadWordsToBe(made, found);
  if (code != SQLITE_OK || !found) {
    return code == SQLITE_OK ? SQLITE_CORRUPT : code;
  }
  code = Execute(handle,
                 "ALTER TABLE words RENAME TO old_words;"
                 "ALTER TABLE new_words RENAME TO words;"
                 "DROP TABLE words_to_be");
  meta.language = made.language;
  meta.words_version = made.version;
  meta.reworded = ALL_WORDS;
  meta.merged = 0;
  new_language.clear();
  may_remove = true;
  has_old_words = true;
  return code;
}

int ContentsTable::RemoveOldWords() {
  int code = Execute(handle, REMOVE_OLD_PAGES);
  if (code != SQLITE_OK || sqlite3_changes(handle) != 0) {
    return code;
  }
  code = Execute(handle, "DROP TABLE old_words");
  Statement others;
  code = code == SQLITE_OK ? others.Prepare(handle, OTHER_OLD_WORDS) : code;
  std::string next;
  code = code == SQLITE_OK ? others.ReadOne(has_old_words, [&] { next = others.Bytes(0); }) : code;
  next = "ALTER TABLE " + next + " RENAME TO old_words";
  return code == SQLITE_OK && has_old_words ? Execute(handle, next.c_str()) : code;
}

int ContentsTable::Reword(bool& more) {
  more = meta.reworded != ALL_WORDS || has_old_words;
  int code = more ? Begin() : SQLITE_OK;
  code = code == SQLITE_OK && has_old_words ? RemoveOldWords() : code;
  if (code != SQLITE_OK || meta.reworded == ALL_WORDS) {
    return code;
  }
  bool has_texts = false;
  code = MakeNewWords(has_texts);
  // The name that its words go by then has to be free.
  return code == SQLITE_OK && !has_texts && !has_old_words ? ReplaceWords() : code;
}

int ContentsTable::MakeNewWords(bool& more) {
  next_texts.BindInts({meta.reworded, meta.reword_end});
  int code = next_texts.Step();
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
    code = RunWords(insert_new_words, text, WordsOf(content));
    meta.reworded = text;
    code = code == SQLITE_OK ? next_texts.Step() : code;
  }
  next_texts.Reset();
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
  code = code == SQLITE_OK ? Execute(handle, MERGE_PAGES) : code;
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
