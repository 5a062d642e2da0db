// SPDX-License-Identifier: GPL-2.0-or-later
// One closed child process: started clean, watched by a descriptor, killed without ceremony.
#pragma once

#include <sys/types.h>

#include <chrono>
#include <optional>
#include <string>
#include <vector>

#include "base/scoped_fd.h"

namespace fileindexd {

// Where a helper finds its socket.
constexpr int HELPER_SOCKET = 3;

struct Child {
  pid_t pid = -1;   // not reaped yet; -1: none
  ScopedFd pid_fd;  // readable once it has ended

  bool IsThere() const { return pid > 0; }
  void Swap(Child& other) {
    std::swap(pid, other.pid);
    pid_fd.Swap(other.pid_fd);
  }
};

// What the child finds as 0, 1 and HELPER_SOCKET; -1: /dev/null, and no socket.
struct ChildFiles {
  int input = -1;
  int output = -1;
  int socket = -1;
};

// Starts `program` in a session of its own, in the root folder, with default signals, an empty
// signal mask, a fixed environment, and no descriptor but those. Standard error is /dev/null, but
// for sanitizers' sake the caller's in such builds. The last argument that it gets is our process
// number (see Doors::parent). False, and `error` then says why, on failure.
bool SpawnChild(const std::string& program, std::vector<std::string> arguments,
                const ChildFiles& files, pid_t& pid, std::string& error);
// What was started so, from any thread. Where it cannot be watched it is killed, and false.
bool WatchChild(pid_t pid, const std::string& program, Child& child, std::string& error);

// The status that waitpid tells if the child has ended; it is reaped then, and `child` is none. A
// child that somebody else has reaped counts as ended with 0.
std::optional<int> Reap(Child& child);
void Kill(const Child& child);

// Of a child that is there, since its start; 0 where the kernel does not tell.
std::chrono::nanoseconds ProcessorTime(const Child& child);

// "SIGSEGV", "code 3".
std::string StatusText(int status);
// Ended by a signal that no fault of a program's own raises.
bool IsKilledFromOutside(int status);

}  // namespace fileindexd
