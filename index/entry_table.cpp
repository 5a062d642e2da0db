// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/entry_table.h"

#include <algorithm>
#include <ctime>
#include <utility>

#include "base/utf8.h"
#include "index/schema.h"

namespace fileindexd {

namespace {

// So many free pages are left for the next entries; beyond them each commit gives 64 back: small
// enough not to be felt, enough to keep up with deletions.
constexpr int64_t FREE_PAGES_KEPT = 64;

int64_t Now() {
  timespec now{};
  clock_gettime(CLOCK_REALTIME, &now);
  return static_cast<int64_t>(now.tv_sec) * 1'000'000'000 + now.tv_nsec;
}

}  // namespace

PathRange::PathRange(const std::string& path) : at(path), first(path), end() {
  if (path != "/") {
    first += '/';
  }
  end = first;
  end.back() = '/' + 1;
}

void PathRange::Bind(Statement& statement) const {
  statement.BindBlob(1, at);
  statement.BindBlob(2, first);
  statement.BindBlob(3, end);
}

std::string AtOrBelowSql(const std::string& at, const std::string& first, const std::string& end) {
  return "(entries.path = " + at + " OR (entries.path > " + first + " AND entries.path < " + end +
         "))";
}

std::string_view LastComponent(std::string_view path) {
  return path == "/" ? path : path.substr(path.rfind('/') + 1);
}

void ReadEntry(const Statement& statement, Entry& entry) {
  entry.id = statement.Int(0);
  entry.path = statement.Bytes(1);
  entry.thing = static_cast<Thing>(statement.Int(2));
  entry.kind = static_cast<Kind>(statement.Int(3));
  entry.content_wanted = statement.Int(4) == 1;
  entry.inode = static_cast<uint64_t>(statement.Int(5));
  entry.size = statement.Int(6);
  entry.mtime = statement.Int(ENTRY_COLUMN_MTIME);
  entry.ctime = statement.Int(8);
  entry.birth_time = statement.Int(9);
  entry.first_seen = statement.Int(10);
  entry.owner = static_cast<uint32_t>(statement.Int(11));
  entry.group = static_cast<uint32_t>(statement.Int(12));
  entry.mode = static_cast<uint32_t>(statement.Int(13));
  entry.written = statement.Int(14);
  entry.reread = statement.Int(15);
}

void BindIdentity(Statement& statement, const FileIdentity& identity) {
  statement.BindInts(
      {static_cast<int64_t>(identity.inode), identity.birth_time, identity.size, identity.mtime});
}

int EntryTable::Prepare(sqlite3* db) {
  handle = db;
  const std::pair<Statement*, const char*> statements[] = {
      {&begin, "BEGIN IMMEDIATE"},
      {&commit, "COMMIT"},
      {&read_meta, "SELECT entries, removed, last_written FROM meta WHERE id = 1"},
      {&write_meta,
       "UPDATE meta SET entries = ?1, last_commit = ?2, removed = ?3, last_written = ?4"
       " WHERE id = 1"},
      {&free_pages, "PRAGMA freelist_count"},
      {&give_back, "PRAGMA incremental_vacuum(64)"},
      {&find, "SELECT " FILEINDEX_ENTRY_COLUMNS " FROM entries WHERE path = ?1"},
      {&next, "SELECT path, id FROM entries WHERE path >= ?1 ORDER BY path LIMIT 1"},
      {&row, "SELECT " FILEINDEX_ENTRY_COLUMNS " FROM entries WHERE id = ?1"},
      {&below, "SELECT 1 FROM entries WHERE path > ?2 AND path < ?3 LIMIT 1"},
      {&slice, "SELECT " FILEINDEX_ENTRY_COLUMNS
               " FROM entries WHERE path > ?1 AND path < ?2 ORDER BY path LIMIT ?3"},
      {&twins,
       "SELECT path FROM entries WHERE inode = ?1 AND path <> ?2 AND (size <> ?3 OR mtime <> ?4 "
       "OR owner <> ?5 OR grp <> ?6 OR mode <> ?7)"},
      {&other_paths,
       "SELECT path FROM entries WHERE inode = ?1 AND id <> ?2 "
       "AND (birth_time = ?3 OR birth_time = 0 OR ?3 = 0) AND (?4 = 0 OR ctime <> ?5) LIMIT ?6"},
      {&insert,
       "INSERT INTO entries(path, thing, kind, content_wanted, inode, size, mtime, ctime, "
       "birth_time, first_seen, owner, grp, mode, written, reread) VALUES(?1, ?2, ?3, ?4, ?5, ?6, "
       "?7, ?8, ?9, ?10, ?11, ?12, ?13, ?14, ?15)"},
      {&update,
       "UPDATE entries SET thing = ?2, kind = ?3, content_wanted = "
       "CASE WHEN ?4 <> 0 THEN 1 WHEN content_wanted <> 0 THEN 2 ELSE 0 END, inode = ?5, "
       "size = ?6, mtime = ?7, ctime = ?8, birth_time = ?9, first_seen = ?10, owner = ?11, "
       "grp = ?12, mode = ?13, written = ?14, reread = ?15 WHERE id = ?1"},
      {&remove, "DELETE FROM entries WHERE id = ?1"},
      {&insert_name, "INSERT INTO names(rowid, name) VALUES(?1, ?2)"},
      {&insert_part, "INSERT INTO parts(rowid, name) VALUES(?1, ?2)"},
      {&remove_name, "INSERT INTO names(names, rowid, name) VALUES('delete', ?1, ?2)"},
      {&remove_part, "INSERT INTO parts(parts, rowid, name) VALUES('delete', ?1, ?2)"},
  };

  for (const auto& [statement, sql] : statements) {
    const int code = statement->Prepare(db, sql);
    if (code != SQLITE_OK) {
      return code;
    }
  }
  return SQLITE_OK;
}

int EntryTable::Begin() {
  int code = begin.Run();
  if (code != SQLITE_OK) {
    return code;
  }

  code = read_meta.Step();
  entries = code == SQLITE_ROW ? read_meta.Int(0) : 0;
  removed = code == SQLITE_ROW ? read_meta.Int(1) : 0;
  last_written = code == SQLITE_ROW ? read_meta.Int(2) : 0;
  read_meta.Reset();
  if (code == SQLITE_ROW) {
    return SQLITE_OK;
  }

  Rollback();
  return code == SQLITE_DONE ? SQLITE_CORRUPT : code;
}

int EntryTable::Commit(int64_t now) {
  write_meta.BindInts({entries, now, removed, NextStamp()});  // larger also after removals alone
  int code = write_meta.Run();
  if (code == SQLITE_OK) {
    code = GiveBackPages();
  }
  return code == SQLITE_OK ? commit.Run() : code;
}

// A failure has usually rolled back already, and then this one has nothing to do.
void EntryTable::Rollback() {
  if (sqlite3_get_autocommit(handle) == 0) {
    (void)sqlite3_exec(handle, "ROLLBACK", nullptr, nullptr, nullptr);
  }
}

int EntryTable::GiveBackPages() {
  int code = free_pages.Step();
  const int64_t pages = code == SQLITE_ROW ? free_pages.Int(0) : 0;
  free_pages.Reset();
  if (code != SQLITE_ROW || pages <= FREE_PAGES_KEPT) {
    return code == SQLITE_ROW ? SQLITE_OK : code;
  }

  return give_back.ReadAll([] {});
}

int EntryTable::Find(const std::string& path, Entry& entry, bool& found) {
  find.BindBlob(1, path);
  return find.ReadOne(found, [&] { ReadEntry(find, entry); });
}

// A new entry costs one search: where the next path does not begin with this one, none does.
int EntryTable::FindOrBelow(const std::string& path, Entry& entry, bool& found, bool& has_below) {
  found = false;
  has_below = false;
  next.BindBlob(1, path);
  bool any = false;
  std::string neighbour;
  int64_t id = 0;
  int code = next.ReadOne(any, [&] {
    neighbour = next.Bytes(0);
    id = next.Int(1);
  });
  if (!any || !neighbour.starts_with(path)) {
    return code;
  }
  if (neighbour != path) {
    return HasBelow(PathRange(path), has_below);
  }

  row.BindInt(1, id);
  code = row.ReadOne(found, [&] { ReadEntry(row, entry); });
  return code == SQLITE_OK && !found ? SQLITE_CORRUPT : code;
}

int EntryTable::HasBelow(const PathRange& range, bool& has) {
  range.Bind(below);
  return below.ReadOne(has, [] {});
}

int EntryTable::Slice(const std::string& after, const std::string& end, int limit,
                      std::vector<Entry>& slice_entries) {
  slice_entries.clear();
  slice.BindBlob(1, after);
  slice.BindBlob(2, end);
  slice.BindInt(3, limit);
  return slice.ReadAll([&] { ReadEntry(slice, slice_entries.emplace_back()); });
}

int EntryTable::CollectPaths(Statement& statement, std::vector<std::string>& paths) {
  return statement.ReadAll([&] { paths.push_back(statement.Bytes(0)); });
}

int EntryTable::OtherPaths(const Entry& entry, bool changed, std::vector<std::string>& paths,
                           int64_t most) {
  other_paths.BindInt(1, static_cast<int64_t>(entry.inode));
  other_paths.BindInt(2, entry.id);
  other_paths.BindInt(3, entry.birth_time);
  other_paths.BindInt(4, changed ? 1 : 0);
  other_paths.BindInt(5, entry.ctime);
  other_paths.BindInt(6, most);
  return CollectPaths(other_paths, paths);
}

int EntryTable::StaleTwins(const Entry& entry, std::vector<std::string>& paths) {
  twins.BindInt(1, static_cast<int64_t>(entry.inode));
  twins.BindBlob(2, entry.path);
  twins.BindInt(3, entry.size);
  twins.BindInt(4, entry.mtime);
  twins.BindInt(5, entry.owner);
  twins.BindInt(6, entry.group);
  twins.BindInt(7, entry.mode);
  return CollectPaths(twins, paths);
}

// A clock that steps back must not hide a row from those who follow them in this order.
int64_t EntryTable::NextStamp() {
  last_written = std::max(Now(), last_written + 1);
  return last_written;
}

void EntryTable::BindAttributes(Statement& statement, int column, const Entry& entry, bool reread) {
  const int64_t stamp = NextStamp();
  for (const int64_t value :
       {static_cast<int64_t>(entry.thing), static_cast<int64_t>(entry.kind),
        static_cast<int64_t>(entry.content_wanted), static_cast<int64_t>(entry.inode), entry.size,
        entry.mtime, entry.ctime, entry.birth_time, entry.first_seen,
        static_cast<int64_t>(entry.owner), static_cast<int64_t>(entry.group),
        static_cast<int64_t>(entry.mode), stamp, reread ? stamp : entry.reread}) {
    statement.BindInt(column++, value);
  }
}

int EntryTable::Insert(const Entry& entry) {
  insert.BindBlob(1, entry.path);
  BindAttributes(insert, 2, entry, false);
  ++changes;
  int code = insert.Run();
  if (code != SQLITE_OK) {
    return code;
  }

  ++entries;
  inserted = sqlite3_last_insert_rowid(handle);
  return RunTexts(insert_name, insert_part, inserted, entry.path);
}

int EntryTable::Update(const Entry& entry, bool reread) {
  update.BindInt(1, entry.id);
  BindAttributes(update, 2, entry, reread);
  ++changes;
  return update.Run();
}

int EntryTable::Remove(const Entry& entry) {
  remove.BindInt(1, entry.id);
  ++changes;
  int code = remove.Run();
  if (code != SQLITE_OK) {
    return code;
  }

  --entries;
  ++removed;
  return RunTexts(remove_name, remove_part, entry.id, entry.path);
}

int EntryTable::RemoveAll(std::vector<const Entry*> leaving) {
  std::sort(leaving.begin(), leaving.end(),
            [](const Entry* left, const Entry* right) { return left->id < right->id; });
  int code = SQLITE_OK;
  for (size_t i = 0; i < leaving.size() && code == SQLITE_OK; ++i) {
    code = Remove(*leaving[i]);
  }
  return code;
}

int EntryTable::RunTexts(Statement& name, Statement& part, int64_t id, const std::string& path) {
  const std::string text = ToUtf8(LastComponent(path));
  const std::string words = NameRow(folder, text);
  name.BindInt(1, id);
  name.BindText(2, words);
  const int code = name.Run();
  if (code != SQLITE_OK) {
    return code;
  }

  const std::string folded = folder.Parts(text);
  part.BindInt(1, id);
  part.BindText(2, folded);
  return part.Run();
}

}  // namespace fileindexd
