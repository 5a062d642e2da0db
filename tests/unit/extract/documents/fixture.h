// SPDX-License-Identifier: GPL-2.0-or-later
// What the readers' tests say: bytes go in, fields and text come out.
#pragma once

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <optional>
#include <string>

#include "extract/format.h"

namespace fileindexd {

struct Reading {
  bool is_good = false;
  std::string why;
  Content content;
  std::string converter;

  std::string Text(ContentField field) const;  // empty where there is none
  std::optional<int64_t> Number(ContentField field) const;
};

struct ReadingOptions {
  int depth = 0;
  size_t text_cap = 1 << 20;
};

// Has `reader` read a file of these bytes.
Reading ReadBytes(FormatReader reader, const std::string& name, const std::string& bytes,
                  const ReadingOptions& options = {});

// Has the helper read it as it is, then reads it truncated at every tenth, then with bits flipped, once for each seed
// (FILEINDEXD_TEST_SCALE "long": 1,000 instead of 20). What comes out does not matter, but that it
// is within its bounds.
void ExpectSurvivesDamage(FormatReader reader, const std::string& name, const std::string& bytes);

}  // namespace fileindexd
