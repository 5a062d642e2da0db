// SPDX-License-Identifier: GPL-2.0-or-later
// Has the real helper read a file, behind each sort of walls.
#pragma once

#include <string>

namespace fileindexd {

// What it finds is what is found in the open. Only without any walls the formats are left out whose
// libraries or programs need files.
void ExpectSameBehindDoors(const std::string& name, const std::string& bytes);

}  // namespace fileindexd
