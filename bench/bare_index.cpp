// SPDX-License-Identifier: GPL-2.0-or-later
#include "bench/bare_index.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>

#include <cstdio>
#include <cstring>
#include <ctime>

#include "base/scoped_stream.h"
#include "bench/measure.h"
#include "index/kind.h"

namespace fileindexd {

namespace {

constexpr uint64_t MADE_UP_FILES = 100;                // in one folder
constexpr uint64_t MADE_UP_INODE = uint64_t{1} << 62;  // so high that no file has it

int64_t Nanoseconds(const statx_timestamp& time) {
  return int64_t{time.tv_sec} * 1000000000 + time.tv_nsec;
}

void Check(int code, const char* what) {
  if (code != SQLITE_OK) {
    Fail(std::string(what) + ": " + sqlite3_errstr(code));
  }
}

// Rows that were put before: no two made-up things may have one inode, or each commit would touch
// every page of the index of inodes.
uint64_t RowsIn(const BareEngine& engine) {
  Statement last;
  Check(last.Prepare(engine.database.db, "SELECT ifnull(max(id), 0) FROM entries"), "prepare");
  Check(last.Step() == SQLITE_ROW ? SQLITE_OK : SQLITE_ERROR, "count");
  return static_cast<uint64_t>(last.Int(0));
}

uint64_t PutTree(BareEngine& engine, const std::string& path) {
  const Entry entry = EntryAt(path);
  engine.Put(entry);
  engine.CountChange();
  if (entry.thing != Thing::DIRECTORY) {
    return 1;
  }

  engine.CountChange();  // the walk
  const ScopedDir stream(opendir(path.c_str()));
  if (stream.dir == nullptr) {
    Fail("cannot read " + path);
  }
  uint64_t put = 1;
  while (const dirent* found = readdir(stream.dir)) {  // NOLINT(concurrency-mt-unsafe): one thread
    if (strcmp(found->d_name, ".") != 0 && strcmp(found->d_name, "..") != 0) {
      put += PutTree(engine, path + "/" + found->d_name);
    }
  }
  return put;
}

}  // namespace

BareEngine::BareEngine(const std::string& index_path) : path(index_path) {
  Open();
}

void BareEngine::Open() {
  if (database.OpenForWriting(path, true) != IndexError::NONE) {
    Fail("cannot open " + path);
  }
  table = std::make_unique<EntryTable>();
  Check(table->Prepare(database.db), "prepare");
}

void BareEngine::Put(const Entry& entry) {
  if (sqlite3_get_autocommit(database.db) != 0) {
    Check(table->Begin(), "begin");
  }
  Check(table->Insert(entry), "insert");
}

void BareEngine::CommitAndClose() {
  if (sqlite3_get_autocommit(database.db) == 0) {
    Check(table->Commit(time(nullptr)), "commit");
  }
  table.reset();
  database.Close();
  changes = 0;
}

void BareEngine::CountChange() {
  ++changes;
  if (changes >= BARE_COMMIT_LIMIT) {
    CommitAndClose();
    Open();
  }
}

uint64_t BareIndexOf(const std::string& root, const std::string& index_path) {
  BareEngine engine(index_path);
  const uint64_t put = PutTree(engine, root);
  engine.CommitAndClose();
  return put;
}

void PutMadeUpRows(const std::string& index_path, const std::string& under, uint64_t rows) {
  BareEngine engine(index_path);
  Entry entry;
  entry.thing = Thing::FILE;
  entry.kind = Kind::DOCUMENT;
  entry.size = 4096;
  entry.mode = 0644;
  char name[64];
  const uint64_t first_inode = MADE_UP_INODE + RowsIn(engine);
  for (uint64_t row = 0; row < rows; ++row) {
    snprintf(name, sizeof(name), "/folder-%06u/report-%08u.odt",
             static_cast<unsigned>(row / MADE_UP_FILES), static_cast<unsigned>(row));
    entry.path = under + name;
    entry.inode = first_inode + row;
    engine.Put(entry);
    engine.CountChange();
  }
  engine.CommitAndClose();
}

Entry EntryAt(const std::string& path) {
  struct statx seen {};
  if (statx(AT_FDCWD, path.c_str(), AT_SYMLINK_NOFOLLOW, STATX_BASIC_STATS | STATX_BTIME, &seen) !=
      0) {
    Fail("cannot look at " + path);
  }

  Entry entry;
  entry.path = path;
  const bool is_directory = S_ISDIR(seen.stx_mode);
  entry.thing = is_directory ? Thing::DIRECTORY : Thing::FILE;
  entry.kind = is_directory ? Kind::FOLDER : KindOfName(LastComponent(path));
  entry.inode = seen.stx_ino;
  entry.size = is_directory ? 0 : static_cast<int64_t>(seen.stx_size);
  entry.mtime = is_directory ? 0 : Nanoseconds(seen.stx_mtime);
  entry.ctime = Nanoseconds(seen.stx_ctime);
  entry.birth_time = Nanoseconds(seen.stx_btime);
  entry.first_seen = int64_t{time(nullptr)} * 1000000000;
  entry.owner = seen.stx_uid;
  entry.group = seen.stx_gid;
  entry.mode = seen.stx_mode & 07777;
  return entry;
}

}  // namespace fileindexd
