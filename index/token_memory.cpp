// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/token_memory.h"

#include <cstdint>

namespace fileindexd {

size_t TokenMemory::PlaceOf(std::string_view word) {
  uint32_t hash = 2166136261U;
  for (const char c : word) {
    hash = (hash ^ static_cast<unsigned char>(c)) * 16777619U;
  }
  return (hash ^ hash >> 15) % SLOTS;
}

const std::string* TokenMemory::Find(std::string_view word) const {
  if (slots.empty()) {
    return nullptr;
  }
  const Slot& slot = slots[PlaceOf(word)];
  return slot.word == word ? &slot.tokens : nullptr;
}

void TokenMemory::Remember(std::string_view word, const std::string& tokens) {
  slots.resize(SLOTS);
  Slot& slot = slots[PlaceOf(word)];
  slot.word.clear();  // memory may run out in between
  slot.tokens = tokens;
  slot.word = word;
}

}  // namespace fileindexd
