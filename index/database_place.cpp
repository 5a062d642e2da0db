// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/database_place.h"

#include <sys/stat.h>

#include <cerrno>
#include <filesystem>
#include <system_error>

#include "state/sqlite.h"

namespace fileindexd {

IndexError FindFile(const std::string& index_path, const std::string& file) {
  struct stat status {};
  if (lstat(index_path.c_str(), &status) != 0 || !S_ISDIR(status.st_mode)) {
    const bool absent = errno == ENOENT || errno == ENOTDIR;
    return absent || status.st_mode != 0 ? IndexError::PATH_NOT_FOUND : IndexError::IO;
  }
  if (lstat(file.c_str(), &status) != 0) {
    return errno == ENOENT ? IndexError::PATH_NOT_FOUND : IndexError::IO;
  }

  // An empty file is a valid database to SQLite, without a schema.
  if (!S_ISREG(status.st_mode) || status.st_size == 0) {
    return IndexError::PATH_NOT_FOUND;
  }
  return IsFileOrNothing(file + "-wal") && IsFileOrNothing(file + "-shm") ? IndexError::NONE
                                                                          : IndexError::DAMAGED;
}

bool HoldsSomething(const std::string& index_path, const std::string& file) {
  struct stat status {};
  if (lstat(index_path.c_str(), &status) == 0 && S_ISREG(status.st_mode)) {
    return status.st_size > 0;
  }
  if (lstat(file.c_str(), &status) != 0) {
    return false;
  }
  if (S_ISDIR(status.st_mode)) {
    std::error_code error;
    return !std::filesystem::is_empty(file, error) && !error;
  }
  return S_ISREG(status.st_mode) && lstat((file + "-wal").c_str(), &status) == 0 &&
         S_ISREG(status.st_mode) && status.st_size > 0;
}

}  // namespace fileindexd
