// SPDX-License-Identifier: GPL-2.0-or-later
// What questions ask the full-text tables about a match.
//
//   word_mark(words)    where the question's first phrase stands and how often, as a TextMark
//   name_rank(names)    how well the words answer as a name, the last of them being NAME_END: about
//                       what HitScore says
#pragma once

#include <sqlite3.h>

namespace fileindexd {

int RegisterQuestionFunctions(sqlite3* db);  // SQLite's code

}  // namespace fileindexd
