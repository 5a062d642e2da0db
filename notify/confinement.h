// SPDX-License-Identifier: GPL-2.0-or-later
// What the service gives up before it reads its first event.
#pragma once

#include <string>

namespace fileindexd {

// Keeps CAP_SYS_ADMIN (marks, private mounts) and CAP_DAC_READ_SEARCH (handles, looks), and
// CAP_DAC_OVERRIDE only where the state folder belongs to another user; drops the rest from all
// sets, the bounding set included, for the whole process and all it might start; no new privileges.
// Writing is left to the state folder, /run and the terminal alone (Landlock); where the kernel has
// none, `missing` then says so and all else is done. Call it while the process has one thread.
// False, and `error` then says why, on failure.
bool Confine(std::string& missing, std::string& error);

}  // namespace fileindexd
