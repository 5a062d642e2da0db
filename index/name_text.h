// SPDX-License-Identifier: GPL-2.0-or-later
// Names as the full-text tables and questions see them: letter case, accents and compatibility
// forms do not count.
//
// The words of a name are cut by the table's own tokenizer. Han, kana and Hangul know no blanks, so
// each of their characters is set apart and a word of them is found as a row of characters. Behind
// the last word stands a mark of its own: where it stands tells how many words the name has.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "index/text_characters.h"

namespace fileindexd {

constexpr const char* NAME_END = "\xee\x80\x80";  // U+E000: a word of its own, in no name

// One thread.
class NameFolder {
 public:
  // `name` is valid UTF-8. `origins`, if asked for: for each byte of the result the byte of `name`
  // that it came from, and one more for the end.
  std::string Words(std::string_view name, std::vector<uint32_t>* origins = nullptr);
  std::string Parts(std::string_view name, std::vector<uint32_t>* origins = nullptr);

 private:
  std::string Fold(std::string_view name, bool apart, std::vector<uint32_t>* origins);
  std::optional<CharacterTable> characters;  // for what is not ASCII; large
};

// Whether that ending stands behind a dot, and something before it. Both as Parts gives them.
bool HasEnding(std::string_view name, std::string_view ending);

// What stands in the table `names`.
std::string NameRow(NameFolder& folder, std::string_view name);

}  // namespace fileindexd
