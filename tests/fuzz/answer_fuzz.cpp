// SPDX-License-Identifier: GPL-2.0-or-later
// A helper that a file has taken over: whatever it answers, what is taken is as the format says.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string>

#include "extract/answer.h"
#include "extract/characters.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  constexpr size_t CAP = 256;
  const std::string frame(reinterpret_cast<const char*>(data), size);
  std::string fault;
  const auto answer = fileindexd::DecodeAnswer(frame, CAP, fault);
  if (!answer) {
    return fault.empty() ? abort(), 0 : 0;
  }
  // What was taken says the same again, byte by byte.
  if (answer->content.text.size() > CAP || !fileindexd::IsCleanText(answer->content.text) ||
      fileindexd::DecodeAnswer(fileindexd::EncodeAnswer(*answer), CAP, fault) == std::nullopt) {
    abort();
  }
  return 0;
}
