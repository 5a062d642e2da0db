// SPDX-License-Identifier: GPL-2.0-or-later
// Values as they are written on a command line.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace fileindexd {

// Seconds since the epoch, as a number, or from ISO 8601:
//
//   YYYY-MM-DD [ ("T" | " ") HH [ ":" MM [ ":" SS [ ("." | ",") digits ] ] ]
//                [ "Z" | ("+" | "-") HH [ [":"] MM ] ] ]
//
// or the same with a time behind the date, and neither "-" in the one nor ":" in the other: eight
// digits alone are seconds. Without a zone the time is local; a date alone is its first second,
// local, and 24:00:00 its end. Fractions are dropped.
std::optional<int64_t> ParseTime(std::string_view text);

// Seconds of "90s", "15m", "1h30m", "2w", as in questions, but that the last number has its unit.
std::optional<int64_t> ParseDuration(std::string_view text);

// A number of decimal digits alone.
std::optional<uint64_t> ParseCount(std::string_view text);

// What --language takes, for people: "arabic, ... none, ...".
std::string KnownLanguages();

// Arguments of `search`, told apart: what begins with "--", or is "-0", is an option; every other
// argument belongs to the query, and so does everything after a lone "--".
struct SearchArguments {
  std::vector<std::string> options;  // one that takes a value is joined with it: "--share=NAME"
  std::vector<std::string> words;
};
// `valued`: the options that take a value, with their "--".
SearchArguments SplitSearchArguments(const std::vector<std::string>& arguments,
                                     const std::vector<std::string>& valued);

}  // namespace fileindexd
