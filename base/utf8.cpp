// SPDX-License-Identifier: GPL-2.0-or-later
#include "base/utf8.h"

namespace fileindexd {

namespace {

constexpr const char* REPLACEMENT = "\xEF\xBF\xBD";  // U+FFFD

// Bytes of the well-formed character that begins at `at`; 0 when none does. Overlong forms,
// surrogates and what lies above U+10FFFF are not well-formed.
size_t CharacterLength(std::string_view bytes, size_t at) {
  const auto byte = [&](size_t i) { return static_cast<unsigned char>(bytes[i]); };
  const unsigned char lead = byte(at);
  if (lead < 0x80) {
    return 1;
  }

  size_t length = 0;
  unsigned char low = 0x80;  // bounds of the second byte
  unsigned char high = 0xBF;
  if (lead >= 0xC2 && lead <= 0xDF) {
    length = 2;
  } else if (lead >= 0xE0 && lead <= 0xEF) {
    length = 3;
    low = lead == 0xE0 ? 0xA0 : low;
    high = lead == 0xED ? 0x9F : high;
  } else if (lead >= 0xF0 && lead <= 0xF4) {
    length = 4;
    low = lead == 0xF0 ? 0x90 : low;
    high = lead == 0xF4 ? 0x8F : high;
  }
  if (length == 0 || bytes.size() - at < length || byte(at + 1) < low || byte(at + 1) > high) {
    return 0;
  }
  for (size_t i = at + 2; i < at + length; ++i) {
    if (byte(i) < 0x80 || byte(i) > 0xBF) {
      return 0;
    }
  }
  return length;
}

}  // namespace

std::string ToUtf8(std::string_view bytes) {
  std::string text;
  text.reserve(bytes.size());
  for (size_t at = 0; at < bytes.size();) {
    const size_t length = CharacterLength(bytes, at);
    if (length == 0) {
      text += REPLACEMENT;
      ++at;
    } else {
      text += bytes.substr(at, length);
      at += length;
    }
  }
  return text;
}

bool IsUtf8(std::string_view bytes) {
  for (size_t at = 0; at < bytes.size();) {
    const size_t length = CharacterLength(bytes, at);
    if (length == 0) {
      return false;
    }
    at += length;
  }
  return true;
}

}  // namespace fileindexd
