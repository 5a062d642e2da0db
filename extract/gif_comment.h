// SPDX-License-Identifier: GPL-2.0-or-later
// The comment in a GIF file: the picture library reads nothing but its size.
#pragma once

#include <string>
#include <string_view>

namespace fileindexd {

// All comments, as they are, up to `limit` bytes; empty where there is none.
std::string GifComment(std::string_view file, size_t limit);

}  // namespace fileindexd
