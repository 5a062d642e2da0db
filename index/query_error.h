// SPDX-License-Identifier: GPL-2.0-or-later
// Why a question makes no sense, as people are told.
#pragma once

#include <string>
#include <string_view>

namespace fileindexd {

struct QueryError {
  std::string what;
  size_t at = 0;  // byte of the question
  // How it could have been written; empty: nobody knows. ParseQuery puts it into `what` at that
  // byte, if it is no mistake itself.
  std::string example = {};
  size_t example_at = 0;

  // One line: the question, or of a long one a piece around the place; what, and where. Control
  // characters are shown in digits. `question` is valid UTF-8.
  std::string Line(std::string_view question) const;
};

// Sets it. Always false, for `return`.
bool Fail(QueryError& error, const std::string& what, size_t at);

// A user's text in quotes, as long as it takes to see which is meant.
std::string Cited(std::string_view text);
// The same without quotes.
std::string Shortened(std::string_view text);

}  // namespace fileindexd
