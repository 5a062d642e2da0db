// SPDX-License-Identifier: GPL-2.0-or-later
// A question's text taken apart: words to look up, and how well a name answers them.
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "index/entry.h"
#include "index/name_tokens.h"

namespace fileindexd {

class QuestionWords {
 public:
  // False when there is nothing to search for, and `error` then says why.
  bool Read(const std::string& text, std::string& error);

  // The words in the full-text tables' own language: every word is a quoted literal there, so that
  // no text of a user is taken for syntax. Empty when that table cannot help.
  std::string NamesQuery() const;
  std::string PartsQuery() const;

  // Word by word, those without a token left out: the same, and for contents' words.
  size_t Count() const { return words.size(); }
  const std::string& Text(size_t word) const { return words[word].text; }
  std::string NameQuery(size_t word) const;
  std::string ContentQuery(size_t word) const;
  // Which of them the name holds.
  std::vector<bool> InName(std::string_view name) const;

  // Whether the name holds the words that are no words to the tables ("++").
  bool HoldsSigns(std::string_view name) const;
  // Greater is better: the whole name, all words at its start, the share of it that they cover.
  double Score(const Entry& entry) const;

 private:
  struct Token {
    std::string text;
    bool prefix = false;
  };
  struct Word {
    std::string text;
    bool prefix = false;
    std::vector<std::string> tokens;
  };

  static bool Holds(const std::vector<std::string>& name, const Word& word);
  double Covered(const std::vector<std::string>& name) const;

  NameTokenizer tokenizer;
  std::vector<Word> words;
  std::vector<Token> tokens;       // of all words, in order
  std::vector<std::string> signs;  // words without a token
};

}  // namespace fileindexd
