// SPDX-License-Identifier: GPL-2.0-or-later
// Looks that take a time of the test's choosing, on a clock that moves with nothing else.
#pragma once

#include <cstdint>

namespace fileindexd {

// While it lives, the coarse monotonic clock stands still but for each statx, which moves it on.
class SlowLooks {
 public:
  explicit SlowLooks(int64_t look_ns);
  SlowLooks(const SlowLooks&) = delete;
  SlowLooks& operator=(const SlowLooks&) = delete;
  ~SlowLooks();

  static int Count();  // since the last one was made
};

}  // namespace fileindexd
