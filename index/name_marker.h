// SPDX-License-Identifier: GPL-2.0-or-later
// What names and questions are folded and cut with. One thread; opening it costs as much as a small
// question, so it is kept from one to the next.
#pragma once

#include "index/name_text.h"
#include "index/name_tokens.h"

namespace fileindexd {

class NameMarker {
 public:
  bool Open() { return is_open = is_open || tokenizer.Open(); }  // false when memory ran out

  NameTokenizer tokenizer;
  NameFolder folder;

 private:
  bool is_open = false;
};

}  // namespace fileindexd
