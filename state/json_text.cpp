// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/json_text.h"

namespace fileindexd {

std::string JsonText(std::string_view bytes) {
  constexpr char DIGITS[] = "0123456789abcdef";
  std::string text;
  text.reserve(bytes.size() + 2);
  text += '"';
  for (const char c : bytes) {
    const auto byte = static_cast<unsigned char>(c);
    if (c == '"' || c == '\\') {
      text += '\\';
      text += c;
    } else if (byte < 0x20 || byte == 0x7f) {
      text += "\\u00";
      text += DIGITS[byte >> 4];
      text += DIGITS[byte & 0xf];
    } else {
      text += c;
    }
  }
  text += '"';
  return text;
}

}  // namespace fileindexd
