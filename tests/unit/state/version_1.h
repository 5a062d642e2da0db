// SPDX-License-Identifier: GPL-2.0-or-later
// A state database as the first version made it, with something in each table.
#pragma once

namespace fileindexd {

constexpr const char* VERSION_1 =
    "CREATE TABLE share(name BLOB PRIMARY KEY, path BLOB NOT NULL UNIQUE,"
    " filesystem TEXT NOT NULL) WITHOUT ROWID;"
    "CREATE TABLE folder(path BLOB PRIMARY KEY, share BLOB NOT NULL, document INT NOT NULL,"
    " audio INT NOT NULL, video INT NOT NULL, photo INT NOT NULL) WITHOUT ROWID;"
    "CREATE TABLE status(share BLOB PRIMARY KEY, needs_reindex INT NOT NULL,"
    " reindex_begun INT NOT NULL, no_space INT NOT NULL, missing INT NOT NULL,"
    " rebuild_wanted INT NOT NULL) WITHOUT ROWID;"
    "CREATE TABLE number(name TEXT PRIMARY KEY, value INT NOT NULL) WITHOUT ROWID;"
    "CREATE TABLE marker(name BLOB PRIMARY KEY) WITHOUT ROWID;"
    "INSERT INTO share VALUES(CAST('a' AS BLOB), CAST('/v/a' AS BLOB), 'fs');"
    "INSERT INTO folder VALUES(CAST('/v/a/f' AS BLOB), CAST('a' AS BLOB), 1, 0, 0, 1);"
    "INSERT INTO status VALUES(CAST('a' AS BLOB), 1, 0, 0, 1, 0);"
    "INSERT INTO number VALUES('pause', 77);"
    "INSERT INTO marker VALUES(CAST('m' AS BLOB));"
    "PRAGMA user_version=1";

}  // namespace fileindexd
