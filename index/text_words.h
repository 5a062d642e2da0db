// SPDX-License-Identifier: GPL-2.0-or-later
// Cuts texts into the words of contents: see text_tokenizer.h. One thread.
//
// DESIGN: most bytes are ASCII, and most words occur again soon. So words of ASCII letters and
// digits alone are folded while they are copied, and their stems come out of a cache; everything
// else goes a slower way, character by character.
#pragma once

#include <sqlite3.h>

#include <cstddef>
#include <string>
#include <string_view>

#include "index/text_characters.h"
#include "index/text_parts.h"
#include "index/text_stems.h"
#include "index/token_memory.h"

namespace fileindexd {

class TextWords {
 public:
  static constexpr size_t MOST_BYTES = 64;  // of a word that is kept; the rest is cut off
  // As the full-text extension wants to be told of a word. SQLite's code: whether to go on.
  using Emit = int (*)(void* context, int flags, const char* word, int size, int start, int end);

  explicit TextWords(const std::string& language) : stems(language) {}

  bool IsGood() const { return stems.IsGood(); }
  // `flags` as the extension has them. SQLite's code.
  int Run(void* to, int flags, std::string_view text, Emit function);

 private:
  size_t AsciiWord(std::string_view text, size_t at);
  size_t Word(std::string_view text, size_t at);
  size_t AnyWord(std::string_view text, size_t at);
  void PutAgain(std::string_view tokens, size_t start, size_t end);
  size_t Pairs(std::string_view text, size_t at);
  void Fold(std::string_view stem);
  void PutStem(std::string_view stem, std::string_view word, size_t start, size_t end);
  void PutParts(size_t start, size_t end);
  bool HoldsWordsFrom(std::string_view text, size_t at);

  void Put(std::string_view token, size_t start, size_t end, int flags = 0) {
    if (code == SQLITE_OK && !token.empty()) {
      if (is_recording) {
        AppendToken(record, flags, token);
      }
      code = emit(context, flags, token.data(), static_cast<int>(token.size()),
                  static_cast<int>(start), static_cast<int>(end));
    }
  }

  Stems stems;
  CharacterTable characters;
  // Of the call that runs.
  void* context = nullptr;
  Emit emit = nullptr;
  int code = SQLITE_OK;
  bool is_question = false;
  bool is_beginning = false;  // the question's word is the beginning of one
  // Of the word at hand.
  std::string exact;  // lower case, with accents
  std::string folded_stem;
  TextWord word;
  bool is_recording = false;
  std::string record;  // what is put, to be remembered
  TokenMemory memory;
};

}  // namespace fileindexd
