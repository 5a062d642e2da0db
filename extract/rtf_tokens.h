// SPDX-License-Identifier: GPL-2.0-or-later
// RTF, token by token.
#pragma once

#include <cstdint>
#include <string_view>

namespace fileindexd {

struct RtfToken {
  enum class Type { GROUP_BEGIN, GROUP_END, WORD, SYMBOL, BYTE, END };
  Type type = Type::END;
  std::string_view word;  // of WORD: "par" of "\par"
  int32_t number = 0;     // of WORD, where it has one
  bool has_number = false;
  char byte = 0;  // of SYMBOL: '~' of "\~"; of BYTE: a letter, "\'e4" included
};

class RtfTokens {
 public:
  explicit RtfTokens(std::string_view all) : bytes(all) {}

  RtfToken Next();

 private:
  RtfToken TakeControl();

  std::string_view bytes;  // that are left
};

}  // namespace fileindexd
