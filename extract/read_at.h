// SPDX-License-Identifier: GPL-2.0-or-later
// Bytes of a document from anywhere in it.
#pragma once

#include <unistd.h>

#include <cerrno>
#include <cstddef>
#include <cstdint>

#include "extract/format.h"

namespace fileindexd {

inline void NoteFault(const Document& document, int error) {
  if (document.fault != nullptr && *document.fault == 0) {
    *document.fault = error;
  }
}

// Up to `size` bytes from `offset`; fewer at the document's end, with errno 0, and where reading
// fails, with its errno, which is noted. Does not move the descriptor's position.
inline size_t ReadAt(const Document& document, int64_t offset, char* bytes, size_t size) {
  size_t done = 0;
  errno = 0;
  while (done < size) {
    const ssize_t got = pread(document.file, bytes + done, size - done,
                              static_cast<off_t>(offset + static_cast<int64_t>(done)));
    if (got < 0 && errno == EINTR) {
      errno = 0;
      continue;
    }
    if (got < 0) {
      NoteFault(document, errno);
    }
    if (got <= 0) {
      break;
    }
    done += static_cast<size_t>(got);
  }
  return done;
}

}  // namespace fileindexd
