// SPDX-License-Identifier: GPL-2.0-or-later
// A queue file in the hands of its writers: opened, locked, and written to as a whole or not at
// all.
#pragma once

#include <sys/stat.h>

#include <chrono>
#include <cstdint>
#include <string>
#include <vector>

#include "base/scoped_fd.h"

namespace fileindexd {

// "cannot `what` `path`: ", and why, from errno.
std::string QueueReason(const char* what, const std::string& path);

// Opens the file for reading and appending, and creates it where it is missing. False, and `error`
// then tells, on failure.
bool OpenQueue(const std::string& path, ScopedFd& queue, std::string& error);

enum class QueueLock { TAKEN, HELD, FAILED };

// Takes the lock of the open file, without waiting. HELD: another program has it.
QueueLock TakeQueueLock(const ScopedFd& queue, const std::string& path, std::string& error);

// Opens the file that has the name, waits at most `wait` for its lock, and starts over when it was
// moved away meanwhile. An open `queue` is used first. TAKEN: `held` is what the file is. HELD:
// `error` tells, and `queue` may be open, without the lock: closing it would tell the daemon of
// lines that are not there, so whoever comes again soon brings it along. FAILED: `error` tells.
QueueLock LockQueue(const std::string& path, std::chrono::milliseconds wait, ScopedFd& queue,
                    struct stat& held, std::string& error);

// Each line with its newline. False, and `error` then tells, when one of them would be two.
bool JoinLines(const std::vector<std::string>& lines, std::string& text, std::string& error);

// Appends joined lines to the locked file of `size` bytes, in one write, or leaves it as it was.
// Half a line at its end is ended first.
bool WriteLines(const ScopedFd& queue, const std::string& path, std::string text, off_t size,
                std::string& error);

// Lines from byte `offset` on; `open_end` when the last has no newline, which counts as well.
uint64_t CountLines(const ScopedFd& file, off_t offset, bool& open_end);

}  // namespace fileindexd
