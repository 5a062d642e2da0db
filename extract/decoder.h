// SPDX-License-Identifier: GPL-2.0-or-later
// A text file of any charset and size, as UTF-8, piece by piece.
#pragma once

#include <functional>
#include <string>
#include <string_view>

#include "extract/format.h"

namespace fileindexd {

// Takes UTF-8 (not checked: bytes of a file that is almost UTF-8 come as they are); characters may
// be cut in two. False: no more is wanted.
using TextTaker = std::function<bool(std::string_view)>;
// Names the charset that the file's first bytes declare; empty: none.
using CharsetFinder = std::function<std::string(std::string_view)>;

// The charset is what a byte order mark tells, then what the file declares, then UTF-8 if it could
// be that, then what looks most like it. False, and `why` then says so, for what is no text or
// cannot be read. Where text turns into something else, as in a script with an archive behind it,
// the text ends.
bool DecodeText(const Document& document, const CharsetFinder& declared, const TextTaker& take,
                std::string& why);

// Whether ToUtf8 knows it.
bool IsKnownCharset(const std::string& charset);
// From that charset; as they are where it is not known. What is wrong becomes a blank.
std::string ToUtf8(std::string_view bytes, const std::string& charset);

}  // namespace fileindexd
