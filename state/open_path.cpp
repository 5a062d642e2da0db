// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/open_path.h"

#include <fcntl.h>
#include <linux/openat2.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>

#include "base/scoped_fd.h"

namespace fileindexd {

namespace {

int OpenWithoutLinks(int folder, const std::string& path) {
  open_how how{};
  how.flags = O_PATH | O_NOFOLLOW | O_CLOEXEC;
  how.resolve = RESOLVE_NO_SYMLINKS;
  long result = -1;
  do {
    result = syscall(SYS_openat2, folder, path.c_str(), &how, sizeof how);
  } while (result < 0 && errno == EINTR);
  return static_cast<int>(result);
}

int OpenRoot(const std::string& root, int more_flags) {
  const int fd = open(root.c_str(), O_PATH | O_CLOEXEC | more_flags);
  if (fd < 0 && errno == ELOOP) {
    errno = ENOENT;  // links above the root that lead nowhere: no link inside the share
  }
  return fd;
}

}  // namespace

std::string BelowRoot(const std::string& root, const std::string& path) {
  if (path.size() <= root.size()) {
    return {};
  }
  return path.substr(root == "/" ? 1 : root.size() + 1);
}

int OpenByComponents(const std::string& root, const std::string& path) {
  const std::string below = BelowRoot(root, path);
  ScopedFd at(OpenRoot(root, below.empty() ? 0 : O_DIRECTORY));
  for (size_t begin = 0; at.fd >= 0 && begin < below.size();) {
    const size_t slash = below.find('/', begin);
    const bool last = slash == std::string::npos;
    const std::string name = below.substr(begin, last ? slash : slash - begin);
    ScopedFd next(openat(at.fd, name.c_str(), O_PATH | O_NOFOLLOW | O_CLOEXEC));
    if (next.fd < 0) {
      return -1;  // closing an O_PATH descriptor leaves errno alone
    }
    struct stat st {};
    if (!last && fstat(next.fd, &st) != 0) {
      return -1;
    }
    if (!last && S_ISLNK(st.st_mode)) {
      errno = ELOOP;
      return -1;
    }
    at.Swap(next);
    begin = last ? below.size() : slash + 1;
  }
  return at.Release();
}

int OpenInShare(const std::string& root, const std::string& path) {
  if (path == root) {
    return OpenRoot(root, 0);
  }
  int fd = OpenWithoutLinks(AT_FDCWD, path);
  if (fd < 0 && errno == ELOOP) {
    // A link at or above the root is the administrator's choice; only one below it counts.
    const ScopedFd folder(OpenRoot(root, O_DIRECTORY));
    if (folder.fd < 0) {
      return -1;
    }
    fd = OpenWithoutLinks(folder.fd, BelowRoot(root, path));
  }
  // EPERM: what filters of system calls answer for one that they do not know.
  if (fd < 0 && (errno == ENOSYS || errno == EPERM)) {
    return OpenByComponents(root, path);
  }
  return fd;
}

}  // namespace fileindexd
