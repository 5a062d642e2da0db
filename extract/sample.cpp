// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/sample.h"

#include <unistd.h>
#include <xxhash.h>

#include <cstddef>
#include <memory>
#include <vector>

namespace fileindexd {

namespace {

constexpr int64_t PART = 64 * 1024;

// Hashes `length` bytes from `at` on, as far as they are there.
bool AddPart(XXH3_state_t* state, int file, int64_t at, int64_t length) {
  std::vector<char> bytes(static_cast<size_t>(PART));
  while (length > 0) {
    const auto wanted = static_cast<size_t>(length < PART ? length : PART);
    const ssize_t got = pread(file, bytes.data(), wanted, at);
    if (got <= 0) {
      return got == 0;
    }
    (void)XXH3_64bits_update(state, bytes.data(), static_cast<size_t>(got));  // fails for no state
    at += got;
    length -= got;
  }
  return true;
}

}  // namespace

bool SampleFile(int file, int64_t size, uint64_t& sample) {
  const std::unique_ptr<XXH3_state_t, decltype(&XXH3_freeState)> state(XXH3_createState(),
                                                                       &XXH3_freeState);
  (void)XXH3_64bits_reset(state.get());
  const bool is_read = size <= 3 * PART ? AddPart(state.get(), file, 0, size)
                                        : AddPart(state.get(), file, 0, PART) &&
                                              AddPart(state.get(), file, (size - PART) / 2, PART) &&
                                              AddPart(state.get(), file, size - PART, PART);
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
