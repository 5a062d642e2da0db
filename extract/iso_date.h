// SPDX-License-Identifier: GPL-2.0-or-later
// Dates as documents of XML hold them.
#pragma once

#include <cstdint>
#include <optional>
#include <string_view>

namespace fileindexd {

// "2020-01-02", "2020-01-02T03:04:05.678", with "Z" or an offset as "+02:00", to seconds since the
// epoch. Without a zone it counts as UTC.
std::optional<int64_t> ParseIsoDate(std::string_view text);

}  // namespace fileindexd
