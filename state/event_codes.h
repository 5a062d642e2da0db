// SPDX-License-Identifier: GPL-2.0-or-later
// Event codes as users write them.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "base/event_codes.h"

namespace fileindexd {

// A code from its name, or from a number (decimal or 0x…); none when it is neither.
std::optional<uint32_t> EventCode(std::string_view text);

// The names of a code's bits, joined by "|"; bits without a name as one number (0x…).
std::string EventNames(uint32_t code);

}  // namespace fileindexd
