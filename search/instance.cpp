// SPDX-License-Identifier: GPL-2.0-or-later
#include "search/instance.h"

#include <fcntl.h>
#include <sys/file.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

#include "state/pid_file.h"

namespace fileindexd {

Instance::~Instance() {
  if (announced) {
    (void)unlink(SERVICE_PID_FILE);  // whoever starts next replaces it anyway
  }
}

bool Instance::Claim(std::string& error) {
  ScopedFd opened(open(SERVICE_LOCK_FILE, O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW, 0600));
  if (opened.fd < 0) {
    error = std::string(SERVICE_LOCK_FILE) + ": " + strerror(errno);
    return false;
  }

  if (flock(opened.fd, LOCK_EX | LOCK_NB) != 0) {
    error = errno == EWOULDBLOCK ? "another instance runs"
                                 : std::string(SERVICE_LOCK_FILE) + ": " + strerror(errno);
    return false;
  }

  // Somebody may have removed the lock file from under a running instance.
  const pid_t alive = AliveByPidFile(SERVICE_PID_FILE, SERVICE_PROGRAM);
  if (alive > 0 && alive != getpid()) {
    error = "another instance runs, pid " + std::to_string(alive);
    return false;
  }

  lock.Swap(opened);
  return true;
}

bool Instance::Announce(std::string& error) {
  if (!WritePidFile(SERVICE_PID_FILE)) {
    error = std::string(SERVICE_PID_FILE) + ": " + strerror(errno);
    return false;
  }

  announced = true;
  return true;
}

}  // namespace fileindexd
