// SPDX-License-Identifier: GPL-2.0-or-later
// Statements of one connection that are prepared once: preparing takes longer than many of them
// run.
#pragma once

#include <functional>
#include <map>
#include <string>
#include <string_view>

#include "state/sqlite.h"

namespace fileindexd {

// One thread at a time. Goes before its connection.
class KeptStatements {
 public:
  explicit KeptStatements(sqlite3* of_db = nullptr) : db(of_db) {}

  // Forgets those of the connection before.
  void Use(sqlite3* other_db);
  // The statement of that text, at its beginning. Whoever gets it is the only one to use it until
  // he is done: the next one who asks for the same text starts it anew. Each text is kept, so none
  // holds a value of a question. SQLite's code; `statement` is set only with SQLITE_OK.
  int Find(std::string_view sql, Statement*& statement);
  // Of those that were left half read, none holds on to what it reads any longer.
  void Reset();

  sqlite3* db;

 private:
  std::map<std::string, Statement, std::less<>> statements;  // by their text
};

}  // namespace fileindexd
