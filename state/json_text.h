// SPDX-License-Identifier: GPL-2.0-or-later
// JSON strings, as all who write JSON lines write them.
#pragma once

#include <string>
#include <string_view>

namespace fileindexd {

// The bytes as a JSON string, quotes included. Control characters are escaped, so that the result
// is always on one line; bytes that are not UTF-8 stay as they are (see ToUtf8 in layout.h for
// output that others parse strictly).
std::string JsonText(std::string_view bytes);

}  // namespace fileindexd
