// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/fts5_api.h"

#include "state/sqlite.h"

namespace fileindexd {

fts5_api* Fts5Of(sqlite3* db) {
  fts5_api* api = nullptr;
  Statement statement;
  if (statement.Prepare(db, "SELECT fts5(?1)") != SQLITE_OK) {
    return nullptr;
  }
  sqlite3_bind_pointer(statement.handle, 1, static_cast<void*>(&api), "fts5_api_ptr", nullptr);
  (void)statement.Run();  // what counts is the pointer
  return api;
}

}  // namespace fileindexd
