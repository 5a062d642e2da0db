// SPDX-License-Identifier: GPL-2.0-or-later
// Stems of words, in one language. One thread.
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "base/zeroed.h"

struct sb_stemmer;

namespace fileindexd {

class Stems {
 public:
  // A name of LanguageName; for NO_LANGUAGE every word is its own stem.
  explicit Stems(const std::string& language);
  ~Stems();
  Stems(const Stems&) = delete;
  Stems& operator=(const Stems&) = delete;

  bool IsGood() const;  // false where memory ran out or the language is not known
  // Of a word in lower case, with its accents. Stays until the next call.
  std::string_view Of(std::string_view word);

 private:
  // One slot for each hash: a word drives out the one that it meets.
  struct Known {
    static constexpr size_t ROOM = 31;
    unsigned char word_size;
    unsigned char stem_size;
    char word[ROOM];
    char stem[ROOM];
  };

  sb_stemmer* stemmer = nullptr;
  bool is_good = true;
  Zeroed<Known> known;  // none without a stemmer
};

}  // namespace fileindexd
