// SPDX-License-Identifier: GPL-2.0-or-later
// Bytes that may be UTF-8.
#pragma once

#include <string>
#include <string_view>

namespace fileindexd {

// The text with every byte that is not part of well-formed UTF-8 replaced by U+FFFD.
std::string ToUtf8(std::string_view bytes);
bool IsUtf8(std::string_view bytes);

}  // namespace fileindexd
