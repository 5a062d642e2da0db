// SPDX-License-Identifier: GPL-2.0-or-later
// Owner of one file descriptor, for early exits and for a thread that is cancelled.
#pragma once

#include <unistd.h>

#include <utility>

namespace fileindexd {

// Owns a file descriptor; -1 is none. Closes it when destroyed; an error of close() is dropped.
class ScopedFd {
 public:
  explicit ScopedFd(int owned = -1) : fd(owned) {}
  ScopedFd(const ScopedFd&) = delete;
  ScopedFd& operator=(const ScopedFd&) = delete;
  // close() is a cancellation point: a thread cancelled in it unwinds through here, and an
  // implicit noexcept would end the process.
  ~ScopedFd() noexcept(false) { Close(); }

  void Swap(ScopedFd& other) { std::swap(fd, other.fd); }

  // Gives the descriptor up to the caller.
  [[nodiscard]] int Release() { return std::exchange(fd, -1); }

  // Closes now. The number is forgotten first, so that an unwind out of close() does not meet it.
  void Close() {
    const int closing = Release();
    if (closing >= 0) {
      close(closing);
    }
  }

  int fd;
};

}  // namespace fileindexd
