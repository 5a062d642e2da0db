// SPDX-License-Identifier: GPL-2.0-or-later
// The system calls that are left to a helper.
#pragma once

#include <string>

namespace fileindexd {

struct SystemCalls {
  bool can_open_files = false;  // for reading; where it lies is for others to judge
  bool can_execute = false;
};

// All others fail with EPERM from now on: libraries that only tried something go on. For good.
bool LimitSystemCalls(const SystemCalls& calls, std::string& error);

}  // namespace fileindexd
