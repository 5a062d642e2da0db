// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/event_codes.h"

#include <charconv>

namespace fileindexd {

namespace {

struct NamedCode {
  std::string_view name;
  uint32_t code;
};

constexpr NamedCode NAMED_CODES[] = {
    {"QLIB_NOTIFY_MODIFY", QLIB_NOTIFY_MODIFY},
    {"QLIB_NOTIFY_ATTRIB", QLIB_NOTIFY_ATTRIB},
    {"QLIB_NOTIFY_CLOSE_WRITE", QLIB_NOTIFY_CLOSE_WRITE},
    {"QLIB_NOTIFY_CREATE", QLIB_NOTIFY_CREATE},
    {"QLIB_NOTIFY_DELETE", QLIB_NOTIFY_DELETE},
    {"QLIB_NOTIFY_RENAME", QLIB_NOTIFY_RENAME},
    {"QLIB_NOTIFY_RENAME_FULL", QLIB_NOTIFY_RENAME_FULL},
    {"QLIB_NOTIFY_QUEUE_RESET", QLIB_NOTIFY_QUEUE_RESET},
    {"CUSTOM_EVENT_REINDEX", CUSTOM_EVENT_REINDEX},
    {"CUSTOM_EVENT_UPDATE", CUSTOM_EVENT_UPDATE},
};

}  // namespace

std::optional<uint32_t> EventCode(std::string_view text) {
  for (const NamedCode& named : NAMED_CODES) {
    if (named.name == text) {
      return named.code;
    }
  }

  int base = 10;
  if (text.starts_with("0x") || text.starts_with("0X")) {
    text.remove_prefix(2);
    base = 16;
  }
  uint32_t code = 0;
  const char* end = text.data() + text.size();
  const auto result = std::from_chars(text.data(), end, code, base);
  if (result.ec != std::errc() || result.ptr != end) {
    return std::nullopt;
  }
  return code;
}

std::string EventNames(uint32_t code) {
  std::string names;
  uint32_t rest = code;
  for (const NamedCode& named : NAMED_CODES) {
    if ((code & named.code) != 0) {
      names += (names.empty() ? "" : "|") + std::string(named.name);
      rest &= ~named.code;
    }
  }
  if (rest != 0 || names.empty()) {
    char digits[8];
    const auto end = std::to_chars(digits, digits + sizeof digits, rest, 16);
    names += (names.empty() ? "0x" : "|0x") + std::string(digits, end.ptr);
  }
  return names;
}

}  // namespace fileindexd
