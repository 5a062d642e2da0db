// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/kept_statements.h"

namespace fileindexd {

void KeptStatements::Use(sqlite3* other_db) {
  statements.clear();
  db = other_db;
}

int KeptStatements::Find(std::string_view sql, Statement*& statement) {
  auto found = statements.find(sql);
  if (found == statements.end()) {
    found = statements.try_emplace(std::string(sql)).first;
  }
  if (found->second.handle != nullptr) {
    found->second.Reset();
  } else {
    const int code = found->second.Prepare(db, found->first.c_str());
    if (code != SQLITE_OK) {
      return code;
    }
  }
  statement = &found->second;
  return SQLITE_OK;
}

void KeptStatements::Reset() {
  for (auto& [sql, statement] : statements) {
    statement.Reset();
  }
}

}  // namespace fileindexd
