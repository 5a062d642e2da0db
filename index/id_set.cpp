// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/id_set.h"

#include <algorithm>
#include <bit>
#include <functional>
#include <utility>

namespace fileindexd {

const IdSet::Chunk* IdSet::ChunkAt(size_t number) const {
  return number < places.size() && places[number] != 0 ? &chunks[places[number] - 1] : nullptr;
}

IdSet::Chunk& IdSet::MakeChunk(size_t number) {
  if (number >= places.size()) {
    places.resize(std::max(number + 1, places.size() * 2));
  }
  if (places[number] == 0) {
    chunks.emplace_back();
    places[number] = static_cast<uint32_t>(chunks.size());
  }
  return chunks[places[number] - 1];
}

void IdSet::Add(int64_t id) {
  const auto at = static_cast<size_t>(id);
  uint64_t& word = MakeChunk(at / CHUNK_IDS)[at % CHUNK_IDS / 64];
  const uint64_t bit = uint64_t{1} << (at % 64);
  count += (word & bit) == 0 ? 1 : 0;
  word |= bit;
}

bool IdSet::Has(int64_t id) const {
  const auto at = static_cast<size_t>(id);
  const Chunk* chunk = ChunkAt(at / CHUNK_IDS);
  return chunk != nullptr && ((*chunk)[at % CHUNK_IDS / 64] >> (at % 64) & 1) != 0;
}

void IdSet::Remove(int64_t id) {
  if (Has(id)) {
    const auto at = static_cast<size_t>(id);
    chunks[places[at / CHUNK_IDS] - 1][at % CHUNK_IDS / 64] &= ~(uint64_t{1} << (at % 64));
    --count;
  }
}

void IdSet::Recount() {
  count = 0;
  for (const Chunk& chunk : chunks) {
    for (const uint64_t word : chunk) {
      count += static_cast<uint64_t>(std::popcount(word));
    }
  }
}

void IdSet::Unite(const IdSet& other) {
  for (size_t i = 0; i < other.places.size(); ++i) {
    const Chunk* from = other.ChunkAt(i);
    if (from != nullptr) {
      Chunk& to = MakeChunk(i);
      std::transform(to.begin(), to.end(), from->begin(), to.begin(), std::bit_or<>());
    }
  }
  Recount();
}

void IdSet::Intersect(const IdSet& other) {
  IdSet common;
  for (size_t i = 0; i < std::min(places.size(), other.places.size()); ++i) {
    const Chunk* mine = ChunkAt(i);
    const Chunk* from = other.ChunkAt(i);
    if (mine != nullptr && from != nullptr) {
      Chunk& to = common.MakeChunk(i);
      std::transform(mine->begin(), mine->end(), from->begin(), to.begin(), std::bit_and<>());
    }
  }
  common.Recount();
  *this = std::move(common);
}

void IdSet::Subtract(const IdSet& other) {
  for (size_t i = 0; i < std::min(places.size(), other.places.size()); ++i) {
    const Chunk* from = other.ChunkAt(i);
    if (from != nullptr && places[i] != 0) {
      Chunk& to = chunks[places[i] - 1];
      std::transform(to.begin(), to.end(), from->begin(), to.begin(),
                     [](uint64_t a, uint64_t b) { return a & ~b; });
    }
  }
  Recount();
}

int64_t IdSet::Next(int64_t id) const {
  const auto first = static_cast<size_t>(id + 1);
  for (size_t number = first / CHUNK_IDS; number < places.size(); ++number) {
    const Chunk* chunk = ChunkAt(number);
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
  const auto most = static_cast<int64_t>(places.size() * CHUNK_IDS);
  const int64_t last = std::min(id, most) - 1;
  for (int64_t number = last / static_cast<int64_t>(CHUNK_IDS); last >= 0 && number >= 0;
       --number) {
    const auto at = static_cast<size_t>(number);
    const Chunk* chunk = ChunkAt(at);
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
