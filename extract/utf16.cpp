// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/utf16.h"

#include <array>

#include "base/utf8.h"

namespace fileindexd {

uint16_t FromWestern(uint8_t byte) {
  constexpr std::array<uint16_t, 32> HIGH{
      0x20AC, 0x81,   0x201A, 0x0192, 0x201E, 0x2026, 0x2020, 0x2021, 0x02C6, 0x2030, 0x0160,
      0x2039, 0x0152, 0x8D,   0x017D, 0x8F,   0x90,   0x2018, 0x2019, 0x201C, 0x201D, 0x2022,
      0x2013, 0x2014, 0x02DC, 0x2122, 0x0161, 0x203A, 0x0153, 0x9D,   0x017E, 0x0178};
  return byte >= 0x80 && byte < 0xA0 ? HIGH[byte - 0x80U] : byte;
}

void Utf16Joiner::Add(uint16_t unit, std::string& text) {
  if (unit >= 0xD800 && unit < 0xDC00) {
    high = unit;
    return;
  }
  if (unit >= 0xDC00 && unit < 0xE000) {
    if (high != 0) {
      AppendUtf8(0x10000 + ((char32_t{high} - 0xD800) << 10) + (char32_t{unit} - 0xDC00), text);
    }
  } else {
    AppendUtf8(unit, text);
  }
  high = 0;
}

std::string Utf16ToUtf8(std::string_view bytes) {
  std::string text;
  text.reserve(bytes.size() / 2);
  Utf16Joiner joiner;
  for (size_t at = 0; at + 1 < bytes.size(); at += 2) {
    const auto low = static_cast<uint8_t>(bytes[at]);
    const auto high = static_cast<uint8_t>(bytes[at + 1]);
    joiner.Add(static_cast<uint16_t>(low | high << 8), text);
  }
  return text;
}

}  // namespace fileindexd
