// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/media_text.h"

#include <chrono>

#include "base/ascii.h"
#include "base/utf8.h"
#include "extract/utf16.h"

namespace fileindexd {

namespace {

bool IsDigit(char letter) {
  return letter >= '0' && letter <= '9';
}

// Takes exactly `digits` digits off the text's beginning.
bool TakeDigits(std::string_view& text, size_t digits, int& number) {
  if (text.size() < digits) {
    return false;
  }
  int taken = 0;
  for (size_t i = 0; i < digits; i++) {
    if (!IsDigit(text[i])) {
      return false;
    }
    taken = taken * 10 + (text[i] - '0');
  }
  text.remove_prefix(digits);
  number = taken;
  return true;
}

bool TakeOneOf(std::string_view& text, std::string_view letters) {
  if (text.empty() || letters.find(text[0]) == std::string_view::npos) {
    return false;
  }
  text.remove_prefix(1);
  return true;
}

// Takes "10:11", "10:11:12" or "10:11:12.345".
bool TakeTime(std::string_view& text, int64_t& seconds) {
  std::string_view rest = text;
  int hour = 0;
  int minute = 0;
  int second = 0;
  if (!TakeDigits(rest, 2, hour) || !TakeOneOf(rest, ":") || !TakeDigits(rest, 2, minute)) {
    return false;
  }
  if (TakeOneOf(rest, ":") && !TakeDigits(rest, 2, second)) {
    return false;
  }
  if (hour > 24 || minute > 59 || second > 60) {
    return false;
  }
  if (TakeOneOf(rest, ".,")) {
    while (!rest.empty() && IsDigit(rest[0])) {
      rest.remove_prefix(1);
    }
  }
  text = rest;
  seconds = hour * 3600 + minute * 60 + second;
  return true;
}

}  // namespace

std::string Utf8Of(std::string_view bytes) {
  if (IsUtf8(bytes)) {
    return std::string(bytes);
  }
  std::string text;
  for (char letter : bytes) {
    AppendUtf8(letter == '\0' ? ' ' : FromWestern(static_cast<uint8_t>(letter)), text);
  }
  return text;
}

std::string_view Trimmed(std::string_view text) {
  constexpr std::string_view BLANKS(" \t\r\n\0", 5);
  size_t first = text.find_first_not_of(BLANKS);
  if (first == std::string_view::npos) {
    return {};
  }
  return text.substr(first, text.find_last_not_of(BLANKS) - first + 1);
}

namespace {

// Seconds east of Greenwich: "+02:00", "-0330", "Z".
std::optional<int64_t> ZoneOf(std::string_view text) {
  text = Trimmed(text);
  if (text.starts_with("Z") || text.starts_with("UTC")) {
    return 0;
  }
  bool west = text.starts_with("-");
  int hours = 0;
  int minutes = 0;
  if (!TakeOneOf(text, "+-") || !TakeDigits(text, 2, hours)) {
    return std::nullopt;
  }
  (void)TakeOneOf(text, ":");  // Both forms are in use.
  if ((!text.empty() && !TakeDigits(text, 2, minutes)) || hours > 14 || minutes > 59) {
    return std::nullopt;
  }
  int64_t seconds = hours * 3600 + minutes * 60;
  return west ? -seconds : seconds;
}

struct Clock {
  int64_t seconds = 0;  // as written, in whatever zone
  int64_t zone = 0;
};

std::optional<Clock> ReadClock(std::string_view text) {
  size_t digits = text.find_first_of("0123456789");
  if (digits == std::string_view::npos) {
    return std::nullopt;
  }
  text.remove_prefix(digits);
  int year = 0;
  int month = 0;
  int day = 0;
  if (!TakeDigits(text, 4, year) || !TakeOneOf(text, ":-/.") || !TakeDigits(text, 2, month) ||
      !TakeOneOf(text, ":-/.") || !TakeDigits(text, 2, day)) {
    return std::nullopt;
  }
  std::chrono::year_month_day date{std::chrono::year(year),
                                   std::chrono::month(static_cast<unsigned>(month)),
                                   std::chrono::day(static_cast<unsigned>(day))};
  if (!date.ok() || year == 0) {
    return std::nullopt;
  }
  int64_t seconds = 0;
  int64_t zone = 0;
  if (TakeOneOf(text, " T") && TakeTime(text, seconds)) {
    zone = ZoneOf(text).value_or(0);
  }
  int64_t days = std::chrono::sys_days(date).time_since_epoch().count();
  return Clock{days * 86400 + seconds, zone};
}

}  // namespace

std::optional<int64_t> ClockOf(std::string_view text) {
  const std::optional<Clock> clock = ReadClock(text);
  return clock ? std::optional(clock->seconds - clock->zone) : std::nullopt;
}

std::optional<int64_t> WrittenClockOf(std::string_view text) {
  const std::optional<Clock> clock = ReadClock(text);
  return clock ? std::optional(clock->seconds) : std::nullopt;
}

std::optional<int64_t> LeadingNumber(std::string_view text) {
  text = Trimmed(text);
  size_t end = text.find_first_not_of("0123456789");
  std::string_view digits = text.substr(0, end);
  if (digits.empty() || digits.size() > 9) {
    return std::nullopt;
  }
  int64_t number = 0;
  for (char digit : digits) {
    number = number * 10 + (digit - '0');
  }
  return number;
}

bool HasEnding(std::string_view name, std::string_view endings) {
  size_t dot = name.rfind('.');
  if (dot == std::string_view::npos) {
    return false;
  }
  const std::string ending = LowerText(name.substr(dot + 1));
  while (!endings.empty()) {
    size_t end = endings.find(' ');
    if (endings.substr(0, end) == ending) {
      return true;
    }
    endings = end == std::string_view::npos ? std::string_view{} : endings.substr(end + 1);
  }
  return false;
}

}  // namespace fileindexd
