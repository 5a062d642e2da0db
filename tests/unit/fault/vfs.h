// SPDX-License-Identifier: GPL-2.0-or-later
// A file layer for SQLite over its own one, whose calls fail as planned.
#pragma once

namespace fileindexd::fault {

// Makes it the default. Databases that are open already keep theirs.
void InstallVfs();

}  // namespace fileindexd::fault
