// SPDX-License-Identifier: GPL-2.0-or-later
// The sound copy beside the state database, and its use in the place of one that is damaged, gone,
// or lacks changes that the copy has. Nothing throws. Functions that fail set `error` to one line
// that names the file.
#pragma once

#include <string>

#include "base/scoped_fd.h"
#include "state/store_database.h"

namespace fileindexd {

enum class CopyLeft { GOOD, FAILED, DAMAGED };

// Leaves a copy of what is committed beside the database. It is checked before it replaces the one
// that is there, which stays where the result is not GOOD. DAMAGED: what was read is not sound.
CopyLeft LeaveStateCopy(const StateConnection& connection, std::string& error);
// The same, under the caller's lock on the state root.
CopyLeft LeaveStateCopy(const StateConnection& connection, const ScopedFd& root,
                        std::string& error);

// All that the connection sees, of one moment; empty where that cannot be read.
std::string RowsOf(const StateConnection& connection);

// BEHIND: the copy is missing, not sound, or lacks changes, and another is to be left. AHEAD: it
// has changes that the database has lost.
enum class CopyAge { LEVEL, BEHIND, AHEAD };

// SQLITE_OK, or what kept one of the two from being read.
int CompareWithCopy(const StateConnection& connection, CopyAge& age, std::string& error);

// Sets the database at `path` aside, if there is one, and puts the copy in its place; without a
// sound copy nothing is touched. On failure `error`, which says what is wrong, is added to.
bool PutCopyInPlace(const std::string& path, const ScopedFd& root, std::string& error);

}  // namespace fileindexd
