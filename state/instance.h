// SPDX-License-Identifier: GPL-2.0-or-later
// One process of a service at a time.
//
// The lock decides: it is held for the life of the process, so of two simultaneous starts one goes
// on, and a pid file left by a kill stops nobody. The pid file tells others whom to ask to end. The
// lock is a file of its own, because writing the pid file replaces it; it is never removed, or two
// processes could each hold one.
#pragma once

#include <string>

#include "base/scoped_fd.h"

namespace fileindexd {

enum class Claimed {
  BY_US,
  BY_ANOTHER,
  BY_NOBODY,  // the lock cannot be had, and nobody else is known to run
};

class Instance {
 public:
  // `program` is the name of the service's executable.
  Instance(std::string program, std::string pid_file, std::string lock_file);
  Instance(const Instance&) = delete;
  Instance& operator=(const Instance&) = delete;
  ~Instance();  // removes the pid file if this process wrote it, then lets go of the lock

  // `error` says why it is not ours; errno of a lock that cannot be had is left as it was.
  Claimed Claim(std::string& error);
  // Tells the world that the service runs. After Claim.
  bool Announce(std::string& error);

  const std::string program;
  const std::string pid_file;
  const std::string lock_file;
  ScopedFd lock;
  bool announced = false;
};

}  // namespace fileindexd
