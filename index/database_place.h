// SPDX-License-Identifier: GPL-2.0-or-later
// What stands where a database is expected. Nothing is opened for it.
#pragma once

#include <string>

#include "index/database.h"

namespace fileindexd {

// NONE when a regular file stands where the database should be, and nothing but files beside it.
IndexError FindFile(const std::string& index_path, const std::string& file);

// Whether what stands in a database's place, and is none, holds something all the same: a file in
// that of its folder, a folder with something in it, a log beside an empty file.
bool HoldsSomething(const std::string& index_path, const std::string& file);

}  // namespace fileindexd
