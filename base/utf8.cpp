// SPDX-License-Identifier: GPL-2.0-or-later
#include "base/utf8.h"

#include <algorithm>

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

}  // namespace

Utf8Character FirstCharacter(std::string_view bytes) {
  const unsigned first = Byte(bytes, 0);
  if (first < 0x80) {
    return {.code = first};
  }
  if (first < 0xC2 || first > 0xF4) {
    return {.is_wrong = true};
  }

  const size_t length = first < 0xE0 ? 2 : first < 0xF0 ? 3 : 4;
  char32_t code = first & (0xFFU >> (length + 1));
  for (size_t at = 1; at < length; ++at) {
    if (at == bytes.size()) {
      return {.length = at, .is_wrong = true, .is_cut = true};
    }
    const unsigned next = Byte(bytes, at);
    if (at == 1 ? !IsSecond(first, next) : (next & 0xC0U) != 0x80) {
      return {.length = at, .is_wrong = true};
    }
    code = code << 6 | (next & 0x3FU);
  }
  return {.code = code, .length = length};
}

std::string ToUtf8(std::string_view bytes) {
  // As most names are.
  if (std::all_of(bytes.begin(), bytes.end(), [](char c) { return (c & 0x80) == 0; })) {
    return std::string(bytes);
  }
  std::string text;
  text.reserve(bytes.size());
  while (!bytes.empty()) {
    const Utf8Character character = FirstCharacter(bytes);
    if (character.is_wrong) {
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
    if (character.is_wrong) {
      return false;
    }
    bytes.remove_prefix(character.length);
  }
  return true;
}

std::vector<size_t> CharacterStarts(std::string_view text) {
  std::vector<size_t> starts;
  for (size_t i = 0; i < text.size(); ++i) {
    if ((static_cast<unsigned char>(text[i]) & 0xc0) != 0x80) {
      starts.push_back(i);
    }
  }
  starts.push_back(text.size());
  return starts;
}

void AppendUtf8(char32_t code, std::string& text) {
  if (code > 0x10FFFF || (code >= 0xD800 && code < 0xE000)) {
    code = 0xFFFD;
  }
  if (code < 0x80) {
    text += static_cast<char>(code);
    return;
  }
  const auto tail = [&](int shift) { text += static_cast<char>(0x80 | ((code >> shift) & 0x3F)); };
  if (code < 0x800) {
    text += static_cast<char>(0xC0 | (code >> 6));
  } else if (code < 0x10000) {
    text += static_cast<char>(0xE0 | (code >> 12));
    tail(6);
  } else {
    text += static_cast<char>(0xF0 | (code >> 18));
    tail(12);
    tail(6);
  }
  tail(0);
}

}  // namespace fileindexd
