// SPDX-License-Identifier: GPL-2.0-or-later
// The parser of pages, for markup that is none.
#pragma once

#include <string>
#include <string_view>

#include "extract/format.h"

namespace fileindexd {

// Reads XML as ReadHtml reads pages: whatever is wrong with it, the words behind are found. Names
// of elements come to `is_hidden` in lower case, prefix and all; nobody reads what stands in those.
bool ReadXmlAsHtml(const Document& document, bool (*is_hidden)(std::string_view element),
                   ContentSink& sink, std::string& why);

}  // namespace fileindexd
