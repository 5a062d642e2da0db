// SPDX-License-Identifier: GPL-2.0-or-later
// One exclude pattern, taken apart; see excludes.h for what patterns mean.
#pragma once

#include <bitset>
#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

namespace fileindexd {

constexpr size_t MAX_EXCLUDE_LENGTH = 4096;  // bytes

struct ExcludePattern {
  enum class Token { BYTE, ANY_BYTE, SET, ANY_BYTES };
  struct Atom {
    Token token = Token::BYTE;
    char byte = 0;
    size_t set = 0;  // in `sets`
  };
  // What stands between two slashes.
  struct Part {
    bool any_depth = false;  // "**": any number of components, none too
    std::vector<Atom> atoms;
    std::vector<std::bitset<256>> sets;
    size_t shortest = 0;  // bytes that it takes at least
  };

  bool negated = false;
  bool directory_only = false;
  bool name_alone = false;  // one part, compared with the last component
  std::vector<Part> parts;
};

// False when `text` is no pattern, and `error` then says why in one line that names it.
bool ReadExcludePattern(const std::string& text, ExcludePattern& pattern, std::string& error);

// Whether the pattern matches the first `count` (at least one) of the components. Cost: at most the
// product of the lengths of both.
bool MatchesExcludePattern(const ExcludePattern& pattern,
                           const std::vector<std::string_view>& components, size_t count);

}  // namespace fileindexd
