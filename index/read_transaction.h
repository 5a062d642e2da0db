// SPDX-License-Identifier: GPL-2.0-or-later
// Statements that read the same state.
#pragma once

#include <sqlite3.h>

namespace fileindexd {

// Closing it needs no disk, so its result does not count. Goes before its connection.
class ReadTransaction {
 public:
  explicit ReadTransaction(sqlite3* opened) : db(opened) {
    code = sqlite3_exec(db, "BEGIN", nullptr, nullptr, nullptr);
  }
  ReadTransaction(const ReadTransaction&) = delete;
  ReadTransaction& operator=(const ReadTransaction&) = delete;
  ~ReadTransaction() { (void)sqlite3_exec(db, "COMMIT", nullptr, nullptr, nullptr); }

  sqlite3* db;
  int code;
};

}  // namespace fileindexd
