// SPDX-License-Identifier: GPL-2.0-or-later
// Programs that read some formats better than any library.
//
// The helper cannot start one. It names it in its answer; the pool then runs fileindex-extract
// anew, which closes its doors but for that one program and becomes it: the document is its
// standard input, a file in memory its standard output. What comes out is a document again, of a
// simpler format, and is read by a helper like any other.
#pragma once

#include <string>
#include <string_view>
#include <vector>

namespace fileindexd {

struct Converter {
  const char* name;                    // of the program, and in ContentSink::converter
  std::vector<const char*> arguments;  // the name not among them
  const char* result;                  // a name that tells the format of what comes out
};

// Null when there is none of that name.
const Converter* FindConverter(std::string_view name);

// Becomes that program, behind doors that are closed but for it. Returns only on failure, and
// `error` then says why.
void BecomeConverter(const Converter& converter, std::string& error);

}  // namespace fileindexd
