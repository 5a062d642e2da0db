// SPDX-License-Identifier: GPL-2.0-or-later
// Judging characters of UTF-8 text and numbers of fields, alike in the helper and in who receives
// from it.
#pragma once

#include <cstdint>
#include <string_view>

#include "base/content.h"
#include "base/utf8.h"

namespace fileindexd {

// Controls, spaces of every sort, and what no text holds: separates words, is none itself.
bool IsBlank(char32_t code);
// UTF-8 without blanks but the space and the line feed: what a ContentSink makes.
bool IsCleanText(std::string_view bytes);
// `text` up to `limit` bytes, ended before a character that would pass it.
std::string_view CutText(std::string_view text, size_t limit);

// A number that can be true of a file: dates of years with four digits but the epoch's very first
// second, which stands for "not known"; lengths and counts above nothing.
bool IsPlausible(ContentField field, int64_t number);

}  // namespace fileindexd
