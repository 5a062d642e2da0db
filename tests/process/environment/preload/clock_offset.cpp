// SPDX-License-Identifier: GPL-2.0-or-later
// A wall clock that the test sets: so many seconds are added to the machine's as the mapped file
// says. What waits for a time of day waits for this clock's. The steady clocks are not touched.
#include <pthread.h>
#include <sys/time.h>

#include <atomic>
#include <cstdint>
#include <ctime>

#include "tests/process/environment/preload/next.h"

namespace {

struct Page {
  std::atomic<int64_t> offset;  // seconds
};

constexpr long LOOK_NS = 10'000'000;  // between two looks at a clock that may be set meanwhile
constexpr long SECOND_NS = 1'000'000'000;

Page* page = nullptr;

[[gnu::constructor]] void MapClock() {
  page = preload::MapPage<Page>("CLOCK_OFFSET");
}

int64_t Offset() {
  return page == nullptr ? 0 : page->offset.load();
}

int NextGetTime(clockid_t clock, timespec* now) {
  static auto* const next = preload::Next("clock_gettime", clock_gettime);
  return next(clock, now);
}

bool HasCome(const timespec& until) {
  timespec now = {};
  clock_gettime(CLOCK_REALTIME, &now);
  return now.tv_sec > until.tv_sec || (now.tv_sec == until.tv_sec && now.tv_nsec >= until.tv_nsec);
}

timespec NextLook() {
  timespec look = {};
  NextGetTime(CLOCK_MONOTONIC, &look);
  look.tv_nsec += LOOK_NS;
  if (look.tv_nsec >= SECOND_NS) {
    look.tv_nsec -= SECOND_NS;
    ++look.tv_sec;
  }
  return look;
}

// Waits with `wait`, which gets a time of the steady clock, until the wall clock's time has come.
template <typename Wait>
int WaitUntil(const timespec& until, Wait wait) {
  for (;;) {
    const timespec look = NextLook();
    const int result = wait(look);
    if (result != ETIMEDOUT || HasCome(until)) {
      return result;
    }
  }
}

}  // namespace

extern "C" {

int clock_gettime(clockid_t clock, timespec* now) noexcept {
  const int result = NextGetTime(clock, now);
  if (result == 0 && (clock == CLOCK_REALTIME || clock == CLOCK_REALTIME_COARSE)) {
    now->tv_sec += Offset();
  }
  return result;
}

time_t time(time_t* stored) noexcept {
  timespec now = {};
  clock_gettime(CLOCK_REALTIME_COARSE, &now);
  if (stored != nullptr) {
    *stored = now.tv_sec;
  }
  return now.tv_sec;
}

int gettimeofday(timeval* stored, void* /*zone*/) noexcept {
  timespec now = {};
  clock_gettime(CLOCK_REALTIME, &now);
  *stored = {now.tv_sec, now.tv_nsec / 1000};
  return 0;
}

int pthread_timedjoin_np(pthread_t thread, void** result, const timespec* until) {
  return WaitUntil(*until, [thread, result](const timespec& look) {
    return pthread_clockjoin_np(thread, result, CLOCK_MONOTONIC, &look);
  });
}

int pthread_mutex_timedlock(pthread_mutex_t* mutex, const timespec* until) noexcept {
  return WaitUntil(*until, [mutex](const timespec& look) {
    return pthread_mutex_clocklock(mutex, CLOCK_MONOTONIC, &look);
  });
}

}  // extern "C"
