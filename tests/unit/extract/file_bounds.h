// SPDX-License-Identifier: GPL-2.0-or-later
// What a damaged file may cost the test that has it read.
#pragma once

#include <gtest/gtest.h>
#include <sys/resource.h>

#include <algorithm>
#include <cstdlib>
#include <string_view>

#include "extract/doors.h"
#include "extract/sanitized.h"

namespace fileindexd {

// Far more than a reader takes, of processor time, and far less than a document has.
constexpr rlim_t SECONDS_OF_A_FILE = IS_SANITIZED ? 30 : 10;

inline void Limit(__rlimit_resource resource, rlim_t most) {
  rlimit limit = {};
  EXPECT_EQ(getrlimit(resource, &limit), 0);
  limit.rlim_cur = std::min(limit.rlim_max, most);
  EXPECT_EQ(setrlimit(resource, &limit), 0);
}

// As much as the helper has.
inline void LimitMemory() {
  if (!IS_SANITIZED) {
    Limit(RLIMIT_AS, ADDRESS_SPACE);
  }
}

// What goes on for longer ends the process.
inline void AllowSeconds() {
  rusage used = {};
  EXPECT_EQ(getrusage(RUSAGE_SELF, &used), 0);
  Limit(RLIMIT_CPU,
        static_cast<rlim_t>(used.ru_utime.tv_sec + used.ru_stime.tv_sec + 1) + SECONDS_OF_A_FILE);
}

// How many damages of a file are tried.
inline unsigned DamageSeeds() {
  // NOLINTNEXTLINE(concurrency-mt-unsafe): nothing else runs
  const char* scale = std::getenv("FILEINDEXD_TEST_SCALE");
  return scale != nullptr && std::string_view(scale) == "long" ? 1000 : 20;
}

}  // namespace fileindexd
