// SPDX-License-Identifier: GPL-2.0-or-later
// A system log of this process, so that log lines are real ones.
#pragma once

#include <atomic>
#include <string>
#include <thread>
#include <vector>

#include "base/scoped_fd.h"

namespace fileindexd {

// Needs a mount namespace of our own: an empty /dev hides that of the machine. One at a time; the C
// library keeps the connection.
class LogSocket {
 public:
  LogSocket();
  ~LogSocket();
  LogSocket(const LogSocket&) = delete;
  LogSocket& operator=(const LogSocket&) = delete;

  // The lines that nobody took yet. The kernel keeps ten of them, then whoever writes more waits.
  std::vector<std::string> Take();

  bool ready = false;  // false: it could not be made
  ScopedFd fd;
};

// One that is read by a thread.
class ReadLog {
 public:
  ReadLog();
  ~ReadLog();
  ReadLog(const ReadLog&) = delete;
  ReadLog& operator=(const ReadLog&) = delete;

  LogSocket socket;
  std::atomic<int> lines{0};     // read so far
  std::atomic<bool> end{false};  // told by the destructor, with an empty message

 private:
  std::thread reader;
};

}  // namespace fileindexd
