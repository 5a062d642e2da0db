// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/schema.h"

#include "index/database.h"

namespace fileindexd {

static_assert(ENTRIES_APPLICATION == 1179209285 && ENTRIES_VERSION == 4,
              "numbers in the text below");

// The full-text tables merge sixteen segments into one, a few pages at each commit: an entry is
// then written anew only each time the index has grown sixteen times larger, and an entry more
// costs about the same in an index of any size. Only well beyond that is a level merged at once,
// which in a large index would hold one commit up for a second.
// Entries by time are kept by weeks, and by size only the large ones: an index of a million exact
// values is written all over at each commit, and costs as much as all the rest.
const char* const ENTRIES_SCHEMA = R"sql(
CREATE TABLE entries(
  id INTEGER PRIMARY KEY,
  path BLOB NOT NULL UNIQUE,
  thing INTEGER NOT NULL,
  kind INTEGER NOT NULL,
  content_wanted INTEGER NOT NULL,
  inode INTEGER NOT NULL,
  size INTEGER NOT NULL,
  mtime INTEGER NOT NULL,
  ctime INTEGER NOT NULL,
  birth_time INTEGER NOT NULL,
  first_seen INTEGER NOT NULL,
  owner INTEGER NOT NULL,
  grp INTEGER NOT NULL,
  mode INTEGER NOT NULL,
  written INTEGER NOT NULL,
  reread INTEGER NOT NULL);
CREATE INDEX entries_by_inode ON entries(inode);
CREATE INDEX entries_wanted ON entries(written, content_wanted) WHERE content_wanted <> 0;
CREATE INDEX entries_by_week ON entries()sql" FILEINDEX_WEEK R"sql() WHERE mtime <> 0;
CREATE INDEX entries_large ON entries(size) WHERE )sql" FILEINDEX_IS_LARGE R"sql(;
CREATE VIRTUAL TABLE names USING fts5(
  name, content='', columnsize=0, tokenize='unicode61 remove_diacritics 2');
CREATE VIRTUAL TABLE parts USING fts5(
  name, content='', columnsize=0, detail=none, tokenize='trigram');
CREATE TABLE meta(
  id INTEGER PRIMARY KEY CHECK (id = 1),
  entries INTEGER NOT NULL,
  last_commit INTEGER NOT NULL,
  removed INTEGER NOT NULL,
  last_written INTEGER NOT NULL,
  made INTEGER NOT NULL);
INSERT INTO meta VALUES(1, 0, 0, 0, 0, random());
INSERT INTO names(names, rank) VALUES('automerge', 16);
INSERT INTO names(names, rank) VALUES('crisismerge', 64);
INSERT INTO parts(parts, rank) VALUES('automerge', 16);
INSERT INTO parts(parts, rank) VALUES('crisismerge', 64);
PRAGMA application_id = 1179209285;
PRAGMA user_version = 4;
)sql";

const DatabaseForm ENTRIES_FORM = {
    .file = ENTRIES_FILE,
    .application = ENTRIES_APPLICATION,
    .version = ENTRIES_VERSION,
    .schema = ENTRIES_SCHEMA,
    .probe = "entries",
    .probed = "meta WHERE id = 1",
    .last_commit = "last_written",
    .prepare = nullptr,
    .most_log_frames = LEAST_LOG_FRAMES,  // each commit's connection reads it
};

}  // namespace fileindexd
