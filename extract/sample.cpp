// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/sample.h"

#include <xxhash.h>

#include <cerrno>
#include <cstddef>
#include <memory>
#include <vector>

#include "extract/read_at.h"

namespace fileindexd {

namespace {

constexpr int64_t PART = 64 * 1024;

// Hashes `length` bytes from `at` on, as far as they are there.
bool AddPart(XXH3_state_t* state, const Document& document, int64_t at, int64_t length) {
  std::vector<char> bytes(static_cast<size_t>(length));
  const size_t got = ReadAt(document, at, bytes.data(), bytes.size());
  if (got < bytes.size() && errno != 0) {
    return false;
  }
  (void)XXH3_64bits_update(state, bytes.data(), got);  // fails for no state
  return true;
}

}  // namespace

bool SampleFile(const Document& document, uint64_t& sample) {
  const int64_t size = document.size;
  const std::unique_ptr<XXH3_state_t, decltype(&XXH3_freeState)> state(XXH3_createState(),
                                                                       &XXH3_freeState);
  (void)XXH3_64bits_reset(state.get());
  const auto add = [&](int64_t at, int64_t length) {
    return AddPart(state.get(), document, at, length);
  };
  const bool is_read = size <= 3 * PART
                           ? add(0, size)
                           : add(0, PART) && add((size - PART) / 2, PART) && add(size - PART, PART);
  if (!is_read) {
    return false;
  }

  // Byte by byte: the same on every machine.
  unsigned char digits[sizeof(size)];
  for (size_t at = 0; at < sizeof(size); ++at) {
    digits[at] = static_cast<unsigned char>(static_cast<uint64_t>(size) >> (8 * at));
  }
  (void)XXH3_64bits_update(state.get(), digits, sizeof(digits));
  sample = XXH3_64bits_digest(state.get());
  return true;
}

}  // namespace fileindexd
