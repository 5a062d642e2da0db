// SPDX-License-Identifier: GPL-2.0-or-later
// Schema of the entries database, shared by all who read or write it.
//
//   INDEX/entries.db
//   INDEX/last-commit    see last_commit.h
//
//   entries      one row for each thing that belongs
//     id              rowid; the same number in `names` and `parts`
//     path            BLOB, unique, normal path byte for byte; '/' sorts as a byte, so that what
//                     lies below P is the range ("P/", "P0")
//     thing           1 file, 2 directory, 3 symbolic link
//     kind            0 other, 1 document, 2 audio, 3 video, 4 photo, 5 folder
//     content_wanted  0 no, 1 yes, 2 not any more: whoever keeps contents has to be told,
//                     and follows rows that are not 0
//     inode           64 bits, as a signed number
//     size            bytes; 0 for a directory
//     mtime ctime birth_time first_seen   nanoseconds since the epoch; mtime 0 for a directory,
//                     birth_time 0 where the file system keeps none
//     owner grp mode  as the system counts them
//     written         nanoseconds since the epoch: when this row was last written. Each write has a
//                     greater number than all before it, even if the clock steps back
//     reread          the `written` of the last add that found the same thing with other
//                     attributes: its bytes may differ from those that were there before, even if
//                     size and mtime do not; 0: none
//   names        words of the last path component as NameRow gives them; no stored copy, so
//                deleting needs the text that was inserted
//   parts        the folded name by trigrams, for substrings
//   meta         one row: number of rows in `entries`, when the last commit was made (seconds), how
//                many rows were removed since room was last given back, a number that is greater
//                than each `written` and grows with each commit, and a random number that tells
//                this database from the one that was there before it
//
// application_id tells that a database is ours, user_version which schema it holds. A change of the
// tables, of the tokenizers or of the text that is given to them is a new version.
#pragma once

#include <cstdint>

namespace fileindexd {

constexpr const char* ENTRIES_FILE = "entries.db";
constexpr int64_t ENTRIES_APPLICATION = 0x46494e45;
constexpr int64_t ENTRIES_VERSION = 4;

// Makes the tables in an empty database, and sets both numbers.
extern const char* const ENTRIES_SCHEMA;

// All columns of `entries`, in the order in which EntryTable binds and reads them.
#define FILEINDEX_ENTRY_COLUMNS                                                     \
  "entries.id, entries.path, entries.thing, entries.kind, entries.content_wanted, " \
  "entries.inode, entries.size, entries.mtime, entries.ctime, entries.birth_time, " \
  "entries.first_seen, entries.owner, entries.grp, entries.mode, entries.written, " \
  "entries.reread"

constexpr int ENTRY_COLUMN_MTIME = 7;
constexpr int ENTRY_COLUMN_COUNT = 16;

// What the indexes by size and by time hold: a statement that is to use one has to say the same.
// As numbers for C++, and as texts for SQL.
#define FILEINDEX_LARGE_BYTES 1048576
#define FILEINDEX_WEEK_NANOSECONDS 604800000000000
#define FILEINDEX_SQL_NUMBER(number) FILEINDEX_SQL_TEXT(number)
#define FILEINDEX_SQL_TEXT(text) #text
#define FILEINDEX_IS_LARGE "size >= " FILEINDEX_SQL_NUMBER(FILEINDEX_LARGE_BYTES)
#define FILEINDEX_WEEK "mtime / " FILEINDEX_SQL_NUMBER(FILEINDEX_WEEK_NANOSECONDS)

// The identity of a file (see contents_schema.h). An entry and a row of `files` that have the same;
// those and the content is wanted; and the one that is bound (BindIdentity), of either table.
#define FILEINDEX_SAME_FILE                                                    \
  "entries.inode = files.inode AND entries.birth_time = files.birth_time AND " \
  "entries.size = files.size AND entries.mtime = files.mtime"
#define FILEINDEX_WANTED_FILE FILEINDEX_SAME_FILE " AND entries.content_wanted = 1"
#define FILEINDEX_THAT_FILE "inode = ?1 AND birth_time = ?2 AND size = ?3 AND mtime = ?4"

}  // namespace fileindexd
