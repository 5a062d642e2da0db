// SPDX-License-Identifier: GPL-2.0-or-later
// The full-text extension's own interface.
#pragma once

#include <sqlite3.h>

namespace fileindexd {

// Null where the extension is missing, or memory ran out. Belongs to the connection.
fts5_api* Fts5Of(sqlite3* db);

}  // namespace fileindexd
