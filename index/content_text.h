// SPDX-License-Identifier: GPL-2.0-or-later
// The texts of one file, as they are stored and as they are cut into words.
//
//   packed   a zstd frame with its content's size, of:
//   content  field… text
//   field    number(1) length(4, little-endian) bytes      number: a ContentField that holds text,
//                                                          or one whose digits are a word: a year
//   text     0(1) bytes, to the end
#pragma once

#include <array>
#include <string>
#include <string_view>

#include "base/content.h"

namespace fileindexd {

// What goes into the columns of the full-text table. Depends on nothing but what is packed:
// deleting gives the same words again.
struct ContentWords {
  std::array<std::string_view, TEXT_FIELD_COUNT> fields;  // by number, from 1; the content's own
  std::string_view text;
  std::string numbers;  // those that people look for as words

  size_t Length() const;  // of all but the numbers
  bool IsEmpty() const { return Length() == 0 && numbers.empty(); }
};
ContentWords WordsOf(const Content& content);

// A bit for each text field that is there, 1 << number, and NO_TEXT where the text is empty: no
// field has the number 0.
constexpr int64_t NO_TEXT = 1;
int64_t FieldBits(const Content& content);

// Empty when there is no memory.
std::string PackTexts(const Content& content);
// Sets the texts of `content`, and adds the numbers that are words. False when the bytes are
// damaged, or memory ran out.
bool UnpackTexts(std::string_view packed, Content& content);

}  // namespace fileindexd
