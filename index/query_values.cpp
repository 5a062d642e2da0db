// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/query_values.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <cmath>
#include <optional>

#include "index/letter_case.h"
#include "index/query_error.h"
#include "index/query_times.h"

namespace fileindexd {

namespace {

// What one value stands for. `first` and `last` are what "<" and ">" compare with; the value alone,
// or at an end of a range, goes from `alone` to `until`.
struct Point {
  int64_t first = 0;
  int64_t last = 0;
  int64_t alone = 0;
  int64_t until = 0;
};

// The year 9999 is beyond what nanoseconds can count: it is the last moment that they can.
int64_t Times(int64_t value, int64_t factor) {
  int64_t product = 0;
  const bool over = __builtin_mul_overflow(value, factor, &product);
  return over ? (value < 0 ? INT64_MIN : INT64_MAX) : product;
}

int64_t Plus(int64_t value, int64_t more) {
  int64_t sum = 0;
  const bool over = __builtin_add_overflow(value, more, &sum);
  return over ? (more < 0 ? INT64_MIN : INT64_MAX) : sum;
}

Point Exactly(int64_t value) {
  return {value, value, value, value};
}

std::optional<double> Decimal(std::string_view text) {
  double number = 0;
  const auto [end, error] =
      std::from_chars(text.data(), text.data() + text.size(), number, std::chars_format::fixed);
  const bool good =
      error == std::errc() && end == text.data() + text.size() && std::isfinite(number);
  return good ? std::optional(number) : std::nullopt;
}

// A number and maybe one of the units, each `step` times the one before.
std::optional<int64_t> Scaled(std::string_view text, std::string_view units, double step) {
  double factor = 1;
  const size_t unit =
      text.empty()
          ? std::string_view::npos
          : units.find(static_cast<char>(text.back() >= 'a' ? text.back() - 32 : text.back()));
  if (unit != std::string_view::npos && (text.back() < '0' || text.back() > '9')) {
    factor = std::pow(step, static_cast<double>(unit + 1));
    text.remove_suffix(1);
  }
  const std::optional<double> number = Decimal(text);
  if (!number.has_value() || *number < 0 || text.front() == '-' || *number * factor > 9e18) {
    return std::nullopt;
  }
  return static_cast<int64_t>(*number * factor);
}

std::optional<int64_t> Bytes(std::string_view text) {
  if (text.size() > 1 && EndsWithName(text, "B")) {
    text.remove_suffix(1);
  }
  // Behind a unit alone: "10MiB".
  if (text.size() > 2 && EndsWithName(text, "i") && LowerLetter(text[text.size() - 2]) >= 'a') {
    text.remove_suffix(1);
  }
  return Scaled(text, "KMGTP", 1024);
}

std::optional<int64_t> Number(std::string_view text) {
  int64_t number = 0;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
  const bool good = error == std::errc() && end == text.data() + text.size();
  return good ? std::optional(number) : std::nullopt;
}

std::optional<Point> DurationPoint(std::string_view text) {
  const std::optional<int64_t> seconds = DurationSeconds(text);
  if (!seconds.has_value()) {
    return std::nullopt;
  }
  return Point{*seconds * 1000, *seconds * 1000, *seconds * 1000, *seconds * 1000 + 999};
}

std::optional<Point> TimePoint(std::string_view text, ValueForm form, time_t now) {
  const std::optional<TimeSpan> span = ParseTimeSpan(text, now, form == ValueForm::CAMERA_TIME);
  if (!span.has_value()) {
    return std::nullopt;
  }
  const int64_t unit = form == ValueForm::NANOSECONDS ? 1'000'000'000 : 1;
  const int64_t first = Times(span->first, unit);
  const int64_t last = Plus(Times(span->last, unit), unit - 1);
  const bool relative = span->is_relative;
  return Point{first, relative ? first : last, first,
               relative ? Plus(Times(now, unit), unit - 1) : last};
}

std::optional<Point> PointOf(std::string_view text, ValueForm form, time_t now) {
  std::optional<int64_t> value;
  switch (form) {
    case ValueForm::NUMBER:
    case ValueForm::RATING:
      value = Number(text);
      break;
    case ValueForm::BYTES:
      value = Bytes(text);
      break;
    case ValueForm::BITS:
      value = Scaled(text, "KM", 1000);
      break;
    case ValueForm::DURATION:
      return DurationPoint(text);
    case ValueForm::SECONDS:
    case ValueForm::NANOSECONDS:
    case ValueForm::CAMERA_TIME:
      return TimePoint(text, form, now);
  }
  return value.has_value() ? std::optional(Exactly(*value)) : std::nullopt;
}

const char* Expected(ValueForm form) {
  switch (form) {
    case ValueForm::NUMBER:
    case ValueForm::RATING:
      return "a number";
    case ValueForm::BYTES:
      return "a size like 500K, 10M or 1.5G";
    case ValueForm::BITS:
      return "a rate like 128K";
    case ValueForm::DURATION:
      return "a duration like 90s, 3m or 1h30m";
    case ValueForm::SECONDS:
    case ValueForm::NANOSECONDS:
    case ValueForm::CAMERA_TIME:
      break;
  }
  return "a time like today, yesterday, -7d, 2024, 2024-01, 2024-01-05 or 2024-01-05T12:30";
}

// Whether it would be one if its numbers were small.
bool IsTooLarge(std::string_view text, ValueForm form, time_t now) {
  std::string small;
  bool was_digit = false;
  for (const char c : text) {
    const bool is_digit = c >= '0' && c <= '9';
    if (!is_digit || !was_digit) {
      small += is_digit ? '1' : c;
    }
    was_digit = is_digit;
  }
  return PointOf(small, form, now).has_value();
}

// Why nothing can lie in it; null: something can.
const char* WhyEmpty(const ValueRange& range, ValueForm form) {
  constexpr int64_t BEST_RATING = 5;
  if (range.lowest > range.highest) {
    return "the range ends before it begins";
  }
  if (form == ValueForm::RATING && (range.highest < 0 || range.lowest > BEST_RATING)) {
    return "a rating goes from 0 to 5";
  }
  return range.highest < 0 && !IsTime(form) ? "no such number is below 0" : nullptr;
}

bool ReadRange(std::string_view text, ValueForm form, time_t now, ValueRange& range,
               std::string& what, size_t& at) {
  const auto point = [&](std::string_view value) {
    const std::optional<Point> read = PointOf(value, form, now);
    if (!read.has_value()) {
      at = static_cast<size_t>(value.data() - text.data());
      what = value.empty()                  ? std::string("a value is missing: ") + Expected(form)
             : IsTooLarge(value, form, now) ? Cited(value) + " is too large"
                                            : Cited(value) + " is not " + Expected(form);
    }
    return read;
  };

  ValueRange made;
  const size_t dots = text.find("..");
  if (dots != std::string_view::npos && text.size() > 2) {
    const std::string_view from = text.substr(0, dots);
    const std::string_view to = text.substr(dots + 2);
    if (!from.empty()) {
      const std::optional<Point> low = point(from);
      if (!low.has_value()) {
        return false;
      }
      made.lowest = low->alone;
    }
    if (!to.empty()) {
      const std::optional<Point> high = point(to);
      if (!high.has_value()) {
        return false;
      }
      made.highest = to.front() == '-' ? high->last : high->until;
    }
    range = made;
    return true;
  }

  const bool is_compared = !text.empty() && (text.front() == '<' || text.front() == '>');
  const bool or_equal = is_compared && text.size() > 1 && text[1] == '=';
  const std::optional<Point> value = point(text.substr(is_compared ? (or_equal ? 2 : 1) : 0));
  if (!value.has_value()) {
    return false;
  }
  if (!is_compared) {
    made = {value->alone, value->until};
  } else if (text.front() == '>' && !or_equal && value->last == INT64_MAX) {
    what = IsTime(form) ? "no time is later than that" : "no number is greater than that";
    at = 0;
    return false;
  } else if (text.front() == '>') {
    made.lowest = or_equal ? value->first : Plus(value->last, 1);
  } else {
    made.highest = or_equal ? value->last : Plus(value->first, -1);
  }
  range = made;
  return true;
}

}  // namespace

bool ParseRange(std::string_view text, ValueForm form, time_t now, ValueRange& range,
                std::string& what, size_t& at) {
  ValueRange made;
  if (!ReadRange(text, form, now, made, what, at)) {
    return false;
  }
  if (const char* why = WhyEmpty(made, form); why != nullptr) {
    what = why;
    at = 0;
    return false;
  }
  range = made;
  return true;
}

bool ParseCircle(std::string_view text, Circle& circle, std::string& what) {
  constexpr double HALF_ROUND = 20'040'000;  // metres to the far side of the earth
  std::array<std::string_view, 3> values;
  size_t count = 0;
  for (size_t at = 0; at <= text.size();) {
    const size_t end = std::min(text.find(',', at), text.size());
    if (count < values.size()) {
      values[count] = text.substr(at, end - at);
    }
    ++count;
    at = end + 1;
  }
  std::string_view distance = values[2];
  double unit = 1;
  if (EndsWithName(distance, "km")) {
    unit = 1000;
    distance.remove_suffix(2);
  } else if (EndsWithName(distance, "m")) {
    distance.remove_suffix(1);
  }
  const std::optional<double> latitude = Decimal(values[0]);
  const std::optional<double> longitude = Decimal(values[1]);
  const std::optional<double> radius = Decimal(distance);
  if (count != 3 || !latitude.has_value() || !longitude.has_value() || !radius.has_value()) {
    what = Cited(text) + " is not LATITUDE,LONGITUDE,RADIUS like 52.52,13.40,2km";
    return false;
  }
  if (std::fabs(*latitude) > 90 || std::fabs(*longitude) > 180 || *radius <= 0) {
    what = "latitude goes from -90 to 90, longitude from -180 to 180, and a radius is above 0";
    return false;
  }
  circle = {*latitude, *longitude, std::min(*radius * unit, HALF_ROUND)};
  return true;
}

}  // namespace fileindexd
