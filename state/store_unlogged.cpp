// SPDX-License-Identifier: GPL-2.0-or-later
// Reading the state database without its log and without the shared memory that a log needs, while
// that holds nothing that the database does not.
#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>

#include <cerrno>

#include "base/scoped_fd.h"
#include "state/filesystem.h"
#include "state/layout.h"
#include "state/store_database.h"

namespace fileindexd {

namespace {

// The form in which SQLite takes options with a path.
std::string Uri(const std::string& path, const char* options) {
  constexpr char DIGITS[] = "0123456789abcdef";
  std::string uri = "file:";
  for (const char c : path) {
    if (c == '%' || c == '?' || c == '#') {
      const auto byte = static_cast<unsigned char>(c);
      uri += {'%', DIGITS[byte / 16], DIGITS[byte % 16]};
    } else {
      uri += c;
    }
  }
  return uri + options;
}

// True when it is sound, and of our version.
bool OpenUnlogged(StateConnection& connection) {
  const std::string uri = Uri(connection.path, "?immutable=1");
  constexpr int FLAGS = SQLITE_OPEN_READONLY | SQLITE_OPEN_NOMUTEX | SQLITE_OPEN_URI;
  int64_t version = 0;
  bool ok = false;
  return sqlite3_open_v2(uri.c_str(), &connection.db, FLAGS, nullptr) == SQLITE_OK &&
         SchemaVersion(connection.db, version) == SQLITE_OK && version == STATE_VERSION &&
         QuickCheck(connection.db, ok) == SQLITE_OK && ok;
}

bool IsAbsent(const std::string& path) {
  struct stat st {};
  return lstat(path.c_str(), &st) != 0 && errno == ENOENT;
}

}  // namespace

bool OpenFullState(StateConnection& connection, const std::string& error) {
  struct stat log {};
  const std::string log_path = connection.path + "-wal";
  if (HasSpace(StateRoot(), false) || (lstat(log_path.c_str(), &log) == 0 && log.st_size > 0) ||
      !OpenUnlogged(connection)) {
    return false;
  }
  connection.read_only = error + "; its disk is full";
  return true;
}

std::unique_ptr<StateConnection> OpenUnusedState() {
  auto connection = std::make_unique<StateConnection>();
  connection->path = StateDatabasePath();
  ScopedFd lock(open(StateRoot().c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (lock.fd < 0 || flock(lock.fd, LOCK_SH | LOCK_NB) != 0) {
    return nullptr;
  }
  connection->lock.Swap(lock);

  // Whoever has it open has made these.
  struct stat st {};
  for (const char* companion : {"-wal", "-shm", "-journal"}) {
    if (!IsAbsent(connection->path + companion)) {
      return nullptr;
    }
  }
  const bool is_file = lstat(connection->path.c_str(), &st) == 0 && S_ISREG(st.st_mode);
  connection->read_only = "it was opened to be read once";
  return is_file && OpenUnlogged(*connection) ? std::move(connection) : nullptr;
}

}  // namespace fileindexd
