// SPDX-License-Identifier: GPL-2.0-or-later
// From the kernel's answer about one thing to a look: what all who look have in common.
#pragma once

#include <sys/stat.h>

#include "state/belonging.h"

namespace fileindexd {

// Since Linux 6.8; older headers lack it, older kernels ignore it.
constexpr unsigned UNIQUE_MOUNT_ID = 0x4000;
constexpr unsigned WANTED = STATX_BASIC_STATS | STATX_BTIME | STATX_MNT_ID | UNIQUE_MOUNT_ID;

// Since the epoch. What lies beyond 64 bits, in 2262 and in 1677, is the last one, or the first.
int64_t Nanoseconds(const statx_timestamp& time);

// False with errno ENOSYS on a kernel without mount ids.
bool HasMountId(const struct statx& st);

Thing ThingOfMode(unsigned mode);

// All but the verdict.
void Fill(const struct statx& st, Look& look);

// GONE only where the call says for certain that nothing is there.
Verdict VerdictOfError(int reason);

// Changes the verdict on what a pattern keeps out after all: only when a thing was seen it is known
// whether the patterns for directories count.
void JudgeByPatterns(const Settings& settings, const std::string& normal, Look& look);

}  // namespace fileindexd
