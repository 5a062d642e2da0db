// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/entry_follower.h"

#include <algorithm>

#include "index/entry_table.h"
#include "index/schema.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

#define FOLLOWED_COLUMNS \
  "inode, birth_time, size, mtime, ctime, kind, content_wanted, written, reread"
constexpr const char* NEXT =
    "SELECT " FOLLOWED_COLUMNS
    " FROM entries WHERE content_wanted <> 0 AND written > ?1 ORDER BY written LIMIT ?2";
constexpr const char* OF_INODE =
    "SELECT size, mtime, content_wanted FROM entries WHERE inode = ?1 AND birth_time = ?2 "
    "AND thing = 1";
constexpr const char* LATEST = "SELECT " FOLLOWED_COLUMNS
                               " FROM entries WHERE inode = ?1 AND birth_time = ?2 "
                               "AND content_wanted = 1 ORDER BY written DESC LIMIT 1";
// A file may have thousands of links; any of them will do.
constexpr const char* PATHS =
    "SELECT path FROM entries WHERE " FILEINDEX_THAT_FILE " AND content_wanted = 1 LIMIT 16";

void ReadFollowed(const Statement& row, FollowedEntry& entry) {
  entry.identity = {static_cast<uint64_t>(row.Int(0)), row.Int(1), row.Int(2), row.Int(3)};
  entry.ctime = row.Int(4);
  entry.kind = static_cast<Kind>(row.Int(5));
  entry.is_wanted = row.Int(6) == 1;
  entry.written = row.Int(7);
  entry.reread = row.Int(8);
}

}  // namespace

// SQLITE_ROW: there is more than was asked for.
int EntryFollower::End(Statement& statement, int code) {
  statement.Reset();
  failed = StepError(code) != SQLITE_OK;
  return StepError(code);
}

// Opening would make a log anew in a folder that somebody is removing with all that is in it.
bool EntryFollower::IsBeingRemoved(const std::string& share_name) {
  const bool is_gone = LogInode(IndexPath(share_name) + "/" + ENTRIES_FORM.file) == 0;
  const auto now = std::chrono::steady_clock::now();
  if (!is_gone) {
    log_went.reset();
  } else if (database.IsOpen() && !log_went.has_value()) {
    log_went = now;
  }
  return log_went.has_value() && now - *log_went < ContentsWriter::LONGEST_REMOVAL;
}

IndexError EntryFollower::EnsureOpen(const std::string& share_name) {
  failed = false;
  is_going = false;
  if (database.IsOpen() && !database.HasMoved()) {
    return IndexError::NONE;
  }
  if (IsBeingRemoved(share_name)) {
    is_going = true;
    Close();
    return IndexError::PATH_NOT_FOUND;
  }
  Close();
  IndexError error = database.OpenForReading(IndexPath(share_name));
  if (error != IndexError::NONE) {
    return error;
  }

  Statement ask;
  int code = ask.Prepare(database.db, "SELECT made FROM meta WHERE id = 1");
  if (code == SQLITE_OK) {
    code = ask.Step();
  }
  if (code == SQLITE_ROW) {
    made = ask.Int(0);
    code = SQLITE_OK;
  }
  for (const auto& [statement, sql] :
       {std::pair{&next, NEXT}, std::pair{&of_inode, OF_INODE}, std::pair{&latest_of, LATEST},
        std::pair{&paths_of, PATHS}}) {
    code = code == SQLITE_OK ? statement->Prepare(database.db, sql) : code;
  }
  if (code != SQLITE_OK) {
    ask.Reset();
    Close();
    return code == SQLITE_DONE ? IndexError::DAMAGED : FromSqlite(code);
  }
  log_went.reset();
  return IndexError::NONE;
}

void EntryFollower::Close() {
  for (Statement* statement : {&next, &of_inode, &latest_of, &paths_of}) {
    sqlite3_finalize(statement->handle);
    statement->handle = nullptr;
  }
  database.Close();
}

int EntryFollower::Next(int64_t written, int64_t limit, std::vector<FollowedEntry>& entries) {
  entries.clear();
  next.BindInts({written, limit});
  int code = next.Step();
  for (; code == SQLITE_ROW; code = next.Step()) {
    ReadFollowed(next, entries.emplace_back());
  }
  return End(next, code);
}

int EntryFollower::Refer(const FileIdentity& identity, Reference& reference) {
  reference = Reference::NONE;
  of_inode.BindInts({static_cast<int64_t>(identity.inode), identity.birth_time});
  int code = of_inode.Step();
  for (; code == SQLITE_ROW && reference != Reference::WANTED; code = of_inode.Step()) {
    Reference found = Reference::UNWANTED;
    if (of_inode.Int(2) == 1) {
      const bool is_same = of_inode.Int(0) == identity.size && of_inode.Int(1) == identity.mtime;
      found = is_same ? Reference::WANTED : Reference::OTHER;
    }
    reference = std::max(reference, found);
  }
  return End(of_inode, code);
}

int EntryFollower::Latest(uint64_t inode, int64_t birth_time, FollowedEntry& entry, bool& found) {
  latest_of.BindInts({static_cast<int64_t>(inode), birth_time});
  const int code = latest_of.Step();
  found = code == SQLITE_ROW;
  if (found) {
    ReadFollowed(latest_of, entry);
  }
  return End(latest_of, code);
}

int EntryFollower::Paths(const FileIdentity& identity, std::vector<std::string>& paths) {
  paths.clear();
  BindIdentity(paths_of, identity);
  int code = paths_of.Step();
  for (; code == SQLITE_ROW; code = paths_of.Step()) {
    paths.push_back(paths_of.Bytes(0));
  }
  return End(paths_of, code);
}

}  // namespace fileindexd
