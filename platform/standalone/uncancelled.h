// SPDX-License-Identifier: GPL-2.0-or-later
// Cancellation and libraries.
//
// A thread that is cancelled inside SQLite leaves its locks behind for ever. So every operation of
// this platform that enters a library runs with cancellation off, and tests for it as its last
// step, where no lock is held and nothing is half done.
#pragma once

#include <pthread.h>

namespace fileindexd {

// Cancellation is off for the length of a scope. Neither of the calls is a cancellation point.
class CancelOff {
 public:
  CancelOff() { pthread_setcancelstate(PTHREAD_CANCEL_DISABLE, &before); }
  CancelOff(const CancelOff&) = delete;
  CancelOff& operator=(const CancelOff&) = delete;
  ~CancelOff() { pthread_setcancelstate(before, nullptr); }

  int before = PTHREAD_CANCEL_ENABLE;
};

// Runs `operation` with cancellation off, then tests. Returns its result; does not return when a
// cancellation is pending.
template <typename Operation>
auto Uncancelled(Operation operation) {
  auto result = [&operation] {
    const CancelOff off;
    return operation();
  }();
  pthread_testcancel();
  return result;
}

}  // namespace fileindexd
