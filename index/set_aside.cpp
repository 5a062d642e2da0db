// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/set_aside.h"

#include <sys/stat.h>
#include <sys/time.h>
#include <syslog.h>

#include <cerrno>
#include <cstdio>
#include <ctime>
#include <filesystem>
#include <system_error>

namespace fileindexd {

namespace {

constexpr time_t COPY_INTERVAL = 3600;  // seconds

bool RemoveAll(const std::string& path) {
  std::error_code error;
  std::filesystem::remove_all(path, error);
  if (error) {
    errno = error.value();
    return false;
  }
  return true;
}

const char* FlawText(IndexFlaw flaw) {
  switch (flaw) {
    case IndexFlaw::DAMAGED:
      return "damaged";
    case IndexFlaw::OTHER_VERSION:
      return "made by another version";
    case IndexFlaw::OTHER_PROGRAM:
      return "made by another program";
  }
  return "damaged";
}

bool HasFreshCopy(const std::string& damaged_path) {
  struct stat copy {};
  if (lstat(damaged_path.c_str(), &copy) != 0) {
    return false;
  }

  // A copy of the future says nothing about its age: the clock was set back.
  const time_t age = time(nullptr) - copy.st_mtime;
  return age >= 0 && age < COPY_INTERVAL;
}

}  // namespace

bool SetAside(const std::string& index_path, IndexFlaw flaw, const char* reason) {
  const std::string damaged_path = index_path + ".damaged";
  if (HasFreshCopy(damaged_path)) {
    syslog(LOG_ERR, "%s:%d index %s and removed, path=%s, reason=%s", __FILE__, __LINE__,
           FlawText(flaw), index_path.c_str(), reason);
    return RemoveAll(index_path);
  }

  if (!RemoveAll(damaged_path)) {
    return false;
  }

  if (rename(index_path.c_str(), damaged_path.c_str()) != 0) {
    return errno == ENOENT;
  }

  // The copy's age counts from now, not from the last file that was made in it.
  (void)utimes(damaged_path.c_str(), nullptr);
  syslog(LOG_ERR, "%s:%d index %s and set aside, path=%s, copy=%s, reason=%s", __FILE__, __LINE__,
         FlawText(flaw), index_path.c_str(), damaged_path.c_str(), reason);
  return true;
}

bool MakeEmptyIndex(const std::string& index_path) {
  if (!RemoveAll(index_path) || mkdir(index_path.c_str(), 0700) != 0) {
    return false;
  }
  return chmod(index_path.c_str(), 0700) == 0;
}

}  // namespace fileindexd
