// SPDX-License-Identifier: GPL-2.0-or-later
// Bytes of a file from anywhere in it.
#pragma once

#include <unistd.h>

#include <cerrno>
#include <cstddef>
#include <cstdint>

namespace fileindexd {

// Up to `size` bytes from `offset`; fewer at the file's end, with errno 0, and where reading fails,
// with its errno. Does not move the descriptor's position.
inline size_t ReadAt(int file, int64_t offset, char* bytes, size_t size) {
  size_t done = 0;
  errno = 0;
  while (done < size) {
    const ssize_t got = pread(file, bytes + done, size - done,
                              static_cast<off_t>(offset + static_cast<int64_t>(done)));
    if (got < 0 && errno == EINTR) {
      errno = 0;
      continue;
    }
    if (got <= 0) {
      break;
    }
    done += static_cast<size_t>(got);
  }
  return done;
}

}  // namespace fileindexd
