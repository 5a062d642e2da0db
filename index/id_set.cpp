// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/id_set.h"

#include <algorithm>
#include <bit>

namespace fileindexd {

void IdSet::Add(int64_t id) {
  const auto at = static_cast<size_t>(id);
  if (at / 64 >= words.size()) {
    words.resize(std::max(at / 64 + 1, words.size() * 2));
  }
  words[at / 64] |= uint64_t{1} << (at % 64);
}

bool IdSet::Has(int64_t id) const {
  const auto at = static_cast<size_t>(id);
  return at / 64 < words.size() && (words[at / 64] >> (at % 64) & 1) != 0;
}

void IdSet::Unite(const IdSet& other) {
  words.resize(std::max(words.size(), other.words.size()));
  for (size_t i = 0; i < other.words.size(); ++i) {
    words[i] |= other.words[i];
  }
}

void IdSet::Intersect(const IdSet& other) {
  words.resize(std::min(words.size(), other.words.size()));
  for (size_t i = 0; i < words.size(); ++i) {
    words[i] &= other.words[i];
  }
}

void IdSet::Subtract(const IdSet& other) {
  for (size_t i = 0; i < std::min(words.size(), other.words.size()); ++i) {
    words[i] &= ~other.words[i];
  }
}

bool IdSet::IsEmpty() const {
  return std::all_of(words.begin(), words.end(), [](uint64_t word) { return word == 0; });
}

uint64_t IdSet::Count() const {
  uint64_t count = 0;
  for (const uint64_t word : words) {
    count += static_cast<uint64_t>(std::popcount(word));
  }
  return count;
}

std::vector<int64_t> IdSet::Ids() const {
  std::vector<int64_t> ids;
  for (size_t i = 0; i < words.size(); ++i) {
    for (uint64_t word = words[i]; word != 0; word &= word - 1) {
      ids.push_back(static_cast<int64_t>(i * 64) + std::countr_zero(word));
    }
  }
  return ids;
}

}  // namespace fileindexd
