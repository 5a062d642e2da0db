// SPDX-License-Identifier: GPL-2.0-or-later
// A system log that is read by a thread of this process, so that log lines are real ones.
#pragma once

#include <atomic>
#include <thread>

#include "base/scoped_fd.h"

namespace fileindexd {

// Needs a mount namespace of our own: an empty /dev hides that of the machine. One for the whole
// program; the C library keeps the connection.
class ReadLog {
 public:
  ReadLog();
  ~ReadLog();
  ReadLog(const ReadLog&) = delete;
  ReadLog& operator=(const ReadLog&) = delete;

  bool ready = false;            // false: it could not be made
  std::atomic<int> lines{0};     // read so far
  std::atomic<bool> end{false};  // told by the destructor, with an empty message

 private:
  ScopedFd socket_fd;
  std::thread reader;
};

}  // namespace fileindexd
