// SPDX-License-Identifier: GPL-2.0-or-later
// Which commit of an index was its last, in a file beside the database.
//
//   INDEX/last-commit    number LF        number: 19 decimal digits
//
// A log that is removed, or loses its end where a frame ends, takes commits with it, and what it
// leaves is a sound database of an earlier moment. Nothing within it tells that. The file's name is
// not the database's with an ending: it stays where somebody removes what begins like that.
#pragma once

#include <cstdint>
#include <string>

namespace fileindexd {

// To be told once a commit is on the disk, with a number that grows with each one. The note itself
// is not synced: after a power failure it may be older than the database, never newer. What keeps
// it from being written is passed over, for the same reason.
void NoteLastCommit(const std::string& index_path, int64_t number);

// The number that was noted last; 0: none. To be asked for before the database is: a commit that
// comes between is then newer than its note.
int64_t NotedCommit(const std::string& index_path);

}  // namespace fileindexd
