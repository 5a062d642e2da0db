// SPDX-License-Identifier: GPL-2.0-or-later
// Holders of a pthread mutex. Unlocking is no cancellation point, so both may stand on the stack
// of a thread that is cancelled.
#pragma once

#include <pthread.h>

namespace fileindexd {

// Locks for the length of a scope.
class MutexGuard {
 public:
  explicit MutexGuard(pthread_mutex_t* locked) : mutex(locked) { pthread_mutex_lock(mutex); }
  MutexGuard(const MutexGuard&) = delete;
  MutexGuard& operator=(const MutexGuard&) = delete;
  ~MutexGuard() { pthread_mutex_unlock(mutex); }

  pthread_mutex_t* mutex;
};

// Unlocks, at the end of a scope, a mutex that the caller has locked.
class MutexRelease {
 public:
  explicit MutexRelease(pthread_mutex_t* held) : mutex(held) {}
  MutexRelease(const MutexRelease&) = delete;
  MutexRelease& operator=(const MutexRelease&) = delete;
  ~MutexRelease() { pthread_mutex_unlock(mutex); }

  pthread_mutex_t* mutex;
};

}  // namespace fileindexd
