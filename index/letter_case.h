// SPDX-License-Identifier: GPL-2.0-or-later
// Names and endings in which capital letters of ASCII do not count. The locale has no say.
#pragma once

#include <algorithm>
#include <string_view>

namespace fileindexd {

// Of a letter of ASCII; all else stays.
inline char SmallLetter(char c) {
  return c >= 'A' && c <= 'Z' ? static_cast<char>(c + 0x20) : c;
}

inline bool IsSameName(std::string_view given, std::string_view name) {
  return std::equal(given.begin(), given.end(), name.begin(), name.end(),
                    [](char a, char b) { return SmallLetter(a) == SmallLetter(b); });
}

inline bool EndsWithName(std::string_view text, std::string_view name) {
  return text.size() >= name.size() && IsSameName(text.substr(text.size() - name.size()), name);
}

}  // namespace fileindexd
