// SPDX-License-Identifier: GPL-2.0-or-later
// Which endings of names tell a kind.
#pragma once

#include <string_view>

namespace fileindexd {

// Endings without the dot, lower case, a blank between two; no ending in two lists.
std::string_view DocumentEndings();
std::string_view AudioEndings();
std::string_view VideoEndings();
std::string_view PhotoEndings();

}  // namespace fileindexd
