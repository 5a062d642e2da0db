// SPDX-License-Identifier: GPL-2.0-or-later
// Definitions that the program's libraries meet in place of the C library's own.
#include "tests/unit/state/slow_looks.h"

#include <dlfcn.h>
#include <sys/stat.h>

#include <atomic>
#include <ctime>

namespace fileindexd {

namespace {

constexpr int64_t SECOND_NS = 1'000'000'000;

std::atomic<int64_t> look_time = 0;  // nanoseconds; 0: as it is
std::atomic<int64_t> clock_time = 0;
std::atomic<int64_t> ahead = 0;  // nanoseconds by which the clock was moved on until now
std::atomic<int> looks = 0;

template <typename Function>
Function* Hidden(const char* name, Function* /*kind*/) {
  return reinterpret_cast<Function*>(dlsym(RTLD_NEXT, name));
}

int64_t Now() {
  timespec now = {};
  clock_gettime(CLOCK_MONOTONIC_COARSE, &now);
  return static_cast<int64_t>(now.tv_sec) * SECOND_NS + now.tv_nsec;
}

}  // namespace

SlowLooks::SlowLooks(int64_t look_ns) {
  clock_time = Now();
  looks = 0;
  look_time = look_ns;
}

SlowLooks::~SlowLooks() {
  const int64_t reached = clock_time;
  look_time = 0;
  const int64_t now = Now();
  ahead += reached > now ? reached - now : 0;  // it never goes back
}

int SlowLooks::Count() {
  return looks;
}

}  // namespace fileindexd

extern "C" {

int clock_gettime(clockid_t clock, timespec* now) noexcept {
  static auto* const hidden = fileindexd::Hidden("clock_gettime", clock_gettime);
  const int result = hidden(clock, now);
  if (clock != CLOCK_MONOTONIC_COARSE || result != 0) {
    return result;
  }
  const int64_t real = static_cast<int64_t>(now->tv_sec) * fileindexd::SECOND_NS + now->tv_nsec;
  const int64_t told =
      fileindexd::look_time != 0 ? fileindexd::clock_time.load() : real + fileindexd::ahead;
  now->tv_sec = static_cast<time_t>(told / fileindexd::SECOND_NS);
  now->tv_nsec = static_cast<long>(told % fileindexd::SECOND_NS);
  return 0;
}

int statx(int folder, const char* path, int flags, unsigned wanted, struct statx* st) noexcept {
  static auto* const hidden = fileindexd::Hidden("statx", statx);
  fileindexd::clock_time += fileindexd::look_time;
  ++fileindexd::looks;
  return hidden(folder, path, flags, wanted, st);
}

}  // extern "C"
