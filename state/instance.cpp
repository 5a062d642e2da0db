// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/instance.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/file.h>
#include <unistd.h>

#include <cerrno>
#include <system_error>
#include <utility>

#include "state/pid_file.h"

namespace fileindexd {

namespace {

constexpr int LOCK_WAIT_MS = 2000;
constexpr int LOCK_NAP_MS = 5;

// 0, or what was wrong.
int Lock(int fd) {
  return flock(fd, LOCK_EX | LOCK_NB) == 0 ? 0 : errno;
}

}  // namespace

Instance::Instance(std::string name, std::string pids, std::string locks)
    : program(std::move(name)), pid_file(std::move(pids)), lock_file(std::move(locks)) {}

Instance::~Instance() {
  if (announced) {
    (void)unlink(pid_file.c_str());  // whoever starts next replaces it anyway
  }
}

Claimed Instance::Claim(std::string& error) {
  ScopedFd opened(open(lock_file.c_str(), O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW, 0600));
  int failure = opened.fd < 0 ? errno : Lock(opened.fd);
  // One that was killed can leave the lock, for a moment, to a child that it was about to make a
  // helper of; and one that starts has not announced itself yet.
  for (int waited_ms = 0;
       failure == EWOULDBLOCK && waited_ms < LOCK_WAIT_MS && AliveByPidFile(pid_file, program) <= 0;
       waited_ms += LOCK_NAP_MS) {
    (void)poll(nullptr, 0, LOCK_NAP_MS);
    failure = Lock(opened.fd);
  }
  if (failure == EWOULDBLOCK) {
    error = "another instance runs";
    return Claimed::BY_ANOTHER;
  }

  // Somebody may have removed the lock file from under a running instance; and another user, who
  // cannot have the lock, may read who runs.
  const pid_t alive = AliveByPidFile(pid_file, program);
  if (alive > 0 && alive != getpid()) {
    error = "another instance runs, pid " + std::to_string(alive);
    return Claimed::BY_ANOTHER;
  }

  if (failure != 0) {
    error = lock_file + ": " + std::generic_category().message(failure);
    errno = failure;
    return Claimed::BY_NOBODY;
  }
  lock.Swap(opened);
  return Claimed::BY_US;
}

bool Instance::Announce(std::string& error) {
  if (!WritePidFile(pid_file)) {
    error = pid_file + ": " + std::generic_category().message(errno);
    return false;
  }

  announced = true;
  return true;
}

}  // namespace fileindexd
