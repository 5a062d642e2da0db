// SPDX-License-Identifier: GPL-2.0-or-later
// One word, folded, and the parts that it has if it is an identifier.
//
//   foo_bar    foo, bar
//   fooBar     foo, bar        XMLReader    xml, reader
//   v1.2       v1, v, 1, 2, 1.2
//   utf8Text   utf, 8, text
//   fooBar2    foo, bar, 2     (utf8 is whole: digits part a word only where something else does)
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "index/text_characters.h"

namespace fileindexd {

class TextWord {
 public:
  void Clear();
  void Add(CharacterClass type, std::string_view bytes);  // a character, folded
  void EndJoiners();                                      // drops those at the end
  bool IsLetters() const { return letters_alone; }
  // Empty for a word without parts, and for one that has so many that it is encoded data. Stays
  // until the word changes.
  const std::vector<std::string_view>& Parts();

  std::string folded;

 private:
  struct Piece {
    CharacterClass type;
    size_t start;
  };

  bool BeginsPart(size_t piece, bool& by_number) const;
  size_t StartOf(size_t piece) const;
  void AddPart(size_t first, size_t end);  // pieces; nothing if it is the word itself, or was added
  void AddChunk(size_t first, size_t end);

  std::vector<Piece> pieces;
  std::vector<std::string_view> parts;
  bool letters_alone = true;
};

}  // namespace fileindexd
