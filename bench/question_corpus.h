// SPDX-License-Identifier: GPL-2.0-or-later
// Entries and texts that questions are put to: made up, the same in every run.
//
// Names and texts are made of words as common as their place in a vocabulary says: the second half
// as common as the first, the third a third of it. Beside them words are planted that stand in as
// many entries as a question wants, half of them in names and half in texts.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "base/content.h"
#include "index/entry.h"

namespace fileindexd {

// Where a word, or some in a row, stands: in one of so many names and of so many texts.
struct Plant {
  std::string words;
  uint64_t name_step = 0;  // 0: in none
  uint64_t name_offset = 0;
  uint64_t text_step = 0;
  uint64_t text_offset = 0;
};

constexpr uint64_t QUESTION_SHARES = 4;
constexpr uint64_t ENTRIES_FOR_A_TEXT = 20;  // one of so many entries has a text
constexpr const char* HALF_WORD = "report";  // in half of all names and texts

enum class Place { ANYWHERE, NAMES, TEXTS };

class QuestionCorpus {
 public:
  explicit QuestionCorpus(uint64_t entries) : count(entries) {}

  // Words that nothing else holds, planted in about `in_entries` entries. Asked for before the
  // first entry is made.
  std::string PlantWord(uint64_t in_entries, Place place = Place::ANYWHERE);
  // Two such words that meet in about a tenth of them.
  std::string PlantPair(uint64_t in_entries);
  // Two such words: in a row in that many entries, each alone in as many.
  std::string PlantPhrase(uint64_t in_entries);

  Entry EntryOf(uint64_t number) const;
  bool HasText(uint64_t number) const { return number % ENTRIES_FOR_A_TEXT == 0; }
  Content TextOf(uint64_t number) const;  // of one that has a text
  uint64_t NumberOfInode(uint64_t inode) const;

  static std::string Share(uint64_t share);          // its name
  std::string Root(uint64_t share) const;            // where it lies
  uint64_t ShareOf(uint64_t number) const;           // the share of an entry
  std::string FolderOf(uint64_t number) const;       // a folder of 10,000 entries, or fewer
  static std::string VocabularyWord(uint64_t rank);  // 0 is the most common one

  uint64_t count;
  std::string above;  // the folder that holds the shares' roots; set before the first entry is made

 private:
  std::string NewWord();
  Plant& AddPlant(const std::string& words, uint64_t in_entries, Place place);
  void AddPlanted(uint64_t place, bool in_text, std::vector<std::string>& words) const;

  std::vector<Plant> plants;
  uint64_t made_words = 0;
};

}  // namespace fileindexd
