// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/iso_date.h"

#include <chrono>

namespace fileindexd {

namespace {

// Takes exactly `digits` digits off the front; -1 where they are not there.
int TakeNumber(std::string_view& text, size_t digits) {
  if (text.size() < digits) {
    return -1;
  }
  int number = 0;
  for (const char c : text.substr(0, digits)) {
    if (c < '0' || c > '9') {
      return -1;
    }
    number = number * 10 + (c - '0');
  }
  text.remove_prefix(digits);
  return number;
}

bool TakeSign(std::string_view& text, char sign) {
  if (!text.starts_with(sign)) {
    return false;
  }
  text.remove_prefix(1);
  return true;
}

// "+02:00", "+0200", "+02"; what is none counts as UTC.
int64_t TakeOffset(std::string_view text) {
  const bool is_west = text.starts_with('-');
  if (!TakeSign(text, '+') && !TakeSign(text, '-')) {
    return 0;
  }
  const int hours = TakeNumber(text, 2);
  (void)TakeSign(text, ':');
  const int minutes = TakeNumber(text, 2);
  const int64_t offset = (hours < 0 ? 0 : hours * 3600) + (minutes < 0 ? 0 : minutes * 60);
  return is_west ? -offset : offset;
}

}  // namespace

std::optional<int64_t> ParseIsoDate(std::string_view text) {
  while (text.starts_with(' ') || text.starts_with('\n')) {
    text.remove_prefix(1);
  }
  const int year = TakeNumber(text, 4);
  const bool has_month = TakeSign(text, '-');
  const int month = has_month ? TakeNumber(text, 2) : 1;
  const bool has_day = has_month && TakeSign(text, '-');
  const int day = has_day ? TakeNumber(text, 2) : 1;
  const std::chrono::year_month_day date{std::chrono::year(year),
                                         std::chrono::month(static_cast<unsigned>(month)),
                                         std::chrono::day(static_cast<unsigned>(day))};
  if (year < 0 || month < 0 || day < 0 || !date.ok()) {
    return std::nullopt;
  }
  int64_t seconds = int64_t{std::chrono::sys_days(date).time_since_epoch().count()} * 86400;
  if (!TakeSign(text, 'T')) {
    return seconds;
  }

  const int hour = TakeNumber(text, 2);
  const int minute = TakeSign(text, ':') ? TakeNumber(text, 2) : 0;
  const int second = TakeSign(text, ':') ? TakeNumber(text, 2) : 0;
  if (hour < 0 || hour > 24 || minute < 0 || minute > 59 || second < 0 || second > 60) {
    return seconds;  // the day is known at least
  }
  while (!text.empty() && (text.front() == '.' || (text.front() >= '0' && text.front() <= '9'))) {
    text.remove_prefix(1);
  }
  return seconds + hour * 3600 + minute * 60 + second - TakeOffset(text);
}

}  // namespace fileindexd
