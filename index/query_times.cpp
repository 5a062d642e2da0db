// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/query_times.h"

#include <algorithm>
#include <charconv>
#include <string>

#include "base/ascii.h"
#include "index/letter_case.h"

namespace fileindexd {

namespace {

constexpr std::string_view UNITS = "smhdwy";
constexpr int64_t LONGEST = int64_t{100000} * 24 * 60 * 60;  // safe to calculate with

// Exactly `count` digits, and not one of what else a library takes for a number.
bool TakeDigits(std::string_view& text, size_t count, int& number) {
  if (text.size() < count) {
    return false;
  }
  number = 0;
  for (size_t i = 0; i < count; ++i) {
    if (text[i] < '0' || text[i] > '9') {
      return false;
    }
    number = number * 10 + (text[i] - '0');
  }
  text.remove_prefix(count);
  return true;
}

bool Take(std::string_view& text, char c) {
  if (text.empty() || text.front() != c) {
    return false;
  }
  text.remove_prefix(1);
  return true;
}

// A day that does not exist, as February 30, comes out as another one.
bool ToSeconds(tm broken, bool utc, int64_t& seconds) {
  const tm given = broken;
  broken.tm_isdst = -1;
  seconds = utc ? timegm(&broken) : mktime(&broken);
  return broken.tm_year == given.tm_year && broken.tm_mon == given.tm_mon &&
         broken.tm_mday == given.tm_mday;
}

tm Broken(time_t time, bool utc) {
  tm broken{};
  if (utc) {
    (void)gmtime_r(&time, &broken);
  } else {
    (void)localtime_r(&time, &broken);
  }
  return broken;
}

// A day is as long as the clock says, also where it is put forward or back.
std::optional<TimeSpan> Day(tm broken, int days, bool utc) {
  tm start{};
  start.tm_year = broken.tm_year;
  start.tm_mon = broken.tm_mon;
  start.tm_mday = broken.tm_mday + days;
  tm end = start;
  end.tm_mday += 1;
  start.tm_isdst = end.tm_isdst = -1;
  const int64_t first = utc ? timegm(&start) : mktime(&start);
  const int64_t next = utc ? timegm(&end) : mktime(&end);
  return TimeSpan{first, next - 1, false};
}

// The hour that comes twice, when the clock is put back, is all that it shows so.
void SpanBothHours(const tm& shown, TimeSpan& span) {
  constexpr int64_t MINUTE = 60;
  for (const int is_summer : {0, 1}) {
    tm broken = shown;
    broken.tm_isdst = is_summer;
    const int64_t first = mktime(&broken);
    if (broken.tm_isdst == is_summer && broken.tm_hour == shown.tm_hour &&
        broken.tm_min == shown.tm_min) {
      span.first = std::min(span.first, first);
      span.last = std::max(span.last, first + MINUTE - 1);
    }
  }
}

// "2024", "2024-01", "2024-01-05", "2024-01-05T12:30".
std::optional<TimeSpan> Calendar(std::string_view text, bool utc) {
  int year = 0;
  int month = 1;
  int day = 1;
  int hour = 0;
  int minute = 0;
  if (!TakeDigits(text, 4, year)) {
    return std::nullopt;
  }
  const bool has_month = Take(text, '-');
  if (has_month && !TakeDigits(text, 2, month)) {
    return std::nullopt;
  }
  const bool has_day = has_month && Take(text, '-');
  if (has_day && !TakeDigits(text, 2, day)) {
    return std::nullopt;
  }
  const bool has_time = has_day && (Take(text, 'T') || Take(text, 't'));
  if (has_time && !(TakeDigits(text, 2, hour) && Take(text, ':') && TakeDigits(text, 2, minute))) {
    return std::nullopt;
  }
  if (!text.empty() || month < 1 || month > 12 || hour > 23 || minute > 59) {
    return std::nullopt;
  }

  tm start{};
  start.tm_year = year - 1900;
  start.tm_mon = month - 1;
  start.tm_mday = day;
  start.tm_hour = hour;
  start.tm_min = minute;
  tm end = start;
  (has_time ? end.tm_min : has_day ? end.tm_mday : has_month ? end.tm_mon : end.tm_year) += 1;
  TimeSpan span;
  if (!ToSeconds(start, utc, span.first)) {
    return std::nullopt;
  }
  end.tm_isdst = -1;
  const int64_t next = utc ? timegm(&end) : mktime(&end);
  span.last = next - 1;
  if (has_time && !utc) {
    SpanBothHours(start, span);
  }
  return span;
}

}  // namespace

std::optional<int64_t> DurationSeconds(std::string_view text) {
  if (text.empty()) {
    return std::nullopt;
  }
  int64_t sum = 0;
  while (!text.empty()) {
    int64_t number = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
    if (error != std::errc() || number < 0 || text.front() == '-') {
      return std::nullopt;
    }
    text.remove_prefix(static_cast<size_t>(end - text.data()));
    constexpr int64_t SECONDS[] = {1, 60, 3600, 86400, 7 * 86400, 365 * 86400};
    const size_t unit = text.empty() ? 0 : UNITS.find(LowerLetter(text.front()));
    if (unit == std::string_view::npos || number > LONGEST / SECONDS[unit]) {
      return std::nullopt;
    }
    text.remove_prefix(text.empty() ? 0 : 1);
    sum += number * SECONDS[unit];
    if (sum > LONGEST) {
      return std::nullopt;
    }
  }
  return sum;
}

std::optional<TimeSpan> ParseTimeSpan(std::string_view text, time_t moment, bool utc) {
  tm local = Broken(moment, false);
  const time_t now = utc ? timegm(&local) : moment;  // what a clock without zone shows
  if (IsSameName(text, "now")) {
    return TimeSpan{now, now, false};
  }
  const bool is_today = IsSameName(text, "today");
  if (is_today || IsSameName(text, "yesterday")) {
    return Day(Broken(moment, false), is_today ? 0 : -1, utc);
  }
  if (text.starts_with('-')) {
    const std::optional<int64_t> ago = DurationSeconds(text.substr(1));
    const bool has_unit = !text.empty() && LowerLetter(text.back()) >= 'a';
    if (!ago.has_value() || !has_unit) {
      return std::nullopt;
    }
    return TimeSpan{now - *ago, now - *ago, true};
  }
  return Calendar(text, utc);
}

bool BeginsWithAgo(std::string_view text) {
  const size_t unit = text.find_first_not_of("0123456789", 1);
  return text.starts_with('-') && unit > 1 && unit < text.size() &&
         UNITS.find(LowerLetter(text[unit])) != std::string_view::npos;
}

}  // namespace fileindexd
