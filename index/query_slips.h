// SPDX-License-Identifier: GPL-2.0-or-later
// Words of a question that can only be meant for something else: as words they would be looked for
// in vain, and nobody would be told why.
#pragma once

#include <string>
#include <string_view>

#include "index/query_error.h"

namespace fileindexd {

struct QueryNode;

// Why the word that `text` begins with, which has no field in front, is refused; without a `what`:
// it is not. `at` is not set.
//
// Refused are a field with a comparison in the place of its colon ("size>10M", "ext!=pdf") or with
// blanks in front of its colon or comparison ("size > 10M", "text : whale"); a comparison or a
// quote behind the colon of what is no field; and a name that is a slip of a field's (NearField).
// Words of names and texts hold colons too: addresses ("http://x"), names in programs ("fs::path"),
// and what is far from all fields or has nothing behind its colon.
// So is "--draft", which would find what is to be left out; "--" alone is a sign.
QueryError MeantOtherwise(std::string_view text);

// Behind an answer without hits, what may have been meant for an operator: the first "or", "and" or
// "not" in small letters that stands where one would. Empty: there is none.
std::string SmallOperator(const QueryNode& node);

}  // namespace fileindexd
