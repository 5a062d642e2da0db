// SPDX-License-Identifier: GPL-2.0-or-later
// Gives the room of removed entries back to the disk.
//
// A removal leaves free pages, and in the full-text tables not even these: there it is one more
// record for each word, which cancels the first one, until both are merged. So once a quarter of
// the entries has been removed, the full-text tables are merged, what has become free is cut off
// the file's end, and the log is copied back, which cuts the file. `removed` in the table `meta`
// counts the removals since this was last done, so it goes on after whatever interrupts it.
//
// Pages of entries that are only half empty stay: new entries fill them.
//
// The cost is in proportion to the number of removals that brought it about.
#pragma once

#include <sqlite3.h>

#include <functional>

namespace fileindexd {

enum class Shrinking {
  DONE = 0,        // or nothing to do: two numbers are read then
  UNFINISHED = 1,  // one call's share of the work is done; the next call goes on
  FAILED = 2,      // nothing is half done; a later call may succeed
};

// The caller is the database's one writer and has no transaction open. Works in transactions of
// some hundred pages, at most some dozens of them. Between two it calls `between`, which may
// unwind.
Shrinking ShrinkDatabase(sqlite3* db, const std::function<void()>& between);

}  // namespace fileindexd
