// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/entry_stream.h"

#include <utility>

namespace fileindexd {

namespace {

constexpr size_t SLICE = 1000;  // rows

void AssignPath(const Statement& statement, int column, std::string& path) {
  const auto* bytes = static_cast<const char*>(sqlite3_column_blob(statement.handle, column));
  const int length = sqlite3_column_bytes(statement.handle, column);
  path.assign(bytes != nullptr ? bytes : "", static_cast<size_t>(length));
}

}  // namespace

void EntryStream::Start(sqlite3* opened, std::string passed) {
  db = opened;
  after = std::move(passed);
  count = 0;
  next = 0;
  ended = false;
}

bool EntryStream::Next(const Entry*& entry) {
  if (next == count && !ended && !ReadSlice()) {
    return false;
  }
  entry = next == count ? nullptr : &rows[next++];
  return true;
}

bool EntryStream::ReadSlice() {
  if (statement.handle == nullptr &&
      statement.Prepare(db,
                        "SELECT path, thing, kind, content_wanted, inode, size, mtime, birth_time"
                        " FROM entries WHERE path > ?1 ORDER BY path LIMIT ?2") != SQLITE_OK) {
    return false;
  }
  if (count != 0) {
    after = rows[count - 1].path;
  }

  rows.resize(SLICE);
  count = 0;
  next = 0;
  statement.BindBlob(1, after);
  statement.BindInt(2, SLICE);
  int code = statement.Step();
  for (; code == SQLITE_ROW; code = statement.Step()) {
    Entry& entry = rows[count++];
    AssignPath(statement, 0, entry.path);
    entry.thing = static_cast<Thing>(statement.Int(1));
    entry.kind = static_cast<Kind>(statement.Int(2));
    entry.content_wanted = statement.Int(3) == 1;
    entry.inode = static_cast<uint64_t>(statement.Int(4));
    entry.size = statement.Int(5);
    entry.mtime = statement.Int(6);
    entry.birth_time = statement.Int(7);
  }
  statement.Reset();
  ended = count < SLICE;
  return code == SQLITE_DONE;
}

}  // namespace fileindexd
