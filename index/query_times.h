// SPDX-License-Identifier: GPL-2.0-or-later
// Times and durations in questions.
#pragma once

#include <cstdint>
#include <ctime>
#include <optional>
#include <string_view>

namespace fileindexd {

// Seconds since the epoch, both inclusive.
struct TimeSpan {
  int64_t first = 0;
  int64_t last = 0;
  bool is_relative = false;  // a moment before now
};

// "90s", "1h30m", "2w", "90" (seconds); at most 100,000 days, so that a time may be added to it.
std::optional<int64_t> DurationSeconds(std::string_view text);

// "today", "-7d", "2024", "2024-01", "2024-01-05", "2024-01-05T12:30". In local time, or in that of
// a clock without a zone, which counts as UTC.
std::optional<TimeSpan> ParseTimeSpan(std::string_view text, time_t moment, bool utc);

// Whether `text` begins with "-", digits and a unit: with a time before now, if with any.
bool BeginsWithAgo(std::string_view text);

}  // namespace fileindexd
