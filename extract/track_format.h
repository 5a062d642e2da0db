// SPDX-License-Identifier: GPL-2.0-or-later
// Which container of film or sound a file is.
#pragma once

#include "extract/format.h"

namespace fileindexd {

// The parser that libmediainfo has for the content, by its name there; null where it is none of
// ours. The library's own choice is not used: it also knows play lists and manifests, which name
// other files for it to open.
const char* TrackParserOf(const Document& document);

}  // namespace fileindexd
