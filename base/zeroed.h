// SPDX-License-Identifier: GPL-2.0-or-later
// Large tables that begin as zeros and are written here and there, if at all: what is not written
// takes neither time nor memory, since the host hands out its pages when they are touched.
#pragma once

#include <cstdlib>
#include <memory>
#include <new>
#include <type_traits>

namespace fileindexd {

struct FreeMemory {
  void operator()(void* memory) const { free(memory); }
};

template <typename T>
using Zeroed = std::unique_ptr<T[], FreeMemory>;

// Of elements for which zero bytes are a good beginning. Throws std::bad_alloc.
template <typename T>
Zeroed<T> MakeZeroed(size_t count) {
  static_assert(std::is_trivially_copyable_v<T> && std::is_trivially_destructible_v<T>);
  Zeroed<T> table(static_cast<T*>(calloc(count, sizeof(T))));
  if (table == nullptr) {
    throw std::bad_alloc();
  }
  return table;
}

}  // namespace fileindexd
