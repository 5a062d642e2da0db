// SPDX-License-Identifier: GPL-2.0-or-later
// Standard input, output and error that a program was started without.
#pragma once

#include <fcntl.h>
#include <unistd.h>

namespace fileindexd {

// Puts something under each of the numbers 0 to 2 that is closed. Else the next file that is opened
// gets that number, and what is meant for a stream goes into it. Before anything is opened.
inline void FillStandardStreams() {
  for (int fd = STDIN_FILENO; fd <= STDERR_FILENO; ++fd) {
    if (fcntl(fd, F_GETFD) >= 0) {
      continue;
    }

    // Opened the wrong way round, so that using it still fails. The lowest number is the free one.
    (void)open("/dev/null", fd == STDIN_FILENO ? O_WRONLY : O_RDONLY);
  }
}

}  // namespace fileindexd
