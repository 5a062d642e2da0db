// SPDX-License-Identifier: GPL-2.0-or-later
// How the pool starts fileindex-extract, and how that ends.
#pragma once

namespace fileindexd {

// fileindex-extract --serve PARENT: jobs from HELPER_SOCKET until it is closed.
constexpr const char* SERVE_MODE = "--serve";
// fileindex-extract --convert NAME PARENT: becomes that converter.
constexpr const char* CONVERT_MODE = "--convert";

constexpr int EXIT_USAGE = 2;
constexpr int EXIT_MEMORY = 3;   // a file needs more memory than is allowed
constexpr int EXIT_DOORS = 4;    // the doors cannot be closed
constexpr int EXIT_PROGRAM = 5;  // the converter is not there

}  // namespace fileindexd
