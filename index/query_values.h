// SPDX-License-Identifier: GPL-2.0-or-later
// Values in questions: sizes, times, durations, and ranges of them.
#pragma once

#include <cstdint>
#include <ctime>
#include <string>
#include <string_view>

#include "index/query_fields.h"

namespace fileindexd {

// What the text after the colon of a range says:
//
//   range     = ( ">" | ">=" | "<" | "<=" ) point | [ point ] ".." [ point ] | point
//   point     = number | size | duration | time
//   size      = digits [ "." digits ] [ unit [ "i" ] ] [ "B" ]
//   unit      = "K" | "M" | "G" | "T" | "P"       of 1024
//   duration  = { digits ( "s" | "m" | "h" | "d" | "w" | "y" ) } | digits  seconds
//   time      = "now" | "today" | "yesterday" | "-" duration | day [ "T" hour ":" minute ]
//   day       = year [ "-" month [ "-" day ] ]
//
// A day, a month or a year stands for all of it: behind it begins what is greater. A duration
// stands for its second. A time before now that stands alone means from then until now. A range in
// which nothing can lie makes no sense: one that ends before it begins, sizes and numbers below 0,
// ratings above 5.
struct ValueRange {
  int64_t lowest = INT64_MIN;  // inclusive, in the unit that is stored
  int64_t highest = INT64_MAX;
};

// False, and `what` says why and `at` which byte of `text`.
bool ParseRange(std::string_view text, ValueForm form, time_t now, ValueRange& range,
                std::string& what, size_t& at);

// "52.5,13.4,2km": degrees, and metres or kilometres.
struct Circle {
  double latitude = 0;
  double longitude = 0;
  double radius = 0;  // metres
};
bool ParseCircle(std::string_view text, Circle& circle, std::string& what);

}  // namespace fileindexd
