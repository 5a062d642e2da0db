// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/characters.h"

#include <algorithm>

namespace fileindexd {

namespace {

constexpr int64_t YEAR_1000 = -30'610'224'000;
constexpr int64_t YEAR_10000 = 253'402'300'800;
constexpr int64_t DEGREE = 10'000'000;

unsigned Byte(std::string_view bytes, size_t at) {
  return static_cast<unsigned char>(bytes[at]);
}

bool IsBetween(int64_t number, int64_t least, int64_t most) {
  return number >= least && number <= most;
}

}  // namespace

bool IsBlank(char32_t code) {
  if (code < 0x1680) {
    return code <= 0x20 || (code >= 0x7F && code <= 0xA0);
  }
  return code == 0x1680 || (code >= 0x2000 && code <= 0x200A) || code == 0x2028 || code == 0x2029 ||
         code == 0x202F || code == 0x205F || code == 0x3000 || code == 0xFEFF ||
         (code >= 0xFFF9 && code <= 0xFFFD) || (code & 0xFFFEU) == 0xFFFE;
}

// Most bytes are plain ones, and of every text each is looked at.
bool IsCleanText(std::string_view bytes) {
  const auto is_plain = [](char c) { return (c >= ' ' && c < 0x7F) || c == '\n'; };
  while (true) {
    bytes.remove_prefix(static_cast<size_t>(std::find_if_not(bytes.begin(), bytes.end(), is_plain) -
                                            bytes.begin()));
    if (bytes.empty()) {
      return true;
    }
    const Utf8Character character = FirstCharacter(bytes);
    if (IsBlank(character.code)) {
      return false;
    }
    bytes.remove_prefix(character.length);
  }
}

std::string_view CutText(std::string_view text, size_t limit) {
  if (text.size() <= limit) {
    return text;
  }

  size_t end = limit;
  while (end > 0 && (Byte(text, end) & 0xC0U) == 0x80) {
    --end;
  }
  return text.substr(0, end);
}

bool IsPlausible(ContentField field, int64_t number) {
  switch (field) {
    case ContentField::CREATED:
    case ContentField::SENT:
    case ContentField::TAKEN:
    case ContentField::RECORDED:
      return IsBetween(number, YEAR_1000, YEAR_10000 - 1) && number != 0;
    case ContentField::YEAR:
      return IsBetween(number, 1, 9999);
    case ContentField::LATITUDE:
      return IsBetween(number, -90 * DEGREE, 90 * DEGREE);
    case ContentField::LONGITUDE:
      return IsBetween(number, -180 * DEGREE, 180 * DEGREE);
    case ContentField::RATING:
      return IsBetween(number, 0, 5);
    default:
      return number > 0;
  }
}

}  // namespace fileindexd
