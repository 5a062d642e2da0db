// SPDX-License-Identifier: GPL-2.0-or-later
// UTF-16 as file formats store it, or shorten it to a byte a letter, to UTF-8.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace fileindexd {

// Takes code units one by one.
class Utf16Joiner {
 public:
  // A half of a pair that stands alone is left out.
  void Add(uint16_t unit, std::string& text);

 private:
  uint16_t high = 0;
};

// The letter of a byte in Windows' western code page, of which Latin-1 is a part; a control where
// that has none.
uint16_t FromWestern(uint8_t byte);

// Little-endian bytes; an odd last byte is left out.
std::string Utf16ToUtf8(std::string_view bytes);

}  // namespace fileindexd
