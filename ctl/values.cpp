// SPDX-License-Identifier: GPL-2.0-or-later
#include "ctl/values.h"

#include <algorithm>
#include <charconv>
#include <ctime>

#include "index/query_times.h"
#include "index/text_tokenizer.h"

namespace fileindexd {

namespace {

template <typename Number>
std::optional<Number> WholeNumber(std::string_view text) {
  Number number = 0;
  const char* end = text.data() + text.size();
  const auto [stop, error] = std::from_chars(text.data(), end, number);
  if (error != std::errc() || stop != end) {
    return std::nullopt;
  }

  return number;
}

// Reads a text from its front.
struct Scanner {
  bool Take(char wanted) {
    if (rest.empty() || rest.front() != wanted) {
      return false;
    }

    rest.remove_prefix(1);
    return true;
  }

  // Exactly `digits` digits, within [low, high].
  bool TakeNumber(size_t digits, int low, int high, int& number) {
    if (rest.size() < digits || !IsDigits(rest.substr(0, digits))) {
      return false;
    }

    const int taken = *WholeNumber<int>(rest.substr(0, digits));
    if (taken < low || taken > high) {
      return false;
    }

    number = taken;
    rest.remove_prefix(digits);
    return true;
  }

  static bool IsDigits(std::string_view text) {
    return !text.empty() && text.find_first_not_of("0123456789") == std::string_view::npos;
  }

  std::string_view rest;
};

int DaysInMonth(int year, int month) {
  constexpr int DAYS[] = {31, 28, 31, 30, 31, 30, 31, 31, 30, 31, 30, 31};
  const bool leap = (year % 4 == 0 && year % 100 != 0) || year % 400 == 0;
  return month == 2 && leap ? 29 : DAYS[month - 1];
}

// `basic`: without separators.
bool TakeDate(Scanner& scanner, std::tm& time, bool& basic) {
  int year = 0;
  int month = 0;
  if (!scanner.TakeNumber(4, 1, 9999, year)) {
    return false;
  }
  basic = !scanner.Take('-');
  if (!scanner.TakeNumber(2, 1, 12, month) || (!basic && !scanner.Take('-')) ||
      !scanner.TakeNumber(2, 1, DaysInMonth(year, month), time.tm_mday)) {
    return false;
  }

  time.tm_year = year - 1900;
  time.tm_mon = month - 1;
  return true;
}

// `is_whole`: it is nothing but zeros, or there is none.
bool TakeFraction(Scanner& scanner, bool& is_whole) {
  is_whole = true;
  if (!scanner.Take('.') && !scanner.Take(',')) {
    return true;
  }

  const size_t digits = std::min(scanner.rest.find_first_not_of("0123456789"), scanner.rest.size());
  is_whole = scanner.rest.find_first_not_of('0') >= digits;
  scanner.rest.remove_prefix(digits);
  return digits > 0;
}

// 24 is the end of the day.
bool TakeClock(Scanner& scanner, std::tm& time, bool basic) {
  const auto goes_on = [&] {
    return basic ? Scanner::IsDigits(scanner.rest.substr(0, 1)) : scanner.Take(':');
  };
  if (!scanner.TakeNumber(2, 0, 24, time.tm_hour)) {
    return false;
  }

  bool is_whole = true;
  if (goes_on()) {
    if (!scanner.TakeNumber(2, 0, 59, time.tm_min)) {
      return false;
    }
    if (goes_on() && (!scanner.TakeNumber(2, 0, 60, time.tm_sec) ||  // 60: a leap second
                      !TakeFraction(scanner, is_whole))) {
      return false;
    }
  }
  return time.tm_hour < 24 || (time.tm_min == 0 && time.tm_sec == 0 && is_whole);
}

// The zone that ends the text: seconds east of Greenwich. The text is not empty.
bool TakeZone(Scanner& scanner, int64_t& east) {
  if (scanner.Take('Z') || scanner.Take('z')) {
    east = 0;
    return true;
  }

  const bool west = scanner.Take('-');
  int hours = 0;
  int minutes = 0;
  if ((!west && !scanner.Take('+')) || !scanner.TakeNumber(2, 0, 23, hours)) {
    return false;
  }
  const bool colon = scanner.Take(':');
  if ((colon || !scanner.rest.empty()) && !scanner.TakeNumber(2, 0, 59, minutes)) {
    return false;
  }

  east = (west ? -1 : 1) * (hours * 3600 + minutes * 60);
  return true;
}

}  // namespace

std::optional<int64_t> ParseTime(std::string_view text) {
  if (const std::optional<int64_t> seconds = WholeNumber<int64_t>(text)) {
    return seconds;
  }

  Scanner scanner{text};
  std::tm time = {};
  time.tm_isdst = -1;
  bool basic = false;
  if (!TakeDate(scanner, time, basic)) {
    return std::nullopt;
  }
  if (scanner.rest.empty()) {
    return std::mktime(&time);
  }
  if ((!scanner.Take('T') && !scanner.Take(' ')) || !TakeClock(scanner, time, basic)) {
    return std::nullopt;
  }
  if (scanner.rest.empty()) {
    return std::mktime(&time);
  }

  int64_t east = 0;
  if (!TakeZone(scanner, east) || !scanner.rest.empty()) {
    return std::nullopt;
  }

  return int64_t{timegm(&time)} - east;
}

std::optional<int64_t> ParseDuration(std::string_view text) {
  if (text.empty() || Scanner::IsDigits(text.substr(text.size() - 1))) {
    return std::nullopt;
  }
  return DurationSeconds(text);
}

std::optional<uint64_t> ParseCount(std::string_view text) {
  return Scanner::IsDigits(text) ? WholeNumber<uint64_t>(text) : std::nullopt;
}

std::string KnownLanguages() {
  std::string known;
  for (const std::string& name : Languages()) {
    known += (known.empty() ? "" : ", ") + name;
  }
  return known;
}

SearchArguments SplitSearchArguments(const std::vector<std::string>& arguments,
                                     const std::vector<std::string>& valued) {
  SearchArguments split;
  for (auto argument = arguments.begin(); argument != arguments.end(); ++argument) {
    if (*argument == "--") {
      split.words.insert(split.words.end(), argument + 1, arguments.end());
      break;
    }

    if (*argument != "-0" && !argument->starts_with("--")) {
      split.words.push_back(*argument);
      continue;
    }

    split.options.push_back(*argument);
    const bool takes_value = std::find(valued.begin(), valued.end(), *argument) != valued.end();
    if (takes_value && argument + 1 != arguments.end()) {
      // Joined, so that a value with '-' in front is not taken for another option.
      split.options.back() += "=" + *++argument;
    }
  }
  return split;
}

}  // namespace fileindexd
