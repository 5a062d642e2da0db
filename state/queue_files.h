// SPDX-License-Identifier: GPL-2.0-or-later
// A share's queue file and its drained copy, for whoever only reads them.
#pragma once

#include <sys/types.h>

#include <functional>
#include <string>
#include <string_view>

#include "base/scoped_fd.h"

namespace fileindexd {

// Each is -1 where there is no such file, or no regular one.
struct QueueFiles {
  ScopedFd queue;
  ScopedFd drained;
};

// Opens both, for reading, without a lock. A queue that is moved aside meanwhile is met as the
// drained copy alone.
void OpenQueueFiles(const std::string& share_name, QueueFiles& files);

// Calls `visit` with each line from byte `offset` on, without its newline, in the end with what
// stands behind the last newline: it may be half a line, so where it begins is returned. What
// cannot be read is passed over. Nothing is read of a file that is -1.
off_t ForEachQueueLine(const ScopedFd& file, const std::function<void(std::string_view)>& visit,
                       off_t offset = 0);

}  // namespace fileindexd
