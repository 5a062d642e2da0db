// SPDX-License-Identifier: GPL-2.0-or-later
// Numbers out of bytes that a stranger wrote: beyond the end there is 0.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>

namespace fileindexd {

class LittleEndian {
 public:
  LittleEndian() = default;
  explicit LittleEndian(std::string_view view) : bytes(view) {}

  uint8_t Byte(size_t at) const { return at < bytes.size() ? static_cast<uint8_t>(bytes[at]) : 0; }
  uint16_t Word(size_t at) const { return static_cast<uint16_t>(Byte(at) | Byte(at + 1) << 8); }
  uint32_t Long(size_t at) const { return Word(at) | uint32_t{Word(at + 2)} << 16; }
  // As much of it as is there.
  std::string_view Part(size_t at, size_t count) const {
    return at < bytes.size() ? bytes.substr(at, count) : std::string_view();
  }
  size_t Size() const { return bytes.size(); }

 private:
  std::string_view bytes;
};

}  // namespace fileindexd
