// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/query_error.h"

#include <algorithm>
#include <cstdio>
#include <vector>

#include "base/utf8.h"

namespace fileindexd {

namespace {

constexpr const char* CUT_SIGN = "\u2026";

std::string InOneLine(std::string_view text) {
  std::string line;
  for (const char c : text) {
    if (static_cast<unsigned char>(c) >= 0x20 && c != 0x7f) {
      line += c;
      continue;
    }
    char digits[8];
    (void)snprintf(digits, sizeof digits, "\\x%02x", static_cast<unsigned>(c));
    line += digits;
  }
  return line;
}

// At most `count` characters from the one with the number `first` on. `starts` are those of the
// text.
std::string Piece(std::string_view text, const std::vector<size_t>& starts, size_t first,
                  size_t count) {
  const size_t end = starts[std::min(first + count, starts.size() - 1)];
  return InOneLine(text.substr(starts[first], end - starts[first])) +
         (end < text.size() ? CUT_SIGN : "");
}

}  // namespace

std::string QueryError::Line(std::string_view question) const {
  constexpr size_t SHOWN = 60;   // characters of the question
  constexpr size_t BEFORE = 20;  // of those, in front of the place
  constexpr size_t BEHIND = 30;  // repeated from the place on
  if (question.empty()) {
    return what;
  }
  const std::vector<size_t> starts = CharacterStarts(question);
  const size_t count = starts.size() - 1;
  const auto place =
      static_cast<size_t>(std::lower_bound(starts.begin(), starts.end(), at) - starts.begin());
  const size_t most = count > SHOWN ? count - SHOWN : 0;
  const size_t first = std::min(place > BEFORE ? place - BEFORE : 0, most);

  std::string line = first > 0 ? CUT_SIGN : "";
  line += Piece(question, starts, first, SHOWN) + ": " + InOneLine(what) + " (character " +
          std::to_string(place + 1);
  return line + (place >= count ? ", at the end)"
                                : ", at: " + Piece(question, starts, place, BEHIND) + ")");
}

bool Fail(QueryError& error, const std::string& what, size_t at) {
  error = {what, at};
  return false;
}

std::string Shortened(std::string_view text) {
  constexpr size_t MOST = 40;
  return Piece(text, CharacterStarts(text), 0, MOST);
}

std::string Cited(std::string_view text) {
  return "'" + Shortened(text) + "'";
}

}  // namespace fileindexd
