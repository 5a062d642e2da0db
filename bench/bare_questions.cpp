// SPDX-License-Identifier: GPL-2.0-or-later
#include "bench/bare_questions.h"

#include <algorithm>
#include <iterator>

#include "bench/measure.h"
#include "index/content_text.h"
#include "index/entry_table.h"
#include "index/schema.h"
#include "index/text_tokenizer.h"

namespace fileindexd {

namespace {

constexpr int64_t BARE_APPLICATION = 0x62617265;
constexpr size_t SHOWN = 20;
constexpr uint64_t ROWS_IN_A_COMMIT = 20000;

// Its application_id and user_version are BARE_APPLICATION and 1. Tokenizers and what the tables
// leave out are as in the real index.
constexpr const char* BARE_SCHEMA = R"sql(
CREATE TABLE entries(id INTEGER PRIMARY KEY, path BLOB NOT NULL UNIQUE, kind INTEGER NOT NULL,
  size INTEGER NOT NULL, mtime INTEGER NOT NULL);
CREATE VIRTUAL TABLE names USING fts5(
  name, content='', columnsize=0, tokenize='unicode61 remove_diacritics 2');
CREATE TABLE texts(id INTEGER PRIMARY KEY, packed BLOB NOT NULL);
CREATE VIRTUAL TABLE words USING fts5(
  text, content='', columnsize=0, tokenize='fileindex english');
PRAGMA application_id = 1650553445;
PRAGMA user_version = 1;
)sql";

const DatabaseForm BARE_FORM = {
    .file = "bare.db",
    .application = BARE_APPLICATION,
    .version = 1,
    .schema = BARE_SCHEMA,
    .probe = "count(*)",
    .probed = "entries WHERE id < 0",
    .last_commit = nullptr,
    .prepare = RegisterTextTokenizer,
    .most_log_frames = LEAST_LOG_FRAMES,
};

void Check(int code, const char* what) {
  if (code != SQLITE_OK) {
    Fail(std::string("bare questions: ") + what + ": " + sqlite3_errstr(code));
  }
}

void Prepare(const IndexDatabase& database, Statement& statement, const char* sql) {
  Check(statement.Prepare(database.db, sql), sql);
}

}  // namespace

BareWriter::BareWriter(const std::string& in_folder) {
  if (database.OpenForWriting(in_folder, true, BARE_FORM) != IndexError::NONE) {
    Fail("cannot open " + in_folder);
  }
  Prepare(database, put_entry, "INSERT INTO entries VALUES(?1, ?2, ?3, ?4, ?5)");
  Prepare(database, put_name, "INSERT INTO names(rowid, name) VALUES(?1, ?2)");
  Prepare(database, put_text, "INSERT INTO texts VALUES(?1, ?2)");
  Prepare(database, put_words, "INSERT INTO words(rowid, text) VALUES(?1, ?2)");
}

void BareWriter::Put(int64_t id, const Entry& entry, const Content* content) {
  if (put % ROWS_IN_A_COMMIT == 0) {
    Commit();
    Check(sqlite3_exec(database.db, "BEGIN", nullptr, nullptr, nullptr), "begin");
  }
  ++put;
  put_entry.BindInt(1, id);
  put_entry.BindBlob(2, entry.path);
  put_entry.BindInt(3, static_cast<int64_t>(entry.kind));
  put_entry.BindInt(4, entry.size);
  put_entry.BindInt(5, entry.mtime);
  Check(put_entry.Run(), "entry");
  const std::string name = NameRow(folder, LastComponent(entry.path));
  put_name.BindInt(1, id);
  put_name.BindText(2, name);
  Check(put_name.Run(), "name");
  if (content != nullptr) {
    const std::string packed = PackTexts(*content);
    put_text.BindInt(1, id);
    put_text.BindBlob(2, packed);
    Check(put_text.Run(), "text");
    put_words.BindInt(1, id);
    put_words.BindText(2, content->text);
    Check(put_words.Run(), "words");
  }
}

void BareWriter::Commit() {
  if (sqlite3_get_autocommit(database.db) == 0) {
    Check(sqlite3_exec(database.db, "COMMIT", nullptr, nullptr, nullptr), "commit");
  }
}

BareQuestions::BareQuestions(const std::string& in_folder) {
  if (database.OpenForReading(in_folder, BARE_FORM) != IndexError::NONE) {
    Fail("cannot open " + in_folder);
  }
  // As much as four shares have together.
  Check(sqlite3_exec(database.db, "PRAGMA cache_size = -32768", nullptr, nullptr, nullptr),
        "cache");
  Prepare(database, entry_of, "SELECT path, kind, size, mtime FROM entries WHERE id = ?1");
  Prepare(database, text_of, "SELECT packed FROM texts WHERE id = ?1");
}

// Ascending.
std::vector<int64_t> BareQuestions::Matches(const char* table, const BareQuestion& question,
                                            const std::string& word) {
  const std::string name = table;
  const std::string sql = question.condition.empty()
                              ? "SELECT rowid FROM " + name + " WHERE " + name + " MATCH ?1"
                              : "SELECT " + name + ".rowid FROM " + name +
                                    " CROSS JOIN entries ON entries.id = " + name +
                                    ".rowid WHERE " + name + " MATCH ?1 AND " + question.condition;
  Statement match;
  Check(match.Prepare(database.db, sql.c_str()), sql.c_str());
  match.BindText(1, word);
  std::vector<int64_t> ids;
  int code = match.Step();
  for (; code == SQLITE_ROW; code = match.Step()) {
    ids.push_back(match.Int(0));
  }
  Check(code == SQLITE_DONE ? SQLITE_OK : code, "match");
  return ids;
}

void BareQuestions::Fetch(int64_t id) {
  entry_of.BindInt(1, id);
  Check(entry_of.Step() == SQLITE_ROW ? SQLITE_OK : SQLITE_CORRUPT, "entry");
  const std::string path = entry_of.Bytes(0);
  entry_of.Reset();
  text_of.BindInt(1, id);
  Content content;
  if (text_of.Step() == SQLITE_ROW && !UnpackTexts(text_of.Bytes(0), content)) {
    Fail("a text of the bare engine cannot be read");
  }
  text_of.Reset();
}

uint64_t BareQuestions::Ask(const BareQuestion& question) {
  std::vector<int64_t> all;
  std::vector<int64_t> with_text;
  for (size_t i = 0; i < question.words.size(); ++i) {
    const std::vector<int64_t> names = Matches("names", question, question.words[i]);
    const std::vector<int64_t> texts = Matches("words", question, question.words[i]);
    std::vector<int64_t> either;
    std::set_union(names.begin(), names.end(), texts.begin(), texts.end(),
                   std::back_inserter(either));
    std::vector<int64_t> both;
    std::set_intersection(all.begin(), all.end(), either.begin(), either.end(),
                          std::back_inserter(both));
    all = i == 0 ? std::move(either) : std::move(both);
    with_text.insert(with_text.end(), texts.rbegin(), texts.rend());
  }
  std::erase_if(with_text,
                [&all](int64_t id) { return !std::binary_search(all.begin(), all.end(), id); });
  const size_t shown = std::min(SHOWN, all.size());
  for (size_t i = 0; i < shown; ++i) {
    Fetch(i < with_text.size() ? with_text[i] : all[all.size() - 1 - i]);
  }
  return all.size();
}

}  // namespace fileindexd
