// SPDX-License-Identifier: GPL-2.0-or-later
// The command line: which commands there are, and what they take.
#pragma once

#include <string>
#include <vector>

#include "ctl/commands.h"

namespace fileindexd {

// Reads `given`, the arguments after the program's name. The command to run; or null when there is
// none, because help was asked for, or because the line is wrong: then `code` is the exit code, and
// the help or the error line is written.
Command ParseCommandLine(const std::vector<std::string>& given, Arguments& arguments, int& code);

}  // namespace fileindexd
