// SPDX-License-Identifier: GPL-2.0-or-later
// Gives a reader the bytes of a file and shows what it found.
#pragma once

#include <cstdint>
#include <string>

#include "extract/format.h"
#include "tests/unit/extract/media/sample.h"

namespace fileindexd {

struct Found {
  bool is_read = false;
  std::string why;
  Content content;

  // Empty and 0 for what was not found.
  std::string Text(ContentField field) const;
  int64_t Number(ContentField field) const;
};

// As the helper does: an exception is a failure of that file.
Found Read(FormatReader reader, const Sample& sample);

}  // namespace fileindexd
