// SPDX-License-Identifier: GPL-2.0-or-later
// The words under which a content is found.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace fileindexd {

struct Content;

struct ContentTerm {
  std::string term;
  uint64_t count = 0;
};

// As the full-text table holds them for that language (one of LanguageName): stems beside words, in
// byte order.
std::vector<ContentTerm> TermsOf(const Content& content, const std::string& language);

}  // namespace fileindexd
