// SPDX-License-Identifier: GPL-2.0-or-later
// Helps the daemon over what it cannot help itself over: every 15 s
//
//   - a queue file, or a drained copy without one, older than 10 s is touched, and so is the queue
//     of a share whose needs-reindex flag stands;
//   - a full share that has space again loses its no-space flag, and its queue is touched;
//   - a share whose lines stay although its queue was touched gets a Worker;
//   - a stored pause whose time has passed is ended.
//
// Talking to the daemon may take a minute, so all of it has a thread of its own.
#pragma once

#include <chrono>
#include <memory>
#include <string>

namespace fileindexd {

// Used by one thread.
class Keeper {
 public:
  explicit Keeper(std::chrono::milliseconds interval = std::chrono::seconds(15));
  ~Keeper();  // as Stop
  Keeper(const Keeper&) = delete;
  Keeper& operator=(const Keeper&) = delete;

  // False, with errno, when it cannot be started.
  bool Start();
  // Ends it, within a second: a daemon that does not answer is not waited for.
  void Stop();

  // The share came to be there (added, mounted): it gets a Worker if it has none.
  void Appeared(const std::string& share);

 private:
  struct Impl;
  std::unique_ptr<Impl> impl;
};

}  // namespace fileindexd
