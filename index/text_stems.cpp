// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/text_stems.h"

#include <libstemmer.h>

#include <algorithm>
#include <array>
#include <cstdint>
#include <cstring>
#include <utility>

#include "base/ascii.h"
#include "index/text_tokenizer.h"

namespace fileindexd {

namespace {

constexpr size_t SLOTS = 1 << 14;

constexpr std::pair<std::string_view, std::string_view> CODES[] = {
    {"ar", "arabic"},     {"ca", "catalan"},  {"da", "danish"},     {"de", "german"},
    {"el", "greek"},      {"en", "english"},  {"es", "spanish"},    {"eu", "basque"},
    {"fi", "finnish"},    {"fr", "french"},   {"ga", "irish"},      {"hi", "hindi"},
    {"hu", "hungarian"},  {"hy", "armenian"}, {"id", "indonesian"}, {"it", "italian"},
    {"lt", "lithuanian"}, {"ne", "nepali"},   {"nl", "dutch"},      {"no", "norwegian"},
    {"pt", "portuguese"}, {"ro", "romanian"}, {"ru", "russian"},    {"sr", "serbian"},
    {"sv", "swedish"},    {"ta", "tamil"},    {"tr", "turkish"},    {"yi", "yiddish"},
};

size_t SlotOf(std::string_view word) {
  uint32_t hash = 2166136261U;
  for (const char c : word) {
    hash = (hash ^ static_cast<unsigned char>(c)) * 16777619U;
  }
  return (hash ^ hash >> 15) % SLOTS;
}

}  // namespace

Stems::Stems(const std::string& language) {
  if (language == NO_LANGUAGE) {
    return;
  }
  stemmer = sb_stemmer_new(language.c_str(), nullptr);
  is_good = stemmer != nullptr;
  if (is_good) {
    known = MakeZeroed<Known>(SLOTS);
  }
}

Stems::~Stems() {
  sb_stemmer_delete(stemmer);
}

bool Stems::IsGood() const {
  return is_good;
}

std::string_view Stems::Of(std::string_view word) {
  if (stemmer == nullptr || word.size() < 3) {
    return word;
  }
  Known* slot = nullptr;
  if (word.size() <= Known::ROOM) {
    slot = &known[SlotOf(word)];
    if (slot->word_size == word.size() && memcmp(slot->word, word.data(), word.size()) == 0) {
      return {slot->stem, slot->stem_size};
    }
  }

  const auto* bytes = reinterpret_cast<const sb_symbol*>(word.data());
  const sb_symbol* found = sb_stemmer_stem(stemmer, bytes, static_cast<int>(word.size()));
  const int size = sb_stemmer_length(stemmer);
  if (found == nullptr || size <= 0) {
    return word;
  }
  const std::string_view stem(reinterpret_cast<const char*>(found), static_cast<size_t>(size));
  if (slot != nullptr && stem.size() <= Known::ROOM) {
    slot->word_size = static_cast<unsigned char>(word.size());
    slot->stem_size = static_cast<unsigned char>(stem.size());
    std::copy(word.begin(), word.end(), slot->word);
    std::copy(stem.begin(), stem.end(), slot->stem);
  }
  return stem;
}

std::string LanguageName(std::string_view given) {
  const std::string name = LowerText(given);
  for (const auto& [code, language] : CODES) {
    if (name == code) {
      return std::string(language);
    }
  }
  const std::vector<std::string> all = Languages();
  return std::binary_search(all.begin(), all.end(), name) ? name : "";
}

std::string LanguageOfWords(std::string_view given) {
  const std::string name = LanguageName(given);
  return name.empty() ? DEFAULT_LANGUAGE : name;
}

std::vector<std::string> Languages() {
  std::vector<std::string> names = {NO_LANGUAGE};
  for (const char** name = sb_stemmer_list(); *name != nullptr; ++name) {
    names.emplace_back(*name);
  }
  std::sort(names.begin(), names.end());
  return names;
}

}  // namespace fileindexd
