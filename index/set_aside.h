// SPDX-License-Identifier: GPL-2.0-or-later
// What becomes of an index's folder that cannot be used.
#pragma once

#include <string>

namespace fileindexd {

// Why an index that holds something cannot be used.
enum class IndexFlaw { DAMAGED, OTHER_VERSION, OTHER_PROGRAM };

// Moves such an index out of the way, to INDEX.damaged, and says so in the system log. One copy is
// kept; one that is younger than an hour stays, and the index is removed instead. False, with
// errno, when it is still there.
bool SetAside(const std::string& index_path, IndexFlaw flaw, const char* reason);

// Makes INDEX an empty folder, mode 0700, whatever stands there. False with errno.
bool MakeEmptyIndex(const std::string& index_path);

}  // namespace fileindexd
