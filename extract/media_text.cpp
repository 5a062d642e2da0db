// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/media_text.h"

#include <unistd.h>

#include <array>
#include <cerrno>
#include <chrono>

#include "base/utf8.h"
#include "extract/utf16.h"

namespace fileindexd {

namespace {

// Bytes 0x80 to 0x9f of Windows' western charset; 0 is none.
constexpr std::array<uint16_t, 32> WESTERN = {
    0x20ac, 0,      0x201a, 0x0192, 0x201e, 0x2026, 0x2020, 0x2021, 0x02c6, 0x2030, 0x0160,
    0x2039, 0x0152, 0,      0x017d, 0,      0,      0x2018, 0x2019, 0x201c, 0x201d, 0x2022,
    0x2013, 0x2014, 0x02dc, 0x2122, 0x0161, 0x203a, 0x0153, 0,      0x017e, 0x0178};

bool IsDigit(char letter) {
  return letter >= '0' && letter <= '9';
}

uint32_t LittleUnit(std::string_view bytes, size_t at) {
  return static_cast<uint32_t>(static_cast<unsigned char>(bytes[at]) |
                               static_cast<unsigned char>(bytes[at + 1]) << 8);
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

size_t ReadAt(int file, int64_t offset, char* bytes, size_t size) {
  size_t done = 0;
  while (done < size) {
    ssize_t got = pread(file, bytes + done, size - done, offset + static_cast<int64_t>(done));
    if (got < 0 && errno == EINTR) {
      continue;
    }
    if (got <= 0) {
      break;
    }
    done += static_cast<size_t>(got);
  }
  return done;
}

std::string Utf8OfUtf16(std::string_view bytes) {
  std::string text;
  for (size_t i = 0; i + 1 < bytes.size(); i += 2) {
    uint32_t unit = LittleUnit(bytes, i);
    const bool is_high = unit >= 0xd800 && unit < 0xdc00;
    if (is_high && i + 3 < bytes.size() && (LittleUnit(bytes, i + 2) & 0xfc00) == 0xdc00) {
      unit = 0x10000 + ((unit - 0xd800) << 10) + (LittleUnit(bytes, i + 2) - 0xdc00);
      i += 2;
    } else if (unit >= 0xd800 && unit < 0xe000) {
      unit = 0xfffd;
    }
    AppendUtf8(unit, text);
  }
  return text;
}

std::string Utf8Of(std::string_view bytes) {
  if (IsUtf8(bytes)) {
    return std::string(bytes);
  }
  std::string text;
  for (char letter : bytes) {
    unsigned character = static_cast<unsigned char>(letter);
    if (character >= 0x80 && character < 0xa0) {
      character = WESTERN.at(character - 0x80);
    }
    AppendUtf8(character == 0 ? ' ' : character, text);
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

std::optional<int64_t> ClockOf(std::string_view text) {
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
  return days * 86400 + seconds - zone;
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
  std::string ending;
  for (char letter : name.substr(dot + 1)) {
    ending += letter >= 'A' && letter <= 'Z' ? static_cast<char>(letter - 'A' + 'a') : letter;
  }
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
