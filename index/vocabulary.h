// SPDX-License-Identifier: GPL-2.0-or-later
// Words that an index has, near to one that it has not.
#pragma once

#include <sqlite3.h>

#include <compare>
#include <cstdint>
#include <functional>
#include <map>
#include <string>
#include <utility>
#include <vector>

#include "state/sqlite.h"

namespace fileindexd {

// How many slips of the fingers lie between, and whether the word is shorter than the asked one.
using Nearness = std::pair<int, bool>;

// The words of vocabularies that are nearest to one, and rather not shorter than it, as stems are.
// Of those as near the most frequent, and of these the first.
class NearWords {
 public:
  static constexpr size_t MOST = 4;

  // Whether a word as near as that may be among them.
  bool Takes(const Nearness& nearness) const;

  // `documents`: that have it.
  void Add(const Nearness& nearness, int64_t documents, std::string word);

  std::vector<std::string> Texts() const;  // the best first

 private:
  struct Word {
    Nearness nearness;
    int64_t rarity = 0;
    std::string text;
    auto operator<=>(const Word&) const = default;
  };
  std::vector<Word> words;  // in order, each text once
};

// The words of one full-text table, or of one column of it. A bounded part of them is looked at.
// One thread.
class Vocabulary {
 public:
  // `of_column`: empty: of all. SQLite's code.
  int Open(sqlite3* db, const char* database, const char* table, const std::string& of_column);

  // Words that are one slip of the fingers away, or two in a longer word. `language`: whose stems
  // stand beside the words.
  void Look(const std::string& word, const std::string& language, NearWords& near_words);

 private:
  struct Term {
    std::string text;
    int64_t documents = 0;
    int64_t times = 0;
  };
  struct Near {
    Nearness nearness;
    Term term;
  };
  // What stands under one stem: how often, and of what the slips leave half the most frequent.
  struct Forms {
    int64_t times = 0;
    Term best;
  };
  using FormsByStem = std::map<std::string, Forms, std::less<>>;

  // What begins with one of them; none begins with another.
  void ForEach(const std::vector<std::string>& beginnings,
               const std::function<void(const Term&)>& visit);
  // Of those that were found, as what never stands but as the stem of others is no word. At most
  // the last letter of a stem is none of its words'.
  FormsByStem FormsOf(const std::string& word, const std::vector<Near>& found,
                      const std::string& language);

  std::string column;
  Statement terms;
};

}  // namespace fileindexd
