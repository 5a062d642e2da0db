// SPDX-License-Identifier: GPL-2.0-or-later
// Rowids of one table: a bit each. A million take 125 KB, whatever is among them.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

namespace fileindexd {

class IdSet {
 public:
  void Add(int64_t id);  // not negative
  bool Has(int64_t id) const;
  void Unite(const IdSet& other);
  void Intersect(const IdSet& other);
  void Subtract(const IdSet& other);

  bool IsEmpty() const;
  uint64_t Count() const;
  std::vector<int64_t> Ids() const;  // ascending

 private:
  std::vector<uint64_t> words;
};

}  // namespace fileindexd
