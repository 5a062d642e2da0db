// SPDX-License-Identifier: GPL-2.0-or-later
// Reading the state database without its log and without the shared memory that a log needs, while
// that holds nothing that the database does not.
#include <sys/stat.h>

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

}  // namespace fileindexd
