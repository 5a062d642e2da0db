// SPDX-License-Identifier: GPL-2.0-or-later
// One content service at a time.
//
// The lock decides: it is held for the life of the process, so of two simultaneous starts one goes
// on, and a pid file left by a kill stops nobody. The pid file tells others whom to ask to end. The
// lock is a file of its own, because writing the pid file replaces it; it is never removed, or two
// processes could each hold one.
#pragma once

#include <string>

#include "base/scoped_fd.h"

namespace fileindexd {

constexpr const char* SERVICE_PROGRAM = "talocontentsearchd";
constexpr const char* SERVICE_PID_FILE = "/var/run/talocontentsearchd.pid";
constexpr const char* SERVICE_LOCK_FILE = "/var/run/talocontentsearchd.lock";

class Instance {
 public:
  Instance() = default;
  Instance(const Instance&) = delete;
  Instance& operator=(const Instance&) = delete;
  ~Instance();  // removes the pid file if this process wrote it, then lets go of the lock

  // False, and `error` then says why, when another instance runs or the lock cannot be had.
  bool Claim(std::string& error);
  // Tells the world that the service runs. After Claim.
  bool Announce(std::string& error);

  ScopedFd lock;
  bool announced = false;
};

}  // namespace fileindexd
