// SPDX-License-Identifier: GPL-2.0-or-later
// What a running daemon is told of by the kernel.
#pragma once

#include <sys/types.h>

#include <string>

namespace fileindexd {

// True when process `pid` has no inotify watch on what stands at `path` now: the folder that it
// watched was removed, or replaced. False too when that cannot be told.
bool IsUnwatched(pid_t pid, const std::string& path);

}  // namespace fileindexd
