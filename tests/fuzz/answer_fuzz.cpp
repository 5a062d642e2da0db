// SPDX-License-Identifier: GPL-2.0-or-later
// The input is the first byte's text cap (in 16 bytes) and a frame of a helper that a file has
// taken over. Whatever it says, what is taken is as the format has it.
#include <string>
#include <string_view>

#include "extract/answer.h"
#include "extract/characters.h"
#include "fuzz/target.h"

namespace fileindexd::fuzz {

namespace {

void Try(std::string_view frame, size_t text_cap) {
  std::string fault;
  const auto answer = DecodeAnswer(frame, text_cap, fault);
  if (!answer) {
    Require(!fault.empty(), "a refusal has a reason");
    return;
  }

  Require(answer->sort != Answer::Sort::UNREAD || !answer->reason.empty(), "what failed is said");
  Require(answer->content.text.size() <= text_cap, "text is within its cap");
  Require(IsCleanText(answer->content.text), "text is clean");
  Require(DecodeAnswer(EncodeAnswer(*answer), text_cap, fault).has_value(),
          "what was taken can be said again");
}

}  // namespace

}  // namespace fileindexd::fuzz

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  const std::string_view input(reinterpret_cast<const char*>(data), size);
  if (!input.empty()) {
    const size_t cap = static_cast<unsigned char>(input[0]) * size_t{16};
    fileindexd::fuzz::Try(input.substr(1), cap);
  }
  return 0;
}
