// SPDX-License-Identifier: GPL-2.0-or-later
// Owner of one file descriptor, for early exits and for a thread that is cancelled.
#pragma once

#include <fcntl.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <utility>

namespace fileindexd {

// Owns a file descriptor; -1 is none. Closes it when destroyed; an error of close() is dropped.
class ScopedFd {
 public:
  explicit ScopedFd(int owned = -1) : fd(owned) {}
  ScopedFd(const ScopedFd&) = delete;
  ScopedFd& operator=(const ScopedFd&) = delete;
  ~ScopedFd() { Close(); }

  void Swap(ScopedFd& other) { std::swap(fd, other.fd); }

  // Gives the descriptor up to the caller.
  [[nodiscard]] int Release() { return std::exchange(fd, -1); }

  // Closes now. By system call: close() is a cancellation point, and a thread that is cancelled
  // there leaves the file open, or would have to guess whether it is.
  void Close() {
    const int closing = Release();
    if (closing >= 0) {
      syscall(SYS_close, closing);
    }
  }

  int fd;
};

// Opens what is there; -1 with errno. By system call: open() is a cancellation point, and a thread
// can be cancelled in it when the file is open already, so that nobody closes it.
inline int OpenDescriptor(const char* path, int flags) {
  return static_cast<int>(syscall(SYS_openat, AT_FDCWD, path, flags | O_LARGEFILE));
}

}  // namespace fileindexd
