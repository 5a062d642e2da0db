// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/text_parts.h"

#include <algorithm>

namespace fileindexd {

namespace {

constexpr size_t MOST_BOUNDS = 10;  // beside joiners; more have keys and hashes

bool IsLetter(CharacterClass type) {
  return type == CharacterClass::LETTER || type == CharacterClass::UPPER;
}

}  // namespace

void TextWord::Clear() {
  folded.clear();
  pieces.clear();
  parts.clear();
  letters_alone = true;
}

void TextWord::Add(CharacterClass type, std::string_view bytes) {
  pieces.push_back({type, folded.size()});
  folded += bytes;
  letters_alone = letters_alone && IsLetter(type);
}

void TextWord::EndJoiners() {
  while (!pieces.empty() && pieces.back().type == CharacterClass::JOINER) {
    folded.resize(pieces.back().start);
    pieces.pop_back();
  }
  letters_alone = std::all_of(pieces.begin(), pieces.end(),
                              [](const Piece& piece) { return IsLetter(piece.type); });
}

size_t TextWord::StartOf(size_t piece) const {
  return piece < pieces.size() ? pieces[piece].start : folded.size();
}

// At a capital behind a small letter, and at one before a small letter behind capitals or digits,
// but for a plural's s ("PDFs").
bool TextWord::BeginsPart(size_t piece, bool& by_number) const {
  const CharacterClass before = pieces[piece - 1].type;
  const CharacterClass type = pieces[piece].type;
  const bool small_follows =
      piece + 1 < pieces.size() && pieces[piece + 1].type == CharacterClass::LETTER;
  const bool plural = piece + 2 == pieces.size() && folded.back() == 's';
  const bool begins_word = type == CharacterClass::UPPER && small_follows && !plural;
  by_number = !begins_word && (before == CharacterClass::DIGIT) != (type == CharacterClass::DIGIT);
  return by_number || begins_word ||
         (type == CharacterClass::UPPER && before == CharacterClass::LETTER);
}

void TextWord::AddPart(size_t first, size_t end) {
  const size_t start = StartOf(first);
  const std::string_view part = std::string_view(folded).substr(start, StartOf(end) - start);
  const bool known = std::find(parts.begin(), parts.end(), part) != parts.end();
  if (!part.empty() && part != folded && !known) {
    parts.push_back(part);
  }
}

// What stands between joiners: whole, and in the parts that capitals and digits make of it.
void TextWord::AddChunk(size_t first, size_t end) {
  AddPart(first, end);
  bool ignored = false;
  size_t start = first;
  for (size_t piece = first + 1; piece < end; ++piece) {
    if (BeginsPart(piece, ignored)) {
      AddPart(start, piece);
      start = piece;
    }
  }
  AddPart(start, end);
}

const std::vector<std::string_view>& TextWord::Parts() {
  parts.clear();
  bool is_identifier = false;
  size_t bounds = 0;
  for (size_t piece = 1; piece < pieces.size(); ++piece) {
    const bool joiner = pieces[piece].type == CharacterClass::JOINER;
    bool by_number = false;
    const bool bound = joiner || (pieces[piece - 1].type != CharacterClass::JOINER &&
                                  BeginsPart(piece, by_number));
    bounds += bound && !joiner ? 1 : 0;
    is_identifier = is_identifier || (bound && !by_number);
  }
  if (!is_identifier || bounds >= MOST_BOUNDS) {
    return parts;
  }

  size_t first = 0;
  for (size_t piece = 0; piece <= pieces.size(); ++piece) {
    if (piece == pieces.size() || pieces[piece].type == CharacterClass::JOINER) {
      if (piece > first) {
        AddChunk(first, piece);
      }
      first = piece + 1;
    }
  }

  // The number behind a letter, "1.2" of "v1.2".
  const auto digit = std::find_if(pieces.begin(), pieces.end(), [](const Piece& piece) {
    return piece.type == CharacterClass::DIGIT;
  });
  if (digit != pieces.begin() &&
      std::none_of(digit, pieces.end(), [](const Piece& piece) { return IsLetter(piece.type); })) {
    AddPart(static_cast<size_t>(digit - pieces.begin()), pieces.size());
  }
  return parts;
}

}  // namespace fileindexd
