// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/contents_table.h"

#include <algorithm>
#include <utility>

namespace fileindexd {

namespace {

constexpr int64_t FREE_PAGES_KEPT = 256;

#define FILE_COLUMNS                                                                \
  "id, inode, birth_time, size, mtime, ctime, kind, found_kind, state, extractor, " \
  "tries, unended, begun, unreferred_since, reread, text, length"

// Of those readers. Two of these are merged by the expressions that they end with.
#define WAITING_FILES                      \
  "SELECT " FILE_COLUMNS                   \
  ", tries + unended, mtime / 60000000000" \
  " FROM files WHERE state = 0 AND extractor = "

void ReadFile(const Statement& row, ContentFile& file) {
  file.id = row.Int(0);
  file.identity.inode = static_cast<uint64_t>(row.Int(1));
  file.identity.birth_time = row.Int(2);
  file.identity.size = row.Int(3);
  file.identity.mtime = row.Int(4);
  file.ctime = row.Int(5);
  file.kind = static_cast<Kind>(row.Int(6));
  file.found_kind = static_cast<Kind>(row.Int(7));
  file.state = static_cast<ContentState>(row.Int(8));
  file.extractor = row.Int(9);
  file.tries = row.Int(10);
  file.unended = row.Int(11);
  file.begun = row.Int(12);
  file.unreferred_since = row.Int(13);
  file.reread = row.Int(14);
  file.text = row.Int(15);
  file.length = row.Int(16);
}

// All but the id, from column 2 on.
void BindFile(Statement& statement, const ContentFile& file) {
  int column = 2;
  for (const int64_t value :
       {static_cast<int64_t>(file.identity.inode), file.identity.birth_time, file.identity.size,
        file.identity.mtime, file.ctime, static_cast<int64_t>(file.kind),
        static_cast<int64_t>(file.found_kind), static_cast<int64_t>(file.state), file.extractor,
        file.tries, file.unended, file.begun, file.unreferred_since, file.reread, file.text,
        file.length}) {
    statement.BindInt(column++, value);
  }
}

Kind KindOf(const ContentFile& file) {
  return file.found_kind != Kind::OTHER ? file.found_kind : file.kind;
}

}  // namespace

bool IsNotKept(const ContentFile& file) {
  return file.state == ContentState::DONE &&
         (file.extractor == KEPT_OUT || KindOf(file) == Kind::OTHER);
}

int ContentsTable::Complete() {
  int code = SQLITE_OK;
  for (const ContentsAddition& addition : CONTENTS_ADDITIONS) {
    bool is_there = false;
    code = code == SQLITE_OK ? Exists(addition.name, is_there) : code;
    code = code == SQLITE_OK && !is_there ? Execute(handle, addition.sql) : code;
  }
  return code;
}

int ContentsTable::Prepare(sqlite3* db) {
  handle = db;
  const int completed = Complete();
  if (completed != SQLITE_OK) {
    return completed;
  }
  const std::pair<Statement*, const char*> statements[] = {
      {&find, "SELECT " FILE_COLUMNS " FROM files WHERE inode = ?1 AND birth_time = ?2"},
      {&find_by_id, "SELECT " FILE_COLUMNS " FROM files WHERE id = ?1"},
      {&waiting_new, WAITING_FILES "0 UNION ALL " WAITING_FILES "?2"
                                   " ORDER BY " WAITING_ORDER " LIMIT ?1"},
      {&waiting_again,
       "SELECT " FILE_COLUMNS " FROM files WHERE state = 0 AND extractor > 0 AND extractor <> ?2"
       " ORDER BY extractor, " WAITING_ORDER " LIMIT ?1"},
      {&unread_due, "SELECT " FILE_COLUMNS " FROM later CROSS JOIN files ON files.id = later.file"
                    " WHERE later.due <= ?2 ORDER BY later.due LIMIT ?1"},
      {&failed,
       "SELECT " FILE_COLUMNS " FROM files WHERE state >= 2 AND id > ?1 ORDER BY id LIMIT ?2"},
      {&left_begun, "SELECT " FILE_COLUMNS " FROM files WHERE begun <> 0 LIMIT ?1"},
      {&unreferred, "SELECT " FILE_COLUMNS
                    " FROM files WHERE unreferred_since <> 0 AND unreferred_since <= ?1 LIMIT ?2"},
      {&slice, "SELECT " FILE_COLUMNS " FROM files WHERE id > ?1 ORDER BY id LIMIT ?2"},
      {&insert, "INSERT INTO files(" FILE_COLUMNS ") VALUES(?1, ?2, ?3, ?4, ?5, ?6, ?7, ?8, ?9, "
                "?10, ?11, ?12, ?13, ?14, ?15, ?16, ?17)"},
      {&update,
       "UPDATE files SET inode = ?2, birth_time = ?3, size = ?4, mtime = ?5, ctime = ?6, "
       "kind = ?7, found_kind = ?8, state = ?9, extractor = ?10, tries = ?11, "
       "unended = ?12, begun = ?13, unreferred_since = ?14, reread = ?15, "
       "text = ?16, length = ?17 "
       "WHERE id = ?1"},
      {&set_reason, "UPDATE files SET reason = ?2 WHERE id = ?1 AND reason <> ?2"},
      {&remove, "DELETE FROM files WHERE id = ?1"},
      {&set_due,
       "INSERT INTO later VALUES(?1, ?2) ON CONFLICT(file) DO UPDATE SET due = excluded.due"},
      {&drop_due, "DELETE FROM later WHERE file = ?1"},
      {&limit_due, "UPDATE later SET due = ?1 WHERE due > ?1"},
      {&next_due, "SELECT due, file FROM later ORDER BY due"},
      {&write_meta,
       "UPDATE meta SET filesystem = ?1, language = ?2, extractor = ?3, "
       "entries_made = ?4, seen = ?5, last_text = ?6, reworded = ?7, reword_end = ?8, "
       "words_version = ?9, merged = ?10 WHERE id = 1"},
      {&count_done, "SELECT coalesce(sum(done), 0) FROM counts WHERE kind < 5"},
      {&write_counts,
       "UPDATE counts SET waiting = waiting + ?2, done = done + ?3, "
       "failed = failed + ?4 WHERE kind = ?1"},
      {&write_rate,
       "INSERT INTO rate VALUES(?1, ?2) "
       "ON CONFLICT(second) DO UPDATE SET done = done + excluded.done"},
      // Those of the future too: the clock was set back.
      {&cut_rate, "DELETE FROM rate WHERE second <= ?1 - 60 OR second > ?1"},
      {&free_pages, "PRAGMA freelist_count"},
      {&give_back, "PRAGMA incremental_vacuum(256)"},
  };
  for (const auto& [statement, sql] : statements) {
    const int code = statement->Prepare(db, sql);
    if (code != SQLITE_OK) {
      return code;
    }
  }
  const int code = PrepareTexts();
  return code == SQLITE_OK ? ReadMeta() : code;
}

int ContentsTable::ReadMeta() {
  Statement statement;
  int code = statement.Prepare(
      handle,
      "SELECT filesystem, language, extractor, entries_made, seen, "
      "last_text, reworded, reword_end, words_version, merged FROM meta WHERE id = 1");
  if (code == SQLITE_OK) {
    code = statement.Step();
  }
  if (code != SQLITE_ROW) {
    return code == SQLITE_DONE ? SQLITE_CORRUPT : code;
  }
  meta.filesystem = statement.Bytes(0);
  meta.language = statement.Bytes(1);
  meta.extractor = statement.Int(2);
  meta.entries_made = statement.Int(3);
  meta.seen = statement.Int(4);
  meta.last_text = statement.Int(5);
  meta.reworded = statement.Int(6);
  meta.reword_end = statement.Int(7);
  meta.words_version = statement.Bytes(8);
  meta.merged = statement.Int(9);
  return SQLITE_OK;
}

int ContentsTable::Begin() {
  changed = true;
  return sqlite3_get_autocommit(handle) == 0 ? SQLITE_OK : Execute(handle, "BEGIN IMMEDIATE");
}

int ContentsTable::WriteMeta() {
  write_meta.BindText(1, meta.filesystem);
  write_meta.BindText(2, meta.language);
  write_meta.BindInt(3, meta.extractor);
  write_meta.BindInt(4, meta.entries_made);
  write_meta.BindInt(5, meta.seen);
  write_meta.BindInt(6, meta.last_text);
  write_meta.BindInt(7, meta.reworded);
  write_meta.BindInt(8, meta.reword_end);
  write_meta.BindText(9, meta.words_version);
  write_meta.BindInt(10, meta.merged);
  return write_meta.Run();
}

int ContentsTable::WriteCounts(int64_t now) {
  int code = SQLITE_OK;
  for (size_t kind = 0; kind < counted.size() && code == SQLITE_OK; ++kind) {
    if (!counted[kind].IsZero()) {
      const CountOfKind& count = counted[kind];
      write_counts.BindInts({static_cast<int64_t>(kind), count.waiting, count.done, count.failed});
      code = write_counts.Run();
    }
  }
  if (code != SQLITE_OK || done_now == 0) {
    return code;
  }

  cut_rate.BindInt(1, now);
  write_rate.BindInts({now, done_now});
  code = cut_rate.Run();
  return code == SQLITE_OK ? write_rate.Run() : code;
}

bool ContentsTable::HasFreePages() {
  const bool has = free_pages.Step() == SQLITE_ROW && free_pages.Int(0) > FREE_PAGES_KEPT;
  free_pages.Reset();
  return has;
}

int ContentsTable::Commit(int64_t now) {
  if (!changed) {
    return SQLITE_OK;
  }
  int code = Begin();
  for (const auto& step : {&ContentsTable::RemoveWords, &ContentsTable::WriteMeta}) {
    code = code == SQLITE_OK ? (this->*step)() : code;
  }
  code = code == SQLITE_OK ? WriteCounts(now) : code;
  if (code == SQLITE_OK && HasFreePages()) {
    code = give_back.ReadAll([] {});
  }
  code = code == SQLITE_OK ? Execute(handle, "COMMIT") : code;
  if (code == SQLITE_OK) {
    changed = false;
    pending_bytes = 0;
    done_now = 0;
    counted = {};
  }
  return code;
}

// A failure has usually rolled back already, and then this one has nothing to do.
void ContentsTable::Rollback() {
  if (sqlite3_get_autocommit(handle) == 0) {
    (void)Execute(handle, "ROLLBACK");
  }
  changed = false;
  pending_bytes = 0;
  done_now = 0;
  counted = {};
  leaving.clear();
}

int ContentsTable::Find(uint64_t inode, int64_t birth_time, ContentFile& file, bool& found) {
  find.BindInts({static_cast<int64_t>(inode), birth_time});
  return find.ReadOne(found, [&] { ReadFile(find, file); });
}

int ContentsTable::FindById(int64_t id, ContentFile& file, bool& found) {
  find_by_id.BindInt(1, id);
  return find_by_id.ReadOne(found, [&] { ReadFile(find_by_id, file); });
}

int ContentsTable::ReadFiles(Statement& statement, std::initializer_list<int64_t> bound,
                             std::vector<ContentFile>& files) {
  files.clear();
  statement.BindInts(bound);
  return statement.ReadAll([&] { ReadFile(statement, files.emplace_back()); });
}

int ContentsTable::WaitingNew(int64_t limit, int64_t extractor, std::vector<ContentFile>& files) {
  return ReadFiles(waiting_new, {limit, extractor}, files);
}

int ContentsTable::WaitingAgain(int64_t limit, int64_t extractor, std::vector<ContentFile>& files) {
  return ReadFiles(waiting_again, {limit, extractor}, files);
}

int ContentsTable::UnreadDue(int64_t now, int64_t limit, std::vector<ContentFile>& files) {
  return ReadFiles(unread_due, {limit, now}, files);
}

int ContentsTable::Failed(int64_t after, int64_t limit, std::vector<ContentFile>& files) {
  return ReadFiles(failed, {after, limit}, files);
}

int ContentsTable::LeftBegun(int64_t limit, std::vector<ContentFile>& files) {
  return ReadFiles(left_begun, {limit}, files);
}

int ContentsTable::Unreferred(int64_t until, int64_t limit, std::vector<ContentFile>& files) {
  return ReadFiles(unreferred, {until, limit}, files);
}

int ContentsTable::Slice(int64_t after, int64_t limit, std::vector<ContentFile>& files) {
  return ReadFiles(slice, {after, limit}, files);
}

void ContentsTable::Count(const ContentFile& file, int64_t number) {
  const auto kind = static_cast<size_t>(KindOf(file));
  const size_t place = IsNotKept(file) ? NOT_KEPT : kind;
  CountOfKind& count = counted[place < counted.size() ? place : 0];
  switch (file.state) {
    case ContentState::WAITING:
      count.waiting += number;
      break;
    case ContentState::DONE:
      count.done += number;
      break;
    default:
      count.failed += number;
      break;
  }
}

int ContentsTable::Insert(const ContentFile& file) {
  int code = Begin();
  if (code != SQLITE_OK) {
    return code;
  }
  sqlite3_bind_null(insert.handle, 1);
  BindFile(insert, file);
  code = insert.Run();
  if (code == SQLITE_OK) {
    Count(file, 1);
  }
  return code;
}

int ContentsTable::Update(const ContentFile& before, const ContentFile& file) {
  int code = Begin();
  if (code != SQLITE_OK) {
    return code;
  }
  update.BindInt(1, file.id);
  BindFile(update, file);
  code = update.Run();
  if (code == SQLITE_OK) {
    Count(before, -1);
    Count(file, 1);
  }
  const bool was_unread =
      before.state == ContentState::UNREAD && file.state != ContentState::UNREAD;
  return code == SQLITE_OK && was_unread ? DropDue(file.id) : code;
}

int ContentsTable::DropDue(int64_t id) {
  drop_due.BindInt(1, id);
  return drop_due.Run();
}

int ContentsTable::SetDue(int64_t id, int64_t due) {
  const int code = Begin();
  set_due.BindInts({id, due});
  return code == SQLITE_OK ? set_due.Run() : code;
}

// Where there is none, nothing is begun.
int ContentsTable::LimitDue(int64_t latest) {
  int64_t due = 0;
  limit_due.BindInt(1, latest);
  const int code = NextDue([](int64_t) { return false; }, due);
  return code == SQLITE_OK && due != INT64_MAX ? limit_due.Run() : code;
}

int ContentsTable::NextDue(const std::function<bool(int64_t file)>& is_left_out, int64_t& due) {
  int code = next_due.Step();
  while (code == SQLITE_ROW && is_left_out(next_due.Int(1))) {
    code = next_due.Step();
  }
  due = code == SQLITE_ROW ? next_due.Int(0) : INT64_MAX;
  next_due.Reset();
  return StepError(code);
}

int ContentsTable::SetReason(int64_t id, const std::string& reason) {
  const int code = Begin();
  set_reason.BindInt(1, id);
  set_reason.BindText(2, reason);
  return code == SQLITE_OK ? set_reason.Run() : code;
}

int ContentsTable::Remove(const ContentFile& file) {
  ContentFile emptied = file;
  int code = RemoveContent(emptied);
  if (code != SQLITE_OK) {
    return code;
  }
  remove.BindInt(1, file.id);
  code = remove.Run();
  if (code == SQLITE_OK) {
    Count(file, -1);
  }
  return code == SQLITE_OK && file.state == ContentState::UNREAD ? DropDue(file.id) : code;
}

}  // namespace fileindexd
