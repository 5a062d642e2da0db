// SPDX-License-Identifier: GPL-2.0-or-later
#include "base/utf8.h"

namespace fileindexd {

namespace {

constexpr const char* REPLACEMENT = "\xEF\xBF\xBD";  // U+FFFD

unsigned Byte(std::string_view bytes, size_t at) {
  return static_cast<unsigned char>(bytes[at]);
}

// What the second byte may be: narrower than the others where that keeps out a character in more
// bytes than it needs, a half of a pair, and what lies beyond the last plane.
bool IsSecond(unsigned first, unsigned second) {
  switch (first) {
    case 0xE0:
      return second >= 0xA0 && second <= 0xBF;
    case 0xED:
      return second >= 0x80 && second <= 0x9F;
    case 0xF0:
      return second >= 0x90 && second <= 0xBF;
    case 0xF4:
      return second >= 0x80 && second <= 0x8F;
    default:
      return second >= 0x80 && second <= 0xBF;
  }
}

// A zero is a character like any other.
bool IsWrong(const Utf8Character& character, char first) {
  return character.code == 0 && first != '\0';
}

}  // namespace

Utf8Character FirstCharacter(std::string_view bytes) {
  const unsigned first = Byte(bytes, 0);
  if (first < 0x80) {
    return {first, 1, false};
  }
  if (first < 0xC2 || first > 0xF4) {
    return {};
  }

  const size_t length = first < 0xE0 ? 2 : first < 0xF0 ? 3 : 4;
  char32_t code = first & (0xFFU >> (length + 1));
  for (size_t at = 1; at < length; ++at) {
    if (at == bytes.size()) {
      return {0, at, true};
    }
    const unsigned next = Byte(bytes, at);
    if (at == 1 ? !IsSecond(first, next) : (next & 0xC0U) != 0x80) {
      return {0, at, false};
    }
    code = code << 6 | (next & 0x3FU);
  }
  return {code, length, false};
}

std::string ToUtf8(std::string_view bytes) {
  std::string text;
  text.reserve(bytes.size());
  while (!bytes.empty()) {
    const Utf8Character character = FirstCharacter(bytes);
    if (IsWrong(character, bytes[0])) {
      for (size_t at = 0; at < character.length; ++at) {
        text += REPLACEMENT;
      }
    } else {
      text += bytes.substr(0, character.length);
    }
    bytes.remove_prefix(character.length);
  }
  return text;
}

bool IsUtf8(std::string_view bytes) {
  while (!bytes.empty()) {
    const Utf8Character character = FirstCharacter(bytes);
    if (IsWrong(character, bytes[0])) {
      return false;
    }
    bytes.remove_prefix(character.length);
  }
  return true;
}

}  // namespace fileindexd
