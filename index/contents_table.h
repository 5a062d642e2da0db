// SPDX-License-Identifier: GPL-2.0-or-later
// Rows of a contents database: the writer's statements, prepared once for each connection.
//
// Results are SQLite's codes, SQLITE_OK for success. The first change begins a transaction. Words
// are taken away at the commit, in the order of their rowids: the full-text table writes a segment
// at each rowid that does not ascend. A failure leaves the transaction half done: the caller rolls
// back.
#pragma once

#include <array>
#include <cstdint>
#include <functional>
#include <initializer_list>
#include <string>
#include <vector>

#include "base/content.h"
#include "index/content_text.h"
#include "index/contents_schema.h"
#include "index/contents_writer.h"
#include "state/sqlite.h"

namespace fileindexd {

// A row of `files` without what only readers want.
struct ContentFile {
  int64_t id = 0;
  FileIdentity identity;
  int64_t ctime = 0;
  Kind kind = Kind::OTHER;
  Kind found_kind = Kind::OTHER;
  ContentState state = ContentState::WAITING;
  int64_t extractor = 0;
  int64_t tries = 0;
  int64_t unended = 0;
  int64_t begun = 0;
  int64_t unreferred_since = 0;
  int64_t reread = 0;
  int64_t text = 0;
  int64_t length = 0;
};

// `extractor` of a file that was read and of which nothing was kept: its kind is not wanted.
constexpr int64_t KEPT_OUT = 0;

// Whether it was looked into, and holds nothing that is read, or is wanted.
bool IsNotKept(const ContentFile& file);

struct ContentsMeta {
  std::string filesystem;
  std::string language;
  int64_t extractor = 0;
  int64_t entries_made = 0;
  int64_t seen = 0;
  int64_t last_text = 0;
  int64_t reworded = ALL_WORDS;
  int64_t reword_end = 0;
  std::string words_version;
  int64_t merged = 0;
};

class ContentsTable {
 public:
  // Reads `meta` too. There are no words yet in a database that was just made: UseWords.
  int Prepare(sqlite3* db);
  // Has the words be those of that language and version. Others are made anew from what is stored,
  // beside those that are there (see Reword); what is stored from now on has both at once.
  int UseWords(const std::string& language, const std::string& version);

  // Commit writes `meta`, and counts `done_now` files as done in that second.
  int Begin();  // nothing, if a transaction is open
  int Commit(int64_t now);
  void Rollback();  // `meta` has to be read again
  int ReadMeta();

  int Find(uint64_t inode, int64_t birth_time, ContentFile& file, bool& found);
  int FindById(int64_t id, ContentFile& file, bool& found);
  // Each of these gives up to `limit` rows.
  // Of those that wait, first what was never read, or only by these readers; then what other ones
  // had read or failed at.
  int WaitingNew(int64_t limit, int64_t extractor, std::vector<ContentFile>& files);
  int WaitingAgain(int64_t limit, int64_t extractor, std::vector<ContentFile>& files);
  int UnreadDue(int64_t now, int64_t limit, std::vector<ContentFile>& files);
  int Failed(int64_t after, int64_t limit, std::vector<ContentFile>& files);
  int LeftBegun(int64_t limit, std::vector<ContentFile>& files);
  int Unreferred(int64_t until, int64_t limit, std::vector<ContentFile>& files);
  int Slice(int64_t after, int64_t limit, std::vector<ContentFile>& files);

  int Insert(const ContentFile& file);
  int Update(const ContentFile& before, const ContentFile& file);
  int SetReason(int64_t id, const std::string& reason);
  // Of an unread one: when it is tried again. It is forgotten with that state.
  int SetDue(int64_t id, int64_t due);
  // None is due later than that: the clock may have been set back.
  int LimitDue(int64_t latest);
  // When the next one is, of those that are not left out; INT64_MAX if there is none.
  int NextDue(const std::function<bool(int64_t file)>& is_left_out, int64_t& due);
  // In place of what was stored. Sets `text`, `length` and `found_kind` of `file`, which Update
  // then writes; `before` is the row as it stands.
  int SetContent(const ContentFile& before, const PreparedContent& prepared, ContentFile& file);
  // Whether it has a text, a number, or what files that are alike are known by.
  int HoldsAny(int64_t id, bool& holds);
  int RemoveContent(ContentFile& file);  // sets `text` and `length`
  int Remove(const ContentFile& file);

  // Makes new words of stored texts, about a MiB, or puts them in the place of the old ones; and
  // takes away as many of those that were replaced. `more`: there are others.
  int Reword(bool& more);
  // One step, bounded, towards words that stand in one piece, if so many are new that it is worth
  // it; and then towards a file without free pages. `more`: call again, after a commit.
  int MergeWords(bool& more);

  ContentsMeta meta;
  bool changed = false;      // since the last commit, `meta` included
  size_t pending_bytes = 0;  // see ContentsWriter::PendingBytes
  int64_t done_now = 0;
  sqlite3* handle = nullptr;

 private:
  struct CountOfKind {
    int64_t waiting = 0;
    int64_t done = 0;
    int64_t failed = 0;
    bool IsZero() const { return waiting == 0 && done == 0 && failed == 0; }
  };

  int Complete();  // see CONTENTS_ADDITIONS
  int PrepareTexts();
  int Exists(const char* name, bool& has);
  struct Words {
    std::string language;
    std::string version;
    bool operator==(const Words&) const = default;
  };
  int ReadWordsToBe(Words& to_be, bool& found);
  int PrepareWords();
  static int PrepareInto(const std::string& table, sqlite3* db, Statement& insert,
                         Statement& remove);
  int BeginWords(const Words& to_be);
  int DropNewWords();
  int ReplaceWords();
  int MakeNewWords(bool& more);
  int RemoveOldWords();
  int IsWorthMerging(bool& is_worth);
  bool HasFreePages();
  int DropDue(int64_t id);
  int WriteMeta();
  int WriteCounts(int64_t now);
  void Count(const ContentFile& file, int64_t number);
  int ReadFiles(Statement& statement, std::initializer_list<int64_t> bound,
                std::vector<ContentFile>& files);
  static int RunWords(Statement& statement, int64_t text, const ContentWords& words);
  int AddWords(int64_t text, ContentWords& words, const PreparedContent& prepared);
  int RemoveWords();
  int RemoveWordsOf(int64_t text);

  std::array<CountOfKind, NOT_KEPT + 1> counted;  // since the last commit
  std::vector<int64_t> leaving;                   // rowids in `texts`
  bool has_old_words = false;
  std::string new_language;  // whose words are being made; empty: none are
  bool may_remove = true;    // from the words: they are those that would be cut now
  bool merging = false;
  Statement find, find_by_id, waiting_new, waiting_again, unread_due, failed, left_begun,
      unreferred, slice;
  Statement insert, update, set_reason, set_content, holds_any, remove;
  Statement set_due, drop_due, limit_due, next_due;
  Statement insert_text, read_text, next_texts, remove_text, insert_words, remove_words;
  Statement insert_new_words, remove_new_words;
  Statement write_meta, write_counts, write_rate, cut_rate, free_pages, give_back, count_done;
};

}  // namespace fileindexd
