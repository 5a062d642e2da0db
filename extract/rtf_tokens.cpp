// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/rtf_tokens.h"

#include <algorithm>
#include <charconv>

namespace fileindexd {

namespace {

bool IsLetter(char c) {
  return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z');
}

bool IsDigit(char c) {
  return c >= '0' && c <= '9';
}

}  // namespace

RtfToken RtfTokens::Next() {
  RtfToken token;
  while (!bytes.empty() && (bytes.front() == '\r' || bytes.front() == '\n')) {
    bytes.remove_prefix(1);  // lines mean nothing
  }
  if (bytes.empty()) {
    return token;
  }
  const char first = bytes.front();
  bytes.remove_prefix(1);
  if (first == '\\' && !bytes.empty()) {
    return TakeControl();
  }
  token.type = first == '{'   ? RtfToken::Type::GROUP_BEGIN
               : first == '}' ? RtfToken::Type::GROUP_END
                              : RtfToken::Type::BYTE;
  token.byte = first;
  return token;
}

RtfToken RtfTokens::TakeControl() {
  RtfToken token;
  if (!IsLetter(bytes.front())) {
    token.type = RtfToken::Type::SYMBOL;
    token.byte = bytes.front();
    bytes.remove_prefix(1);
    int code = 0;
    const char* end = bytes.data() + std::min<size_t>(bytes.size(), 2);
    if (token.byte == '\'' && std::from_chars(bytes.data(), end, code, 16).ptr == end) {
      token.type = RtfToken::Type::BYTE;
      token.byte = static_cast<char>(code);
      bytes.remove_prefix(static_cast<size_t>(end - bytes.data()));
    }
    return token;
  }

  token.type = RtfToken::Type::WORD;
  const auto* word_end = std::find_if_not(bytes.begin(), bytes.end(), IsLetter);
  token.word = bytes.substr(0, static_cast<size_t>(word_end - bytes.begin()));
  bytes.remove_prefix(token.word.size());
  const bool is_signed = bytes.size() > 1 && bytes[0] == '-' && IsDigit(bytes[1]);
  if (is_signed || (!bytes.empty() && IsDigit(bytes[0]))) {
    const auto parsed = std::from_chars(bytes.data(), bytes.data() + bytes.size(), token.number);
    token.has_number = parsed.ec == std::errc();
    bytes.remove_prefix(static_cast<size_t>(parsed.ptr - bytes.data()));
  }
  if (bytes.starts_with(' ')) {
    bytes.remove_prefix(1);
  }
  if (token.word == "bin" && token.number > 0) {
    bytes.remove_prefix(std::min(bytes.size(), static_cast<size_t>(token.number)));
  }
  return token;
}

}  // namespace fileindexd
