// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/contents_reader.h"

#include <ctime>
#include <utility>
#include <vector>

#include "index/content_functions.h"
#include "index/content_text.h"
#include "index/contents_schema.h"
#include "index/entry_table.h"
#include "index/schema.h"
#include "index/suspicion.h"
#include "index/text_tokenizer.h"
#include "state/layout.h"
#include "state/sqlite.h"

namespace fileindexd {

namespace {

constexpr int FIRST_NUMBER_COLUMN = 10;  // of FileOfEntrySql

// What the writer has counted, but for two: a failed file whose entry is gone would count until it
// is swept, while nobody lists it; and what the daemon wrote waits, though it is not taken in yet.
// One statement: all of the same moment.
constexpr const char* COUNT =
    "SELECT kind, waiting, done, 0 FROM contents.counts"
    " UNION ALL SELECT iif(found_kind <> 0, found_kind, kind), 0, 0, 1"
    " FROM contents.files AS files WHERE state >= 2 AND EXISTS(SELECT 1 FROM entries"
    " WHERE " FILEINDEX_WANTED_FILE
    ")"
    " UNION ALL SELECT entries.kind, 1, 0, 0 FROM contents.meta AS followed"
    " CROSS JOIN main.meta AS own CROSS JOIN entries ON entries.content_wanted <> 0"
    " AND entries.written > iif(followed.entries_made = own.made, followed.seen, 0)"
    " WHERE +entries.content_wanted = 1 AND NOT EXISTS(SELECT 1 FROM contents.files AS files"
    " WHERE " FILEINDEX_SAME_FILE ")";

const char* StateText(ContentState state) {
  switch (state) {
    case ContentState::WAITING:
      return "waiting";
    case ContentState::DONE:
      return "done";
    case ContentState::FAILED:
    case ContentState::QUARANTINED:
    case ContentState::UNREAD:
      break;
  }
  return "failed";
}

std::string FileOfEntrySql() {
  return "SELECT state, reason, found_kind, is_cut, sample, text,"
         " (SELECT packed FROM contents.texts WHERE id = text), extractor, tries,"
         " (SELECT language FROM contents.meta WHERE id = 1), " +
         std::string(NUMBER_COLUMNS) + " FROM contents.files WHERE " FILEINDEX_THAT_FILE;
}

bool ReadContent(const Statement& row, Content& content) {
  content = {};
  content.kind = static_cast<Kind>(row.Int(2));
  content.is_cut = row.Int(3) != 0;
  content.sample = static_cast<uint64_t>(row.Int(4));
  const FieldNumbers numbers = ReadNumbers(row, FIRST_NUMBER_COLUMN);
  for (size_t i = 0; i < numbers.size(); ++i) {
    if (numbers[i].has_value()) {
      const auto number = static_cast<size_t>(FIRST_NUMBER_FIELD) + i;
      content.numbers.push_back({static_cast<ContentField>(number), *numbers[i]});
    }
  }
  return row.Int(5) == 0 || UnpackTexts(row.Bytes(6), content);
}

// The table of words comes a moment after the others, once its language is known.
IndexError LookForWords(IndexDatabase& entries) {
  Statement words;
  int code = words.Prepare(entries.db, "SELECT 1 FROM contents.sqlite_master WHERE name = 'words'");
  code = code == SQLITE_OK ? words.Step() : code;
  if (code == SQLITE_ROW) {
    return IndexError::NONE;
  }
  return code == SQLITE_DONE ? IndexError::PATH_NOT_FOUND : FromSqlite(code);
}

}  // namespace

IndexError AttachContents(IndexDatabase& entries, const std::string& share_name) {
  const IndexError error = entries.Attach(ContentsPath(share_name), "contents", CONTENTS_FORM);
  if (error != IndexError::NONE) {
    return error;
  }
  const int code = RegisterQuestionFunctions(entries.db);
  return code == SQLITE_OK ? LookForWords(entries) : FromSqlite(code);
}

IndexError ContentsReader::Open(const std::string& share_name) {
  share = share_name;
  IndexError error = OpenAndTell(entries, share_name);
  if (error != IndexError::NONE) {
    return error;
  }
  error = AttachContents(entries, share_name);
  TellContentsWriter(share, error);
  return error;
}

IndexError ContentsReader::Failed(int code) {
  const IndexError error = FromSqlite(code);
  TellContentsWriter(share, error);
  return error;
}

bool ContentsReader::Refuse() {
  (void)Failed(sqlite3_errcode(entries.db));
  return false;
}

bool ContentsReader::RefuseBoth() {
  TellWriter(share, FromSqlite(sqlite3_errcode(entries.db)));
  return Refuse();
}

bool ContentsReader::Count(ContentCounts& counts) {
  Statement by_kind;
  Statement rate;
  if (by_kind.Prepare(entries.db, COUNT) != SQLITE_OK ||
      rate.Prepare(entries.db,
                   "SELECT ifnull(sum(done), 0) FROM contents.rate WHERE second > ?1") !=
          SQLITE_OK) {
    return RefuseBoth();
  }

  ContentCounts read;
  int code = by_kind.Step();
  for (; code == SQLITE_ROW; code = by_kind.Step()) {
    const auto kind = static_cast<size_t>(by_kind.Int(0));
    if (kind >= read.kinds.size()) {
      read.not_kept += kind == NOT_KEPT ? static_cast<uint64_t>(by_kind.Int(2)) : 0;
      continue;
    }
    for (ContentCounts::OfKind* counted : {&read.kinds[kind], &read.all}) {
      counted->waiting += static_cast<uint64_t>(by_kind.Int(1));
      counted->done += static_cast<uint64_t>(by_kind.Int(2));
      counted->failed += static_cast<uint64_t>(by_kind.Int(3));
    }
  }
  if (code == SQLITE_DONE) {
    rate.BindInt(1, static_cast<int64_t>(time(nullptr)) - 60);
    code = rate.Step();
  }
  if (code != SQLITE_ROW) {
    return RefuseBoth();
  }
  read.done_last_minute = static_cast<uint64_t>(rate.Int(0));
  counts = read;
  return true;
}

bool ContentsReader::FindWordsProgress(const std::string& share_language,
                                       std::optional<WordsProgress>& progress) {
  progress.reset();
  Statement words;
  Statement texts;
  if (words.Prepare(entries.db,
                    "SELECT language, reworded, reword_end FROM contents.meta WHERE id = 1") !=
          SQLITE_OK ||
      texts.Prepare(entries.db,
                    "SELECT count(*) FROM contents.files WHERE text <> 0 AND text <= ?1") !=
          SQLITE_OK ||
      words.Step() != SQLITE_ROW) {
    return Refuse();
  }
  WordsProgress found;
  found.language = words.Bytes(0);
  found.wanted = LanguageOfWords(share_language);
  const bool has_begun = words.Int(1) != ALL_WORDS;
  if (found.wanted == found.language && !has_begun) {
    return true;
  }
  // What was begun may be for a language that is not wanted any more.
  Statement to_be;
  const bool counts =
      has_begun &&
      (to_be.Prepare(entries.db, "SELECT language FROM contents.words_to_be") != SQLITE_OK ||
       to_be.Step() != SQLITE_ROW || to_be.Bytes(0) == found.wanted);
  const auto count = [&texts](int64_t last, uint64_t& number) {
    texts.BindInt(1, last);
    bool is_counted = false;
    return texts.ReadOne(is_counted, [&] { number = static_cast<uint64_t>(texts.Int(0)); }) ==
           SQLITE_OK;
  };
  if (!count(has_begun ? words.Int(2) : ALL_WORDS, found.total) ||
      (counts && !count(words.Int(1), found.done))) {
    return Refuse();
  }
  if (found.total > 0) {
    progress = found;
  }
  return true;
}

bool ContentsReader::ForEachFailed(const std::function<bool(const FailedContent&)>& visit) {
  Statement failed;
  if (failed.Prepare(entries.db,
                     "SELECT min(entries.path), files.reason, files.tries"
                     " FROM contents.files AS files CROSS JOIN entries"
                     " ON " FILEINDEX_WANTED_FILE
                     " WHERE files.state >= 2 GROUP BY files.id") != SQLITE_OK) {
    return RefuseBoth();
  }
  int code = failed.Step();
  for (; code == SQLITE_ROW; code = failed.Step()) {
    if (!visit({failed.Bytes(0), failed.Bytes(1), failed.Int(2)})) {
      return true;
    }
  }
  return code == SQLITE_DONE || RefuseBoth();
}

IndexError ContentsReader::Find(const Entry& entry, StoredContent& stored) {
  StoredContent found;
  Statement row;
  int code = SQLITE_DONE;
  if (entry.content_wanted) {
    code = row.Prepare(entries.db, FileOfEntrySql().c_str());
    BindIdentity(row, IdentityOf(entry));
    code = code == SQLITE_OK ? row.Step() : code;
  }
  if (code == SQLITE_ROW) {
    if (!ReadContent(row, found.content)) {
      return Failed(SQLITE_CORRUPT);
    }
    found.state = StateText(static_cast<ContentState>(row.Int(0)));
    found.reason = row.Bytes(1);
    found.extractor = row.Int(7);
    found.tries = row.Int(8);
    const std::string language = LanguageName(row.Bytes(9));
    found.language = language.empty() ? NO_LANGUAGE : language;
  } else if (code != SQLITE_DONE) {
    return Failed(code);
  }
  stored = std::move(found);
  return IndexError::NONE;
}

}  // namespace fileindexd
