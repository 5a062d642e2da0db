// SPDX-License-Identifier: GPL-2.0-or-later
// Kinds of entries, told by the name's ending.
#pragma once

#include <optional>
#include <string_view>

#include "base/kind.h"
#include "state/settings.h"

namespace fileindexd {

// Kind of a regular file, by the ending of its name, letter case ignored. OTHER where the ending
// tells nothing.
Kind KindOfName(std::string_view name);

// "document", "audio", "video", "photo", "other", "folder".
const char* KindText(Kind kind);
std::optional<Kind> KindFromText(std::string_view text);

// Whether the content of a regular file of that kind is wanted under these flags. What is OTHER may
// turn out to be anything, and is wanted if any kind is.
bool IsContentWanted(Kind kind, const ContentFlags& flags);

}  // namespace fileindexd
