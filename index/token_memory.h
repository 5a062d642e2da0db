// SPDX-License-Identifier: GPL-2.0-or-later
// What a tokenizer made of words that it met lately: most identifiers occur again soon.
//
//   tokens  token…
//   token   flags(1) length(1) bytes
#pragma once

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

namespace fileindexd {

inline void AppendToken(std::string& tokens, int flags, std::string_view token) {
  tokens += static_cast<char>(flags);
  tokens += static_cast<char>(token.size());
  tokens += token;
}

class TokenMemory {
 public:
  static constexpr size_t MOST_BYTES = 48;  // of a word that is kept

  // Null when that word is not remembered.
  const std::string* Find(std::string_view word) const;
  // In place of another word.
  void Remember(std::string_view word, const std::string& tokens);

 private:
  static constexpr size_t SLOTS = 1 << 12;
  struct Slot {
    std::string word;
    std::string tokens;
  };
  static size_t PlaceOf(std::string_view word);

  std::vector<Slot> slots;  // none before the first word
};

}  // namespace fileindexd
