// SPDX-License-Identifier: GPL-2.0-or-later
// Words of names and of questions, cut exactly as the full-text tables cut them.
#pragma once

#include <sqlite3.h>

#include <string>
#include <string_view>
#include <vector>

namespace fileindexd {

class NameTokenizer {
 public:
  NameTokenizer() = default;
  NameTokenizer(const NameTokenizer&) = delete;
  NameTokenizer& operator=(const NameTokenizer&) = delete;
  ~NameTokenizer();

  bool Open();  // false when memory ran out
  // Lower case, without accents. `text` is valid UTF-8.
  std::vector<std::string> Tokens(std::string_view text) const;
  struct Place {
    std::string token;
    size_t start = 0;  // bytes of the text
    size_t end = 0;
  };
  std::vector<Place> Places(std::string_view text) const;

 private:
  sqlite3* db = nullptr;
  fts5_tokenizer functions{};
  Fts5Tokenizer* tokenizer = nullptr;
};

}  // namespace fileindexd
