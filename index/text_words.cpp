// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/text_words.h"

#include <algorithm>
#include <array>

#include "base/utf8.h"
#include "index/text_tokenizer.h"

namespace fileindexd {

namespace {

bool IsAsciiWord(unsigned char byte) {
  const CharacterClass type = ASCII_CLASSES[byte];
  return type != CharacterClass::SEPARATOR && type != CharacterClass::JOINER;
}

// A dot holds a number together.
bool IsDotInNumber(std::string_view text, size_t at) {
  const auto digit = [text](size_t i) { return text[i] >= '0' && text[i] <= '9'; };
  return text[at] == '.' && at > 0 && at + 1 < text.size() && digit(at - 1) && digit(at + 1);
}

// Up to the end of the last whole character that there is room for.
std::string_view Cut(std::string_view word) {
  if (word.size() <= TextWords::MOST_BYTES) {
    return word;
  }
  size_t end = TextWords::MOST_BYTES;
  while (end > 0 && (static_cast<unsigned char>(word[end]) & 0xc0) == 0x80) {
    --end;
  }
  return word.substr(0, end);
}

}  // namespace

int TextWords::Run(void* to, int flags, std::string_view text, Emit function) {
  context = to;
  emit = function;
  code = SQLITE_OK;
  is_recording = false;
  is_question = (flags & FTS5_TOKENIZE_QUERY) != 0;
  is_beginning = (flags & FTS5_TOKENIZE_PREFIX) != 0;
  if (!is_question && text.starts_with(CUT_MARK)) {
    // A table takes words in their order, and does not ask where they stood.
    PutAgain(text.substr(CUT_MARK.size()), 0, 0);
    return code;
  }
  for (size_t at = 0; at < text.size() && code == SQLITE_OK;) {
    const auto byte = static_cast<unsigned char>(text[at]);
    if (byte < 0x80) {
      at = IsAsciiWord(byte) ? AsciiWord(text, at) : at + 1;
      continue;
    }
    const Character character = CharacterAt(text, at);
    const CharacterClass type = characters.Of(character.code).type;
    if (type == CharacterClass::SEPARATOR || type == CharacterClass::MARK) {
      at += character.size;
    } else {
      at = type == CharacterClass::PAIRED ? Pairs(text, at) : Word(text, at);
    }
  }
  return code;
}

// The quick way. Whatever is more than letters and digits, or may have parts, goes the slow one.
size_t TextWords::AsciiWord(std::string_view text, size_t at) {
  std::array<char, MOST_BYTES> folded;  // NOLINT: what is read has been written
  size_t size = 0;
  bool has_small = false;
  bool has_digit = false;
  bool has_inner_capital = false;
  size_t end = at;
  for (; end < text.size(); ++end) {
    const auto byte = static_cast<unsigned char>(text[end]);
    const CharacterClass type = byte < 0x80 ? ASCII_CLASSES[byte] : CharacterClass::MARK;
    if (type == CharacterClass::SEPARATOR) {
      break;
    }
    if (type == CharacterClass::MARK || type == CharacterClass::JOINER) {
      return Word(text, at);
    }
    has_small = has_small || type == CharacterClass::LETTER;
    has_digit = has_digit || type == CharacterClass::DIGIT;
    has_inner_capital = has_inner_capital || (type == CharacterClass::UPPER && end != at);
    if (size < MOST_BYTES) {
      folded[size++] = static_cast<char>(type == CharacterClass::UPPER ? byte + 0x20 : byte);
    }
  }
  if ((has_small && has_inner_capital) || (end < text.size() && IsDotInNumber(text, end))) {
    return Word(text, at);
  }

  const std::string_view token(folded.data(), size);
  Put(token, at, end);
  if (!has_digit && !is_beginning && end - at <= MOST_BYTES) {
    PutStem(stems.Of(token), token, at, end);
  }
  return end;
}

size_t TextWords::Word(std::string_view text, size_t at) {
  size_t end = at;
  while (end < text.size() && static_cast<unsigned char>(text[end]) < 0x80 &&
         (ASCII_CLASSES[static_cast<unsigned char>(text[end])] != CharacterClass::SEPARATOR ||
          IsDotInNumber(text, end))) {
    ++end;
  }
  const bool is_ascii = end == text.size() || static_cast<unsigned char>(text[end]) < 0x80;
  if (!is_ascii || is_question || end - at > TokenMemory::MOST_BYTES) {
    return AnyWord(text, at);
  }

  const std::string_view raw = text.substr(at, end - at);
  const std::string* tokens = memory.Find(raw);
  if (tokens != nullptr) {
    PutAgain(*tokens, at, end);
    return end;
  }
  record.clear();
  is_recording = true;
  end = AnyWord(text, at);
  is_recording = false;
  if (code == SQLITE_OK) {  // else it is not all of them
    memory.Remember(raw, record);
  }
  return end;
}

// What ends within a token ends before it: the bytes of a document may be anything.
void TextWords::PutAgain(std::string_view tokens, size_t start, size_t end) {
  while (tokens.size() > 2 && code == SQLITE_OK) {
    const auto size = static_cast<size_t>(static_cast<unsigned char>(tokens[1]));
    if (2 + size > tokens.size()) {
      return;
    }
    Put(tokens.substr(2, size), start, end, tokens[0]);
    tokens.remove_prefix(2 + size);
  }
}

size_t TextWords::AnyWord(std::string_view text, size_t at) {
  exact.clear();
  word.Clear();
  const size_t start = at;
  bool has_marks = false;
  while (at < text.size()) {
    const Character character = CharacterAt(text, at);
    const auto byte = static_cast<size_t>(character.code);
    const bool has_room = word.folded.size() <= MOST_BYTES;  // nothing is kept of the rest
    if (IsDotInNumber(text, at) || text[at] == '_') {
      if (has_room) {
        word.Add(CharacterClass::JOINER, text.substr(at, 1));
      }
      ++at;
      continue;
    }
    if (character.code < 0x80 && ASCII_CLASSES[byte] == CharacterClass::SEPARATOR) {
      break;
    }
    const CharacterTable::Entry& entry = characters.Of(character.code);
    if (entry.type == CharacterClass::SEPARATOR || entry.type == CharacterClass::PAIRED) {
      break;
    }
    has_marks = has_marks || entry.type == CharacterClass::MARK;
    if (entry.type != CharacterClass::MARK && has_room) {
      exact += entry.Exact();
      word.Add(entry.type, entry.Folded());
    }
    at += character.size;
  }
  word.EndJoiners();
  const std::string_view token = Cut(word.folded);
  Put(token, start, at);
  if (token.size() == word.folded.size() && word.IsLetters() && !is_beginning) {
    // Stems are found by the accents, which may have come as characters of their own.
    const std::string composed = has_marks ? LowerComposed(text.substr(start, at - start)) : exact;
    Fold(stems.Of(composed));
    PutStem(folded_stem, token, start, at);
  }
  if (token.size() == word.folded.size() && !is_question) {
    PutParts(start, at);
  }
  return at;
}

void TextWords::Fold(std::string_view stem) {
  folded_stem.clear();
  for (size_t at = 0; at < stem.size();) {
    const Character character = CharacterAt(stem, at);
    folded_stem += characters.Of(character.code).Folded();
    at += character.size;
  }
}

void TextWords::PutStem(std::string_view stem, std::string_view whole, size_t start, size_t end) {
  if (stem != whole && stem.size() <= MOST_BYTES) {
    Put(stem, start, end, FTS5_TOKEN_COLOCATED);
  }
}

void TextWords::PutParts(size_t start, size_t end) {
  for (const std::string_view part : word.Parts()) {
    Put(part, start, end, FTS5_TOKEN_COLOCATED);
    if (part.front() < '0' || part.front() > '9') {
      PutStem(stems.Of(part), part, start, end);
    }
  }
}

// Each character with the one behind it, and the last one alone.
size_t TextWords::Pairs(std::string_view text, size_t at) {
  struct Place {
    int32_t code = 0;
    size_t start = 0;
    size_t end = 0;
  };
  Place before;
  Place last;
  std::string pair;
  const auto put_pair = [&] {
    pair.clear();
    AppendUtf8(static_cast<char32_t>(before.code), pair);
    AppendUtf8(static_cast<char32_t>(last.code), pair);
    Put(pair, before.start, last.end);
  };
  while (at < text.size() && code == SQLITE_OK) {
    const Character character = CharacterAt(text, at);
    if (character.size == 1 || characters.Of(character.code).type != CharacterClass::PAIRED) {
      break;
    }
    const int32_t plain = characters.Plain(character.code);
    const int32_t joined = last.code == 0 ? 0 : Joined(last.code, plain);
    if (joined != 0) {
      last = {joined, last.start, at + character.size};
    } else {
      if (before.code != 0) {
        put_pair();
      }
      before = last;
      last = {plain, at, at + character.size};
    }
    at += character.size;
  }
  const bool is_only = before.code == 0;
  if (!is_only) {
    put_pair();
  }
  // A question's last character may go on in the text; if words follow, their place counts.
  if (is_only || !is_question || HoldsWordsFrom(text, at)) {
    pair.clear();
    AppendUtf8(static_cast<char32_t>(last.code), pair);
    Put(pair, last.start, last.end);
  }
  return at;
}

bool TextWords::HoldsWordsFrom(std::string_view text, size_t at) {
  while (at < text.size()) {
    const Character character = CharacterAt(text, at);
    const CharacterClass type = characters.Of(character.code).type;
    if (type != CharacterClass::SEPARATOR && type != CharacterClass::MARK) {
      return true;
    }
    at += character.size;
  }
  return false;
}

}  // namespace fileindexd
