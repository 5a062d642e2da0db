// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/contents_schema.h"

#include <string_view>

#include "index/text_tokenizer.h"

namespace fileindexd {

static_assert(CONTENTS_APPLICATION == 1179206479 && CONTENTS_VERSION == 3 &&
                  ALL_WORDS == 9223372036854775807 && NOT_KEPT == 5,
              "numbers in the text below");

namespace {

#define LATER                                                                                    \
  "CREATE TABLE IF NOT EXISTS later(file INTEGER PRIMARY KEY, due INTEGER NOT NULL);"            \
  "CREATE INDEX IF NOT EXISTS later_by_due ON later(due);"                                       \
  "UPDATE files SET state = 1, tries = 0, reason = ''"                                           \
  " WHERE state >= 2 AND state = 2 AND extractor = 0;"                                           \
  "UPDATE counts SET waiting = 0, done = 0, failed = 0;"                                         \
  "INSERT OR IGNORE INTO counts VALUES(5, 0, 0, 0);"                                             \
  "INSERT INTO counts SELECT iif(state = 1 AND (extractor = 0 OR max(found_kind, kind) = 0), 5," \
  " iif(found_kind <> 0, found_kind, kind)) AS counted,"                                         \
  " sum(state = 0), sum(state = 1), sum(state >= 2) FROM files WHERE true GROUP BY counted"      \
  " ON CONFLICT(kind) DO UPDATE SET"                                                             \
  " waiting = excluded.waiting, done = excluded.done, failed = excluded.failed;"

#define TO_READ                         \
  "DROP INDEX IF EXISTS files_waiting;" \
  "CREATE INDEX files_to_read ON files(extractor, " WAITING_ORDER ") WHERE state = 0;"

// AUTOINCREMENT: what was handed out and ends after its row is gone must not meet another file.
constexpr const char* CONTENTS_SCHEMA = R"sql(
CREATE TABLE files(
  id INTEGER PRIMARY KEY AUTOINCREMENT,
  inode INTEGER NOT NULL,
  birth_time INTEGER NOT NULL,
  size INTEGER NOT NULL,
  mtime INTEGER NOT NULL,
  ctime INTEGER NOT NULL,
  kind INTEGER NOT NULL,
  found_kind INTEGER NOT NULL,
  state INTEGER NOT NULL,
  extractor INTEGER NOT NULL,
  tries INTEGER NOT NULL,
  unended INTEGER NOT NULL,
  begun INTEGER NOT NULL,
  unreferred_since INTEGER NOT NULL,
  reread INTEGER NOT NULL,
  text INTEGER NOT NULL,
  length INTEGER NOT NULL,
  reason TEXT NOT NULL DEFAULT '',
  is_cut INTEGER NOT NULL DEFAULT 0,
  sample INTEGER NOT NULL DEFAULT 0,
  fields INTEGER NOT NULL DEFAULT 0,
  pages INTEGER, created INTEGER, sent INTEGER, taken INTEGER, recorded INTEGER, year INTEGER,
  track INTEGER, duration INTEGER, bit_rate INTEGER, width INTEGER, height INTEGER,
  latitude INTEGER, longitude INTEGER, rating INTEGER,
  UNIQUE(inode, birth_time));
CREATE INDEX files_failed ON files(id) WHERE state >= 2;
CREATE INDEX files_begun ON files(id) WHERE begun <> 0;
CREATE INDEX files_unreferred ON files(unreferred_since) WHERE unreferred_since <> 0;
CREATE INDEX files_by_text ON files(text, inode, birth_time, size, mtime) WHERE text <> 0;
CREATE INDEX files_by_sample ON files(sample, size) WHERE sample <> 0;
CREATE TABLE texts(id INTEGER PRIMARY KEY, packed BLOB NOT NULL);
CREATE TABLE counts(
  kind INTEGER PRIMARY KEY,
  waiting INTEGER NOT NULL,
  done INTEGER NOT NULL,
  failed INTEGER NOT NULL);
INSERT INTO counts VALUES(0, 0, 0, 0), (1, 0, 0, 0), (2, 0, 0, 0), (3, 0, 0, 0), (4, 0, 0, 0);
CREATE TABLE rate(second INTEGER PRIMARY KEY, done INTEGER NOT NULL);
CREATE TABLE meta(
  id INTEGER PRIMARY KEY CHECK (id = 1),
  filesystem TEXT NOT NULL,
  language TEXT NOT NULL,
  extractor INTEGER NOT NULL,
  entries_made INTEGER NOT NULL,
  seen INTEGER NOT NULL,
  last_text INTEGER NOT NULL,
  reworded INTEGER NOT NULL,
  reword_end INTEGER NOT NULL,
  words_version TEXT NOT NULL,
  merged INTEGER NOT NULL);
INSERT INTO meta VALUES(1, '', '', 0, 0, 0, 0, 9223372036854775807, 0, '', 0);
PRAGMA application_id = 1179206479;
PRAGMA user_version = 3;
)sql" LATER TO_READ;

}  // namespace

const DatabaseForm CONTENTS_FORM = {
    .file = "contents.db",
    .application = CONTENTS_APPLICATION,
    .version = CONTENTS_VERSION,
    .schema = CONTENTS_SCHEMA,
    .probe = "last_text",
    .probed = "meta WHERE id = 1",
    .last_commit = nullptr,  // a text that is missing is read again
    .prepare = RegisterTextTokenizer,
    // Merging writes the same pages again and again: in a long log most are copied back once. The
    // log is no longer than that, as whoever opens the database alone reads the whole of it first.
    .most_log_frames = 3 * LEAST_LOG_FRAMES,
};

const std::array<ContentsAddition, 2> CONTENTS_ADDITIONS = {
    {{"later", "BEGIN IMMEDIATE;" LATER "COMMIT"},
     {"files_to_read", "BEGIN IMMEDIATE;" TO_READ "COMMIT"}}};

const char* const NUMBER_COLUMNS =
    "pages, created, sent, taken, recorded, year, track, duration, bit_rate, width, height, "
    "latitude, longitude, rating";

const char* const WORD_COLUMNS =
    "text, title, author, subject, description, keywords, sender, receivers, attachments, members, "
    "artist, album, album_artist, genre, composer, codecs, camera, lens, caption, numbers";

FieldNumbers ReadNumbers(const Statement& row, int first) {
  FieldNumbers numbers;
  for (size_t i = 0; i < numbers.size(); ++i) {
    const int column = first + static_cast<int>(i);
    if (sqlite3_column_type(row.handle, column) != SQLITE_NULL) {
      numbers[i] = row.Int(column);
    }
  }
  return numbers;
}

std::string ColumnAt(const char* columns, size_t place) {
  std::string_view rest = columns;
  for (size_t i = 0; i < place; ++i) {
    rest.remove_prefix(rest.find(", ") + 2);
  }
  return std::string(rest.substr(0, rest.find(',')));
}

// The hash that collects words before they are written as a segment holds 8 MiB: fewer segments
// to merge, which is what most of the time goes into.
std::string WordsSchema(const std::string& table, const std::string& language) {
  const std::string insert = "INSERT INTO " + table + "(" + table + ", rank) ";
  return "DROP TABLE IF EXISTS " + table + ";CREATE VIRTUAL TABLE " + table + " USING fts5(" +
         std::string(WORD_COLUMNS) + ", content='', columnsize=0, tokenize='" +
         std::string(TEXT_TOKENIZER) + " " + language + "');" + insert +
         "VALUES('automerge', 16);" + insert + "VALUES('crisismerge', 64);" + insert +
         "VALUES('hashsize', 8388608)";
}

}  // namespace fileindexd
