// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/decoder.h"

namespace fileindexd {

bool ReadText(const Document& document, ContentSink& sink, std::string& why) {
  return DecodeText(
      document, nullptr,
      [&sink](std::string_view text) {
        sink.AddText(text);
        return !sink.IsFull();
      },
      why);
}

}  // namespace fileindexd
