// SPDX-License-Identifier: GPL-2.0-or-later
// What each fuzz target defines. It is linked either with the fuzzer, which makes inputs, or with
// replay.cpp, which gives it those of the corpus.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>

// NOLINTNEXTLINE: the fuzzer's own name
extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size);

namespace fileindexd::fuzz {

// What must hold for every input.
inline void Require(bool holds, const char* what) {
  if (!holds) {
    fprintf(stderr, "does not hold: %s\n", what);
    abort();
  }
}

}  // namespace fileindexd::fuzz
