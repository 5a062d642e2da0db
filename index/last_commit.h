// SPDX-License-Identifier: GPL-2.0-or-later
// Which commit of a database was its last, in a file beside it: FILE-last.
//
// A log that is removed, or loses its end where a frame ends, takes commits with it, and what it
// leaves is a sound database of an earlier moment. Nothing within it tells that.
#pragma once

#include <cstdint>
#include <string>

namespace fileindexd {

// To be told once a commit is on the disk, with a number that grows with each one. The note itself
// is not synced: after a power failure it may be older than the database, never newer. What keeps
// it from being written is passed over, for the same reason.
void NoteLastCommit(const std::string& file, int64_t number);

// True when the note names a later commit than `number`, the last one that the database holds.
bool LacksNotedCommit(const std::string& file, int64_t number);

}  // namespace fileindexd
