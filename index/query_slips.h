// SPDX-License-Identifier: GPL-2.0-or-later
// Words of a question that can only be meant for a field and are none: as words they would be
// looked for in vain, and nobody would be told why.
#pragma once

#include <string>
#include <string_view>

namespace fileindexd {

bool IsBlank(char c);  // what words are parted by

// How many letters of ASCII, as names of fields are made of, `text` begins with.
size_t LettersAtStart(std::string_view text);

// Why the word that `text` begins with, which has no field in front, is refused; empty: it is not.
//
// Refused are a field with a comparison in the place of its colon ("size>10M", "ext=pdf"); a
// comparison or a quote behind the colon of what is no field; and a name that is a slip of a
// field's (NearField). Words of names and texts hold colons too: addresses ("http://x"), names in
// programs ("fs::path"), and what is far from all fields or has nothing behind its colon.
std::string WhyMeantForField(std::string_view text);

}  // namespace fileindexd
