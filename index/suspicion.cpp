// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/suspicion.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <chrono>
#include <cstdlib>
#include <ctime>
#include <exception>
#include <filesystem>
#include <map>
#include <mutex>
#include <utility>
#include <vector>

#include "base/scoped_fd.h"
#include "state/layout.h"
#include "state/queue_writer.h"
#include "state/sqlite.h"

namespace fileindexd {

namespace {

constexpr time_t WAKE_INTERVAL = 60;  // seconds

std::string NotePath(const std::string& index_path) {
  return index_path + "/" + SUSPICION_NOTE;
}

// Whatever somebody put in its place.
void RemoveNote(const std::string& path) {
  std::error_code ignored;  // the database is looked at again
  std::filesystem::remove_all(path, ignored);
}

// False where it is there already, and whoever left it woke the writer not long ago.
bool LeaveNote(const std::string& index_path) {
  constexpr int FLAGS = O_WRONLY | O_CREAT | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK;
  const std::string path = NotePath(index_path);
  struct stat left {};
  if (lstat(path.c_str(), &left) == 0 && std::abs(time(nullptr) - left.st_mtime) < WAKE_INTERVAL) {
    return false;
  }
  if (!IsFileOrNothing(path)) {
    RemoveNote(path);
  }
  const ScopedFd note(open(path.c_str(), FLAGS, 0600));
  return note.fd >= 0 && futimens(note.fd, nullptr) == 0;
}

// Whether this process has told it not long ago. Who looks again whenever something happens to a
// share would wake itself without end.
bool WasJustTold(const std::string& share_name, IndexError error) {
  using Clock = std::chrono::steady_clock;
  static std::mutex mutex;
  static std::map<std::pair<std::string, IndexError>, Clock::time_point> told;
  const std::lock_guard<std::mutex> lock(mutex);
  const Clock::time_point now = Clock::now();
  const auto [last, is_first] = told.try_emplace({share_name, error}, now);
  if (!is_first && now - last->second < std::chrono::seconds(WAKE_INTERVAL)) {
    return true;
  }
  last->second = now;
  return false;
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
    const std::string path = IndexPath(share_name);
    if (access(path.c_str(), F_OK) != 0) {
      return;  // the share was removed: nothing of it is made anew
    }
    const bool is_gone = error == IndexError::IO || error == IndexError::PATH_NOT_FOUND;
    const bool wakes =
        error == IndexError::DAMAGED ? LeaveNote(path) : is_gone && !WasJustTold(share_name, error);
    std::string ignored;  // whoever reads later tells again
    if (wakes) {
      (void)TouchQueue(share_name, ignored);
    }
  } catch (const std::exception&) {  // no memory
  }
}

IndexError OpenAndTell(IndexDatabase& entries, const std::string& share_name) {
  const IndexError error = entries.OpenForReading(IndexPath(share_name));
  if (error != IndexError::PATH_NOT_FOUND) {
    TellWriter(share_name, error);
  }
  return error;
}

void TellContentsWriter(const std::string& share_name, IndexError error) {
  try {
    if (error == IndexError::DAMAGED) {
      (void)LeaveNote(ContentsPath(share_name));
    }
  } catch (const std::exception&) {  // no memory
  }
}

IndexError CheckSuspected(sqlite3* db, const std::string& index_path) {
  const std::string note = NotePath(index_path);
  if (access(note.c_str(), F_OK) != 0) {
    return IndexError::NONE;
  }
  // A page that cannot be read for a moment looks like damage: twice, then.
  bool ok = false;
  int code = SQLITE_OK;
  for (int looks = 0; looks < 2 && code == SQLITE_OK && !ok; ++looks) {
    code = FullCheck(db, ok);
  }
  if (code == SQLITE_OK && !ok) {
    return IndexError::DAMAGED;
  }
  code = code == SQLITE_OK ? CheckWords(db) : code;
  if (code == SQLITE_OK) {
    RemoveNote(note);
  }
  return code == SQLITE_ERROR ? IndexError::DAMAGED : FromSqlite(code);
}

}  // namespace fileindexd
