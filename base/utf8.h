// SPDX-License-Identifier: GPL-2.0-or-later
// Bytes that may be UTF-8.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

namespace fileindexd {

struct Utf8Character {
  char32_t code = 0;  // may be zero, which is a character like any other
  size_t length = 1;  // bytes, at least 1: of what is wrong, those that cannot begin another one
  bool is_wrong = false;  // the bytes are no UTF-8; `code` is 0 then
  bool is_cut = false;    // wrong only because the bytes end within it
};

// The first character of `bytes`, which are not empty. Overlong forms, surrogates and what lies
// above U+10FFFF are no UTF-8.
Utf8Character FirstCharacter(std::string_view bytes);

// The text with every byte that is not part of well-formed UTF-8 replaced by U+FFFD.
std::string ToUtf8(std::string_view bytes);
bool IsUtf8(std::string_view bytes);

// Where each character of a text that is UTF-8 begins, and the end.
std::vector<size_t> CharacterStarts(std::string_view text);

// Appends a character; what is none, such as half of a pair, becomes U+FFFD.
void AppendUtf8(char32_t code, std::string& text);

}  // namespace fileindexd
