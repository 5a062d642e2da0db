// SPDX-License-Identifier: GPL-2.0-or-later
// How much the machine's other work waits.
#pragma once

#include <string>

namespace fileindexd {

constexpr const char* PRESSURE_FOLDER = "/proc/pressure";

// The share of the last ten seconds in which something waited for the processor, the disk or
// memory, in percent: the highest of the three. 0 where the kernel does not tell.
double ReadPressure(const std::string& folder = PRESSURE_FOLDER);

}  // namespace fileindexd
