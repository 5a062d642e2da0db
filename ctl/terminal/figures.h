// SPDX-License-Identifier: GPL-2.0-or-later
// Figures for people.
#pragma once

#include <cstdint>
#include <string>

namespace fileindexd {

// "4.0K": three figures or four, and a unit of 1024s. Five columns at most.
std::string ShortSize(int64_t bytes);

}  // namespace fileindexd
