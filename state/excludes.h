// SPDX-License-Identifier: GPL-2.0-or-later
// Patterns that keep paths out of an index, as in gitignore.
//
//   pattern = [ "!" ] [ "/" ] part { "/" part } [ "/" ]
//
// A "/" at the beginning or in the middle binds the pattern to the folder; without one it is
// compared with the name alone, at any depth. A "/" at the end: directories only. In a part: "*"
// any bytes, "?" one byte, "[a-z]" "[!a-z]" "[[:digit:]]" one byte of a set, "\" takes the next
// byte as it is. A part "**" stands for any number of directories, at the end for all that is
// below. "!" takes in again what an earlier pattern keeps out: the last pattern that matches
// decides. What lies below a directory that is kept out stays out. Blanks at the end do not count,
// unless "\" stands before; "#" is an ordinary byte. Bytes are compared as they are.
//
// Once filled, an object may be used from several threads.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

#include "state/exclude_pattern.h"

namespace fileindexd {

constexpr size_t MAX_EXCLUDES = 1000;  // patterns of a folder

// What the last component of a path is. Those above it are directories. UNKNOWN: only what keeps
// out whatever it may be counts.
enum class Leaf { DIRECTORY, OTHER, UNKNOWN };

class Excludes {
 public:
  // False when it is no pattern, or there are too many; `error` then says so in one line that names
  // it, and nothing was added.
  bool Add(const std::string& pattern, std::string& error);

  struct Match {
    const std::string* pattern = nullptr;  // null: nothing keeps the path out
    size_t length = 0;                     // of the leading part of the path that it matches
  };
  // `below` is a path relative to the folder, with no slash at its beginning or end. An empty one,
  // the folder itself, is never kept out.
  Match KeepOut(std::string_view below, Leaf leaf) const;

  bool operator==(const Excludes& other) const { return patterns == other.patterns; }

  std::vector<std::string> patterns;  // as written, in order; Add alone changes it
  // Whether a pattern takes in directories alone ("!*/"): then a name that keeps out a file may not
  // keep out a directory. Add alone changes it.
  bool takes_in_directories = false;

 private:
  using Components = std::vector<std::string_view>;
  const std::string* KeepOutLast(const Components& components, size_t count, Leaf leaf) const;

  std::vector<ExcludePattern> compiled;  // of `patterns`
};

}  // namespace fileindexd
