// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/state_files.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>

#include <cerrno>
#include <chrono>
#include <cstring>
#include <thread>

namespace fileindexd {

namespace {

constexpr std::chrono::seconds LOCK_WAIT(5);
constexpr std::chrono::milliseconds LOCK_NAP(5);

}  // namespace

bool LockStateRoot(const std::string& root, bool wait, ScopedFd& lock, std::string& error) {
  ScopedFd folder(open(root.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (folder.fd < 0) {
    error = StateFileError("cannot open", root);
    return false;
  }
  const auto deadline = std::chrono::steady_clock::now() + (wait ? LOCK_WAIT : LOCK_WAIT.zero());
  while (flock(folder.fd, LOCK_EX | LOCK_NB) != 0) {
    if ((errno != EWOULDBLOCK && errno != EINTR) || std::chrono::steady_clock::now() >= deadline) {
      error = StateFileError("cannot lock", root);
      return false;
    }
    std::this_thread::sleep_for(LOCK_NAP);
  }
  lock.Swap(folder);
  return true;
}

std::string StateFileError(const std::string& what, const std::string& path) {
  return what + " " + path + ": " + strerror(errno);  // NOLINT: glibc's is safe
}

bool StateFileExists(const std::string& path) {
  struct stat st {};
  return lstat(path.c_str(), &st) == 0;
}

}  // namespace fileindexd
