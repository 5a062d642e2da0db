// SPDX-License-Identifier: GPL-2.0-or-later
// Schema of the contents database, shared by all who read or write it.
//
//   CONTENTS/contents.db
//
//   files     one row for each file whose content is, or was, wanted
//     id                rowid, never used again
//     inode birth_time  the file; unique
//     size mtime        with them its identity: what was read is the content of a file with exactly
//                       these four
//     ctime             as last seen
//     kind              by the name of an entry; the entries' numbers
//     found_kind        by the content; 0: not known, or nothing that is read
//     state             ContentState
//     extractor         version of the readers that read it last; 0: none did, or, of a file
//                       that was read, nothing was kept, as what it was found to be is not wanted
//     tries             how many ended in failure; while it waits, with the death of what read it;
//                       of an unread one, how often the disk did not give it
//     unended           how many began beside others and have no end on record: its fault or not
//     begun             0 not in flight, 1 alone, 2 beside others
//     reason            of the failure, one line
//     is_cut, sample    as in Content
//     unreferred_since  seconds since the epoch: found without an entry; 0: has one
//     reread            the greatest `reread` of its entries: what was written to before is read,
//                       or waits
//     text              rowid in `texts` and `words`; 0: there is none
//     length            bytes of its words
//     fields            FieldBits of content_text.h
//     pages … rating    the number fields; NULL: not known
//   texts     the text fields and the text, packed (see content_text.h). Rowids ascend in the order
//             of reading: the full-text table collects changes in memory only while they do
//   words     the same by words: a column for the text, and one for each text field. No stored
//             copy, so deleting needs what was inserted. Made by the writer, as the share's
//             language is among its arguments
//   later     files whose bytes the disk did not give, and when the next try is due, in seconds
//             since the epoch
//   counts    for each kind (the found one, where it is known) how many files wait, are done and
//             failed; and under NOT_KEPT, as done, those that were looked into and left: of no kind
//             that is read, or of one that is not wanted
//   rate      for each second with commits of the last minute: how many files were done
//   meta      one row: the share's file system (contents of another one say nothing), the language
//             of the words, the version of the readers that all was read or tried with, the random
//             number of the entries database that was followed and the greatest `written` seen in
//             it, the last rowid in `texts`, and while the words are being made anew, up to which
//             of them that is done (all, unless it is going on) and up to which it has to be, the
//             version of what cut texts into words, and the last rowid in `texts` when the words
//             were merged
//   new_words what `words` becomes once it holds all texts: questions ask the old ones until then
//   words_to_be  one row while that is made: the language and the version of what is made
//   old_words words that nobody wants any more, while they are taken away; with a number, those
//             whose turn comes later
//
// application_id tells that a database is ours, user_version which schema it holds. A change of the
// tables, of the tokenizer, or of the text that is given to it is a new version.
#pragma once

#include <array>
#include <cstdint>
#include <optional>
#include <string>

#include "base/content.h"
#include "index/database.h"
#include "state/sqlite.h"

namespace fileindexd {

constexpr int64_t CONTENTS_APPLICATION = 0x4649434f;
constexpr int64_t CONTENTS_VERSION = 3;

extern const DatabaseForm CONTENTS_FORM;

// Numbers are stored.
// UNREAD: its bytes cannot be had, which tells nothing about it.
enum class ContentState { WAITING = 0, DONE = 1, FAILED = 2, QUARANTINED = 3, UNREAD = 4 };

constexpr int64_t NOT_KEPT = 5;  // behind the kinds

constexpr int64_t ALL_WORDS = INT64_MAX;  // meta.reworded when nothing is being made anew

// The order in which files are read: what failed before comes last, so that it holds nothing else
// up; then the newest, by the minute, as of no two files the same time would ever be met; then the
// smallest. An index has these expressions.
#define WAITING_ORDER "tries + unended, mtime / 60000000000 DESC, size"

// What databases made by earlier builds of this version lack: what there is of that name where it
// was added, and the statements that add it. Whoever only reads needs none of it.
struct ContentsAddition {
  const char* name;
  const char* sql;
};
extern const std::array<ContentsAddition, 2> CONTENTS_ADDITIONS;

// The columns of the number fields, in their order, separated by ", ".
extern const char* const NUMBER_COLUMNS;
// The values of those columns, which begin with column `first`; none: not known.
using FieldNumbers = std::array<std::optional<int64_t>, NUMBER_FIELD_COUNT>;
FieldNumbers ReadNumbers(const Statement& row, int first);
// The columns of `words`: the text, those of the text fields in their order, and numbers as words.
// The text comes first: in each document's places of each word, the full-text table writes down all
// columns but the first one.
extern const char* const WORD_COLUMNS;
constexpr int TEXT_COLUMN = 0;
constexpr int FIRST_FIELD_COLUMN = 1;
// The name at that place, from 0, of one of the two lists.
std::string ColumnAt(const char* columns, size_t place);

// Makes a table of words, empty, for that language (one of IsLanguage), in the place of one of that
// name.
std::string WordsSchema(const std::string& table, const std::string& language);

}  // namespace fileindexd
