// SPDX-License-Identifier: GPL-2.0-or-later
// The sound copy beside the state database, and its use in the place of a damaged one. Nothing
// throws. Functions that fail set `error` to one line that names the file.
#pragma once

#include <string>

#include "base/scoped_fd.h"
#include "state/store_database.h"

namespace fileindexd {

// Leaves a copy of what is committed beside the database. It is checked before it replaces the one
// that is there. False on failure, and that one stays.
bool LeaveStateCopy(const StateConnection& connection, std::string& error);

// Whether a sound copy has counted more changes than the open database: what the log held is gone,
// or an older database was put there. Where that came below a log that has the last change, both
// have counted as many, and hold something else. A copy that is damaged has nothing to say; one
// that cannot be read now may have. SQLITE_OK, or what kept one of the two from being read.
int LacksChangesOfCopy(const StateConnection& connection, bool& lacks, std::string& error);

// Sets the database aside and puts the copy in its place, under the lock `root`. Without a sound
// copy nothing is touched. On failure `error`, which says what is wrong, is added to.
bool PutCopyInPlace(const std::string& path, const ScopedFd& root, std::string& error);

}  // namespace fileindexd
