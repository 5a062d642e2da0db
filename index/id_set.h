// SPDX-License-Identifier: GPL-2.0-or-later
// Rowids of one table: a bit each, in chunks that are there only where they hold some. A million
// neighbours take 125 KB. A few take half a KB each, and 1 KB for each million up to the greatest.
// A set that has grown may take twice that.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "index/chunked.h"

namespace fileindexd {

constexpr int64_t MOST_ROWS = int64_t{1} << 32;
// What is none is damage.
constexpr bool IsRowid(int64_t id) {
  return id >= 0 && id <= MOST_ROWS;
}

class IdSet {
 public:
  void Add(int64_t id);  // 0 to MOST_ROWS
  void Remove(int64_t id);
  bool Has(int64_t id) const;
  void Unite(const IdSet& other);
  void Intersect(const IdSet& other);
  void Subtract(const IdSet& other);

  bool IsEmpty() const { return Count() == 0; }
  uint64_t Count() const { return count; }
  std::vector<int64_t> Ids() const;  // ascending
  // The least that is greater than `id`; -1: none.
  int64_t Next(int64_t id) const;
  // The greatest that is less than `id`; -1: none.
  int64_t Previous(int64_t id) const;

 private:
  static constexpr size_t CHUNK_WORDS = 64;
  static constexpr size_t CHUNK_IDS = CHUNK_WORDS * 64;
  using Words = Chunked<uint64_t, CHUNK_WORDS>;

  void Recount();

  Words words;
  uint64_t count = 0;
};

}  // namespace fileindexd
