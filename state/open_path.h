// SPDX-License-Identifier: GPL-2.0-or-later
// Opening what lies in a share without following links inside it.
#pragma once

#include <string>

namespace fileindexd {

// An O_PATH descriptor of what normal path `path`, at or below normal path `root`, names. Links at
// or above the root are followed, none below it: the last component is opened as a link, one on the
// way ends with ELOOP. -1 with errno on failure. One system call where no link stands on the way.
int OpenInShare(const std::string& root, const std::string& path);

// The same in one call for each component, for hosts without openat2. Not safe against a directory
// being replaced on the way, but never follows a link below the root.
int OpenByComponents(const std::string& root, const std::string& path);

// The part of `path` below `root` without a leading slash; empty for the root itself.
std::string BelowRoot(const std::string& root, const std::string& path);

}  // namespace fileindexd
