// SPDX-License-Identifier: GPL-2.0-or-later
// Paths that the file system does not answer for, which root seldom meets otherwise.
#pragma once

#include <string>

namespace fileindexd {

// Reading directory `path` fails with `code` from now on.
void BreakReading(const std::string& path, int code);
// The same for each look at `path` itself.
void BreakLooks(const std::string& path, int code);
void MendAll();

}  // namespace fileindexd
