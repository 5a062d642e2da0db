// SPDX-License-Identifier: GPL-2.0-or-later
// What the readers of sound, film and pictures share: texts and clocks in tags.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace fileindexd {

// Tags carry UTF-8 or, in older files, some charset of eight bits that nothing names. What is valid
// UTF-8 stays; all else is taken for Windows' western charset, of which Latin-1 is a part.
std::string Utf8Of(std::string_view bytes);

// Without blanks, line ends and zeros at both ends.
std::string_view Trimmed(std::string_view text);

// Seconds since the epoch of a date and time in digits: "2003:01:02 10:11:12",
// "2003-01-02T10:11:12.5+02:00", "2003-01-02 10:11:12 UTC", "2003-01-02". What stands before the
// year is passed over; a missing time is midnight, a missing zone UTC. None where it is no date
// between the years 1 and 9999, and for the zeros that cameras write when their clock is not set.
std::optional<int64_t> ClockOf(std::string_view text);

// The same with the zone passed over: what a clock on the spot showed, as if it were UTC.
std::optional<int64_t> WrittenClockOf(std::string_view text);

// The first number of a text: 3 of "3/12", 1999 of "1999-05-01". None above nine digits.
std::optional<int64_t> LeadingNumber(std::string_view text);

// Whether the name ends in one of the endings, which are separated by blanks, after a dot. ASCII
// letters are compared without case.
bool HasEnding(std::string_view name, std::string_view endings);

}  // namespace fileindexd
