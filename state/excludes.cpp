// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/excludes.h"

#include <utility>

namespace fileindexd {

bool Excludes::Add(const std::string& pattern, std::string& error) {
  if (patterns.size() >= MAX_EXCLUDES) {
    error = "exclude pattern \"" + pattern + "\": a folder has " + std::to_string(MAX_EXCLUDES) +
            " at most";
    return false;
  }
  ExcludePattern read;
  if (!ReadExcludePattern(pattern, read, error)) {
    return false;
  }
  takes_in_directories = takes_in_directories || (read.negated && read.directory_only);
  compiled.push_back(std::move(read));
  patterns.push_back(pattern);
  return true;
}

Excludes::Match Excludes::KeepOut(std::string_view below, Leaf leaf) const {
  if (patterns.empty() || below.empty()) {
    return {};
  }
  if (leaf == Leaf::UNKNOWN) {
    // A directory is kept out by more, or by less where one is taken in again.
    const Match match = KeepOut(below, Leaf::OTHER);
    const bool is_open = match.pattern != nullptr && takes_in_directories &&
                         KeepOut(below, Leaf::DIRECTORY).pattern == nullptr;
    return is_open ? Match() : match;
  }
  Components components;
  for (size_t begin = 0; begin <= below.size();) {
    const size_t slash = below.find('/', begin);
    const size_t end = slash == std::string_view::npos ? below.size() : slash;
    components.push_back(below.substr(begin, end - begin));
    begin = end + 1;
  }

  // From the top: what lies in a directory that is kept out cannot be taken in again.
  size_t length = 0;
  for (size_t count = 1; count <= components.size(); ++count) {
    length += components[count - 1].size();
    const Leaf thing = count < components.size() ? Leaf::DIRECTORY : leaf;
    const std::string* pattern = KeepOutLast(components, count, thing);
    if (pattern != nullptr) {
      return {pattern, length};
    }
    ++length;
  }
  return {};
}

// Null when the last pattern that matches takes in, or none matches.
const std::string* Excludes::KeepOutLast(const Components& components, size_t count,
                                         Leaf leaf) const {
  for (size_t i = compiled.size(); i-- > 0;) {
    const ExcludePattern& pattern = compiled[i];
    if ((!pattern.directory_only || leaf == Leaf::DIRECTORY) &&
        MatchesExcludePattern(pattern, components, count)) {
      return pattern.negated ? nullptr : &patterns[i];
    }
  }
  return nullptr;
}

}  // namespace fileindexd
