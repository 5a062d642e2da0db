// SPDX-License-Identifier: GPL-2.0-or-later
// Makes old office documents for the readers' tests.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "tests/unit/extract/documents/packing.h"

namespace fileindexd {

std::string Le16(uint32_t number);
std::string Le32(uint32_t number);
std::string Wide(const std::u16string& text);

// A compound file of these streams; with `title` and `author`, a summary too.
std::string Compound(const std::vector<Member>& streams, const std::string& title = "",
                     const std::string& author = "");

}  // namespace fileindexd
