// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/id_set.h"

#include <algorithm>
#include <bit>
#include <functional>
#include <utility>

namespace fileindexd {

void IdSet::Add(int64_t id) {
  const auto at = static_cast<size_t>(id);
  uint64_t& word = words.At(at / 64);
  const uint64_t bit = uint64_t{1} << (at % 64);
  count += (word & bit) == 0 ? 1 : 0;
  word |= bit;
}

bool IdSet::Has(int64_t id) const {
  const auto at = static_cast<size_t>(id);
  return (words.Get(at / 64) >> (at % 64) & 1) != 0;
}

void IdSet::Remove(int64_t id) {
  if (Has(id)) {
    const auto at = static_cast<size_t>(id);
    words.At(at / 64) &= ~(uint64_t{1} << (at % 64));
    --count;
  }
}

void IdSet::Recount() {
  count = 0;
  for (const Words::Chunk& chunk : words.All()) {
    for (const uint64_t word : chunk) {
      count += static_cast<uint64_t>(std::popcount(word));
    }
  }
}

void IdSet::Unite(const IdSet& other) {
  for (size_t i = 0; i < other.words.End(); ++i) {
    const Words::Chunk* from = other.words.Find(i);
    if (from != nullptr) {
      Words::Chunk& to = words.Make(i);
      std::transform(to.begin(), to.end(), from->begin(), to.begin(), std::bit_or<>());
    }
  }
  Recount();
}

void IdSet::Intersect(const IdSet& other) {
  IdSet common;
  for (size_t i = 0; i < std::min(words.End(), other.words.End()); ++i) {
    const Words::Chunk* mine = words.Find(i);
    const Words::Chunk* from = other.words.Find(i);
    if (mine != nullptr && from != nullptr) {
      Words::Chunk& to = common.words.Make(i);
      std::transform(mine->begin(), mine->end(), from->begin(), to.begin(), std::bit_and<>());
    }
  }
  common.Recount();
  *this = std::move(common);
}

void IdSet::Subtract(const IdSet& other) {
  for (size_t i = 0; i < std::min(words.End(), other.words.End()); ++i) {
    const Words::Chunk* from = other.words.Find(i);
    if (from != nullptr && words.Find(i) != nullptr) {
      Words::Chunk& to = words.Make(i);
      std::transform(to.begin(), to.end(), from->begin(), to.begin(),
                     [](uint64_t a, uint64_t b) { return a & ~b; });
    }
  }
  Recount();
}

int64_t IdSet::Next(int64_t id) const {
  const auto first = static_cast<size_t>(id + 1);
  for (size_t number = first / CHUNK_IDS; number < words.End(); ++number) {
    const Words::Chunk* chunk = words.Find(number);
    const size_t start = number == first / CHUNK_IDS ? first % CHUNK_IDS : 0;
    for (size_t i = start / 64; chunk != nullptr && i < CHUNK_WORDS; ++i) {
      const uint64_t word = (*chunk)[i] & (i == start / 64 ? ~uint64_t{0} << (start % 64) : ~0ULL);
      if (word != 0) {
        return static_cast<int64_t>(number * CHUNK_IDS + i * 64) + std::countr_zero(word);
      }
    }
  }
  return -1;
}

int64_t IdSet::Previous(int64_t id) const {
  const auto most = static_cast<int64_t>(words.End() * CHUNK_IDS);
  const int64_t last = std::min(id, most) - 1;
  for (int64_t number = last / static_cast<int64_t>(CHUNK_IDS); last >= 0 && number >= 0;
       --number) {
    const auto at = static_cast<size_t>(number);
    const Words::Chunk* chunk = words.Find(at);
    const bool is_first = at == static_cast<size_t>(last) / CHUNK_IDS;
    const size_t start = is_first ? static_cast<size_t>(last) % CHUNK_IDS : CHUNK_IDS - 1;
    for (size_t i = start / 64 + 1; chunk != nullptr && i-- > 0;) {
      const uint64_t mask = i == start / 64 ? ~uint64_t{0} >> (63 - start % 64) : ~uint64_t{0};
      const uint64_t word = (*chunk)[i] & mask;
      if (word != 0) {
        return static_cast<int64_t>(at * CHUNK_IDS + i * 64) + 63 - std::countl_zero(word);
      }
    }
  }
  return -1;
}

std::vector<int64_t> IdSet::Ids() const {
  std::vector<int64_t> ids;
  ids.reserve(count);
  for (int64_t id = Next(-1); id >= 0; id = Next(id)) {
    ids.push_back(id);
  }
  return ids;
}

}  // namespace fileindexd
