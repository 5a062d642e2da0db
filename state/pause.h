// SPDX-License-Identifier: GPL-2.0-or-later
// What a stored pause means.
#pragma once

#include <cstdint>

namespace fileindexd {

// `resume_time` as StateStore::GetPause tells it; at that second the pause is over.
inline bool IsPaused(int64_t resume_time, int64_t now) {
  return resume_time == 0 || resume_time > now;
}

}  // namespace fileindexd
