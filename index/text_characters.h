// SPDX-License-Identifier: GPL-2.0-or-later
// What single characters are to the words of contents, and their folded forms.
#pragma once

#include <array>
#include <cstdint>
#include <string>
#include <string_view>

#include "base/zeroed.h"

namespace fileindexd {

constexpr int32_t BREAK_WITHOUT_WIDTH = 0x200b;  // a format character, but one between words

enum class CharacterClass : uint8_t {
  SEPARATOR,
  LETTER,  // small, or of a script without case; signs that belong to letters too
  UPPER,
  DIGIT,
  JOINER,  // '_'
  MARK,    // inside a word, of no account: accents, soft hyphens
  PAIRED,  // Han, kana, Hangul
};

// One character of well-formed UTF-8. What is not well-formed is a separator of one byte.
struct Character {
  int32_t code = 0;
  size_t size = 1;  // bytes
};
Character CharacterAt(std::string_view text, size_t at);

// Whether it only parts words in every script: controls, spaces and ends of lines.
bool IsBlankCharacter(int32_t code);

// By itself: '_' is a separator here, and a joiner only in the table of ASCII.
CharacterClass ClassOf(int32_t code);

// Of ASCII, by byte.
extern const std::array<CharacterClass, 128> ASCII_CLASSES;

// The one that both stand for together, 0 if none: a kana and its voicing, parts of a syllable.
int32_t Joined(int32_t first, int32_t second);

// One thread.
class CharacterTable {
 public:
  CharacterTable();

  struct Entry {
    CharacterClass type = CharacterClass::SEPARATOR;
    bool is_known = false;
    uint8_t exact_size = 0;
    uint8_t folded_size = 0;
    std::array<char, 12> bytes{};  // lower case with accents, then without

    std::string_view Exact() const { return {bytes.data(), exact_size}; }
    std::string_view Folded() const { return {bytes.data() + exact_size, folded_size}; }
  };
  // Stays until the next call.
  const Entry& Of(int32_t code);
  // A paired character as it is kept: without compatibility forms.
  int32_t Plain(int32_t code);

 private:
  Zeroed<Entry> known;  // of the alphabets, by code
  Entry other;          // the last one beyond them
};

// Without accents; of text in lower case.
std::string WithoutMarks(std::string_view text);
// In lower case, compatibility forms and accents composed.
std::string LowerComposed(std::string_view text);

}  // namespace fileindexd
