// SPDX-License-Identifier: GPL-2.0-or-later
// Whether a database's log was damaged. SQLite reads it up to the first frame that is not sound,
// takes that for the end, and says nothing of what was committed behind it.
#pragma once

#include <sqlite3.h>

namespace fileindexd {

// True when commits lie behind what SQLite believes in: more than the one that a power cut can
// leave torn. Or when the log's header is no header, though frames follow. To be asked by the
// writer after something was read from the database. Costs a look at each frame that SQLite left
// out.
bool HasLostCommits(sqlite3* db);

}  // namespace fileindexd
