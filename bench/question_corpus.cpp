// SPDX-License-Identifier: GPL-2.0-or-later
#include "bench/question_corpus.h"

#include <algorithm>
#include <array>
#include <cmath>

#include "bench/measure.h"

namespace fileindexd {

namespace {

constexpr uint64_t FIRST_INODE = uint64_t{1} << 40;
constexpr uint64_t NAME_WORDS = 5000;     // different ones
constexpr uint64_t TEXT_WORDS = 20000;    // different ones
constexpr uint64_t PLANTED_FROM = 40000;  // in the vocabulary: these are planted alone
constexpr size_t TEXT_BYTES = 3000;
constexpr uint64_t FILES_BESIDE = 100;     // in one folder
constexpr uint64_t FILES_BELOW = 10000;    // in one folder of the upper level
constexpr int64_t SECOND = 1'000'000'000;  // nanoseconds
constexpr int64_t NEWEST = 1'767'225'600;  // the end of 2025
constexpr int64_t SPAN = 5 * 365 * 86400;  // seconds from the oldest to the newest
constexpr uint64_t PAIR_OF_HUNDRED = 110;  // see PlantPair

struct Ending {
  const char* text;
  Kind kind;
};
constexpr std::array<Ending, 8> ENDINGS = {{{"pdf", Kind::DOCUMENT},
                                            {"odt", Kind::DOCUMENT},
                                            {"txt", Kind::DOCUMENT},
                                            {"jpg", Kind::PHOTO},
                                            {"mp4", Kind::VIDEO},
                                            {"mp3", Kind::AUDIO},
                                            {"dat", Kind::OTHER},
                                            {"bak", Kind::OTHER}}};

// One number after the other from a seed, the same everywhere.
class Numbers {
 public:
  explicit Numbers(uint64_t seed) : state(seed * 0x9e3779b97f4a7c15 + 1) {}

  uint64_t Next() {
    state += 0x9e3779b97f4a7c15;
    uint64_t mixed = state;
    mixed = (mixed ^ (mixed >> 30)) * 0xbf58476d1ce4e5b9;
    mixed = (mixed ^ (mixed >> 27)) * 0x94d049bb133111eb;
    return mixed ^ (mixed >> 31);
  }
  uint64_t Below(uint64_t end) { return Next() % end; }
  double Fraction() { return static_cast<double>(Next() >> 11) / 9007199254740992.0; }

 private:
  uint64_t state;
};

// As common as its place says.
std::string AnyWord(Numbers& numbers, uint64_t words) {
  const double rank = std::exp(numbers.Fraction() * std::log(static_cast<double>(words)));
  return QuestionCorpus::VocabularyWord(static_cast<uint64_t>(rank) - 1);
}

std::string Joined(const std::vector<std::string>& words) {
  std::string text;
  for (const std::string& word : words) {
    text += (text.empty() ? "" : " ") + word;
  }
  return text;
}

}  // namespace

// Three syllables, in an order that looks like none. Its last letter belongs to no word form.
std::string QuestionCorpus::VocabularyWord(uint64_t rank) {
  constexpr const char* CONSONANTS = "bdfghjklmnprtvwz";
  constexpr const char* VOWELS = "aiou";
  constexpr uint64_t SYLLABLES = 64;
  constexpr uint64_t ALL = SYLLABLES * SYLLABLES * SYLLABLES;
  uint64_t left = (rank * 48271 + 11) % ALL;
  std::string word;
  for (int i = 0; i < 3; ++i) {
    const uint64_t syllable = left % SYLLABLES;
    word += CONSONANTS[syllable / 4];
    word += VOWELS[syllable % 4];
    left /= SYLLABLES;
  }
  return word + "k";
}

std::string QuestionCorpus::NewWord() {
  return VocabularyWord(PLANTED_FROM + made_words++);
}

Plant& QuestionCorpus::AddPlant(const std::string& words, uint64_t in_entries, Place place) {
  const uint64_t texts = std::max<uint64_t>(count / ENTRIES_FOR_A_TEXT, 1);
  const uint64_t half = std::max<uint64_t>(in_entries / 2, 1);
  const uint64_t in_names = place == Place::NAMES ? in_entries : half;
  const uint64_t in_texts = place == Place::TEXTS ? in_entries : half;
  Plant plant;
  plant.words = words;
  plant.name_step = place == Place::TEXTS ? 0 : std::max<uint64_t>(count / in_names, 2);
  plant.text_step = place == Place::NAMES ? 0 : std::max<uint64_t>(texts / in_texts, 1);
  // Odd numbers have no text: the two halves do not meet.
  plant.name_offset = plant.name_step == 0 ? 0 : (2 * plants.size() + 1) % plant.name_step;
  plant.text_offset = plant.text_step == 0 ? 0 : plants.size() % plant.text_step;
  plants.push_back(plant);
  return plants.back();
}

std::string QuestionCorpus::PlantWord(uint64_t in_entries, Place place) {
  return AddPlant(NewWord(), in_entries, place).words;
}

// One of ten of the first is met by one of eleven of the second.
std::string QuestionCorpus::PlantPair(uint64_t in_entries) {
  const Plant first = AddPlant(NewWord(), in_entries, Place::ANYWHERE);
  Plant second = first;
  second.words = NewWord();
  second.name_step = std::max<uint64_t>(first.name_step * PAIR_OF_HUNDRED / 100, 2);
  second.text_step = std::max<uint64_t>(first.text_step * PAIR_OF_HUNDRED / 100, 1);
  second.name_offset = first.name_offset % second.name_step;
  second.text_offset = first.text_offset % second.text_step;
  plants.push_back(second);
  return first.words + " " + second.words;
}

std::string QuestionCorpus::PlantPhrase(uint64_t in_entries) {
  const std::string first = NewWord();
  const std::string second = NewWord();
  AddPlant(first + " " + second, in_entries, Place::ANYWHERE);
  AddPlant(first, in_entries, Place::ANYWHERE);
  AddPlant(second, in_entries, Place::ANYWHERE);
  return "\"" + first + " " + second + "\"";
}

void QuestionCorpus::AddPlanted(uint64_t place, bool in_text,
                                std::vector<std::string>& words) const {
  if (place % 2 == 0) {
    words.emplace_back(HALF_WORD);
  }
  for (const Plant& plant : plants) {
    const uint64_t step = in_text ? plant.text_step : plant.name_step;
    if (step != 0 && place % step == (in_text ? plant.text_offset : plant.name_offset)) {
      const auto at = static_cast<std::ptrdiff_t>(words.size() / 2);
      words.insert(words.begin() + at, plant.words);
    }
  }
}

std::string QuestionCorpus::Share(uint64_t share) {
  return "share" + std::to_string(share);
}

std::string QuestionCorpus::Root(uint64_t share) const {
  return above + "/" + Share(share);
}

uint64_t QuestionCorpus::ShareOf(uint64_t number) const {
  return number * QUESTION_SHARES / count;
}

std::string QuestionCorpus::FolderOf(uint64_t number) const {
  return Root(ShareOf(number)) + "/department" + std::to_string(number / FILES_BELOW);
}

Entry QuestionCorpus::EntryOf(uint64_t number) const {
  Numbers numbers(number);
  const bool has_text = HasText(number);
  const Ending& ending = ENDINGS[numbers.Below(has_text ? 3 : ENDINGS.size())];
  std::vector<std::string> words;
  for (uint64_t i = 0; i < 2 + numbers.Below(3); ++i) {
    words.push_back(AnyWord(numbers, NAME_WORDS));
  }
  AddPlanted(number, false, words);
  words.push_back(std::to_string(number));

  Entry entry;
  entry.path = FolderOf(number) + "/project" + std::to_string(number / FILES_BESIDE) + "/" +
               Joined(words) + "." + ending.text;
  entry.thing = Thing::FILE;
  entry.kind = ending.kind;
  entry.content_wanted = has_text;
  entry.inode = FIRST_INODE + number;
  entry.size = has_text ? static_cast<int64_t>(TEXT_BYTES)
                        : static_cast<int64_t>(std::exp(numbers.Fraction() * std::log(4e9)));
  entry.mtime = (NEWEST - static_cast<int64_t>(numbers.Below(SPAN))) * SECOND;
  entry.ctime = entry.mtime;
  entry.birth_time = entry.mtime;
  entry.first_seen = NEWEST * SECOND;
  entry.mode = 0644;
  return entry;
}

Content QuestionCorpus::TextOf(uint64_t number) const {
  Numbers numbers(~number);
  std::vector<std::string> words;
  size_t bytes = 0;
  while (bytes < TEXT_BYTES) {
    words.push_back(AnyWord(numbers, TEXT_WORDS));
    bytes += words.back().size() + 1;
  }
  AddPlanted(number / ENTRIES_FOR_A_TEXT, true, words);
  Content content;
  content.kind = Kind::DOCUMENT;
  content.text = Joined(words);
  return content;
}

uint64_t QuestionCorpus::NumberOfInode(uint64_t inode) const {
  if (inode < FIRST_INODE || inode - FIRST_INODE >= count) {
    Fail("a file that nobody made");
  }
  return inode - FIRST_INODE;
}

}  // namespace fileindexd
