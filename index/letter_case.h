// SPDX-License-Identifier: GPL-2.0-or-later
// Names and endings in which capital letters of ASCII do not count. The locale has no say.
#pragma once

#include <algorithm>
#include <string_view>

#include "base/ascii.h"

namespace fileindexd {

inline bool IsSameName(std::string_view given, std::string_view name) {
  return std::equal(given.begin(), given.end(), name.begin(), name.end(),
                    [](char a, char b) { return LowerLetter(a) == LowerLetter(b); });
}

inline bool EndsWithName(std::string_view text, std::string_view name) {
  return text.size() >= name.size() && IsSameName(text.substr(text.size() - name.size()), name);
}

}  // namespace fileindexd
