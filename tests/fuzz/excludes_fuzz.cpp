// SPDX-License-Identifier: GPL-2.0-or-later
// The input is a list of exclude patterns, a line each; an empty line; and the path that they are
// asked about, relative to their folder.
#include <sstream>
#include <string>

#include "fuzz/target.h"
#include "state/excludes.h"

namespace fileindexd::fuzz {

namespace {

bool IsOut(const Excludes& excludes, const std::string& path, Leaf leaf) {
  const Excludes::Match match = excludes.KeepOut(path, leaf);
  Require(match.length <= path.size(), "what matches is a part of the path");
  Require((match.pattern == nullptr) == (match.length == 0), "a match has a length");
  return match.pattern != nullptr;
}

void Judge(const Excludes& excludes, const std::string& path) {
  const bool directory = IsOut(excludes, path, Leaf::DIRECTORY);
  const bool other = IsOut(excludes, path, Leaf::OTHER);
  Require(!IsOut(excludes, path, Leaf::UNKNOWN) || (directory && other),
          "whatever it is, it is kept out");
  for (const Leaf leaf : {Leaf::DIRECTORY, Leaf::OTHER, Leaf::UNKNOWN}) {
    Require(!directory || IsOut(excludes, path + "/below", leaf),
            "what is below a directory that is kept out stays out");
  }
}

// A relative path of whole components.
bool IsRelativePath(const std::string& path) {
  return !path.empty() && path.front() != '/' && path.back() != '/' &&
         path.find("//") == std::string::npos;
}

}  // namespace

}  // namespace fileindexd::fuzz

int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  std::istringstream stream(std::string(reinterpret_cast<const char*>(data), size));
  fileindexd::Excludes excludes;
  std::string line;
  while (std::getline(stream, line) && !line.empty()) {
    std::string error;
    const bool added = excludes.Add(line, error);
    fileindexd::fuzz::Require(added == error.empty(), "added, or a reason");
    fileindexd::fuzz::Require(error.find('\n') == std::string::npos, "a reason in one line");
  }
  std::string path;
  std::getline(stream, path, '\0');
  if (fileindexd::fuzz::IsRelativePath(path)) {
    fileindexd::fuzz::Judge(excludes, path);
  }
  return 0;
}
