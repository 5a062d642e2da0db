// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/suspicion.h"

#include <fcntl.h>
#include <unistd.h>

#include <exception>
#include <vector>

#include "base/scoped_fd.h"
#include "state/layout.h"
#include "state/queue_writer.h"
#include "state/sqlite.h"

namespace fileindexd {

namespace {

std::string NotePath(const std::string& index_path) {
  return index_path + "/suspected";
}

// False where it is there already.
bool LeaveNote(const std::string& index_path) {
  constexpr int FLAGS = O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC | O_NOFOLLOW;
  const ScopedFd note(open(NotePath(index_path).c_str(), FLAGS, 0600));
  return note.fd >= 0;
}

// The words' tables can be damaged in pages that are sound.
int CheckWords(sqlite3* db) {
  std::vector<std::string> tables;
  Statement names;
  int code = names.Prepare(db, "SELECT name FROM sqlite_schema WHERE sql LIKE '%USING fts5(%'");
  code = code == SQLITE_OK ? names.ReadAll([&] { tables.push_back(names.Bytes(0)); }) : code;
  for (const std::string& table : tables) {
    std::string check = "INSERT INTO ";
    check.append(table).append("(").append(table).append(") VALUES('integrity-check')");
    code = code == SQLITE_OK ? Execute(db, check.c_str()) : code;
  }
  return code;
}

}  // namespace

void TellWriter(const std::string& share_name, IndexError error) {
  try {
    const bool wakes =
        error == IndexError::DAMAGED ? LeaveNote(IndexPath(share_name)) : error == IndexError::IO;
    std::string ignored;  // whoever reads next tells again
    if (wakes) {
      (void)AppendToQueue(share_name, {}, ignored);
    }
  } catch (const std::exception&) {  // no memory
  }
}

IndexError CheckSuspected(sqlite3* db, const std::string& index_path) {
  const std::string note = NotePath(index_path);
  if (access(note.c_str(), F_OK) != 0) {
    return IndexError::NONE;
  }
  bool ok = false;
  int code = FullCheck(db, ok);
  if (code == SQLITE_OK && !ok) {
    return IndexError::DAMAGED;
  }
  code = code == SQLITE_OK ? CheckWords(db) : code;
  if (code == SQLITE_OK) {
    (void)unlink(note.c_str());
  }
  return FromSqlite(code);
}

}  // namespace fileindexd
