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
constexpr int64_t MINUTE = 60;
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

// February 30 comes out as another day.
bool IsDay(const tm& given) {
  tm broken = given;
  (void)timegm(&broken);
  return broken.tm_mon == given.tm_mon && broken.tm_mday == given.tm_mday;
}

bool ShowsSame(const tm& a, const tm& b) {
  return a.tm_mday == b.tm_mday && a.tm_hour == b.tm_hour && a.tm_min == b.tm_min;
}

// When the clock shows that time: where it is put back these are two moments, and where it is put
// forward, and never shows it, one as if it had not been.
struct Moments {
  int64_t first = INT64_MAX;
  int64_t last = INT64_MIN;
};

// What is beyond its range, as the day after a month's last, goes on in the next.
Moments MomentsOf(tm shown, bool utc) {
  const int64_t in_utc = timegm(&shown);
  if (utc) {
    return {in_utc, in_utc};
  }
  Moments moments;
  int64_t winter = 0;
  for (const int is_summer : {1, 0}) {
    tm broken = shown;
    broken.tm_isdst = is_summer;
    winter = mktime(&broken);
    if (ShowsSame(broken, shown)) {
      moments.first = std::min(moments.first, winter);
      moments.last = std::max(moments.last, winter);
    }
  }
  return moments.first <= moments.last ? moments : Moments{winter, winter};
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
TimeSpan Day(const tm& broken, int days, bool utc) {
  tm start{};
  start.tm_year = broken.tm_year;
  start.tm_mon = broken.tm_mon;
  start.tm_mday = broken.tm_mday + days;
  tm end = start;
  end.tm_mday += 1;
  return TimeSpan{MomentsOf(start, utc).first, MomentsOf(end, utc).first - 1, false};
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
  (has_day ? end.tm_mday : has_month ? end.tm_mon : end.tm_year) += 1;
  if (!IsDay(start)) {
    return std::nullopt;
  }
  const Moments moments = MomentsOf(start, utc);
  const int64_t last = has_time ? moments.last + MINUTE - 1 : MomentsOf(end, utc).first - 1;
  return TimeSpan{moments.first, last, false};
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
