// SPDX-License-Identifier: GPL-2.0-or-later
// Which endings of names tell a kind.
#pragma once

#include <span>
#include <string_view>

namespace fileindexd {

// Endings without the dot, lower case, no ending in two lists.
std::span<const std::string_view> DocumentEndings();
std::span<const std::string_view> AudioEndings();
std::span<const std::string_view> VideoEndings();
std::span<const std::string_view> PhotoEndings();

}  // namespace fileindexd
