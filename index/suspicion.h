// SPDX-License-Identifier: GPL-2.0-or-later
// A reader can meet damage in pages that the writer does not touch for months. It leaves a note in
// the folder of the entries or of the contents, and whoever next opens the database for writing
// looks at all of it, sets it aside if it is damaged, and otherwise takes the note away. Nothing
// throws.
#pragma once

#include <sqlite3.h>

#include <string>

#include "index/database.h"

namespace fileindexd {

constexpr const char* SUSPICION_NOTE = "suspected";  // a file in the database's folder

// Called with what a read of the share's entries ended with. Of damage it leaves a note. Then,
// where the disk failed, which may be a log that was taken away, and where there is no database, it
// wakes the share's Worker, which opens the database anew: once a minute at most, of damage until
// that was done, and of all else from this process. By any thread.
void TellWriter(const std::string& share_name, IndexError error);

// The same of contents, of damage alone: the content service watches for the note.
void TellContentsWriter(const std::string& share_name, IndexError error);

// Opens the share's entries, and tells of what keeps them from being read, but for a database that
// is not there: nothing may have been indexed yet. NONE, or why not.
IndexError OpenAndTell(IndexDatabase& entries, const std::string& share_name);

// Looks at the whole database if there is a note: NONE, DAMAGED, or what kept it from being read.
IndexError CheckSuspected(sqlite3* db, const std::string& index_path);

}  // namespace fileindexd
