// SPDX-License-Identifier: GPL-2.0-or-later
// ASCII letters in lower case, all other bytes as they are. Not tolower(): no locale decides.
#pragma once

#include <algorithm>
#include <string>
#include <string_view>

namespace fileindexd {

constexpr char LowerLetter(char letter) {
  return letter >= 'A' && letter <= 'Z' ? static_cast<char>(letter - 'A' + 'a') : letter;
}

inline std::string LowerText(std::string_view text) {
  std::string lower(text);
  std::transform(lower.begin(), lower.end(), lower.begin(), LowerLetter);
  return lower;
}

}  // namespace fileindexd
