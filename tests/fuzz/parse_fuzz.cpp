// SPDX-License-Identifier: GPL-2.0-or-later
// The input is a question. It is understood as a tree of the right shape, or refused with a reason
// in one short line that points into it.
#include <string>

#include "base/utf8.h"
#include "fuzz/target.h"
#include "index/query.h"

namespace fileindexd::fuzz {

namespace {

constexpr time_t NOW = 1'704'412'900;

void CheckShape(const QueryNode& node, size_t length) {
  Require(node.start <= node.end && node.end <= length, "a part lies in the question");
  const size_t below = node.below.size();
  switch (node.part) {
    case Part::AND:
    case Part::OR:
      Require(below >= 2, "a group has two members at least");
      break;
    case Part::NOT:
      Require(below == 1, "a NOT has one");
      break;
    default:
      Require(below == 0, "nothing is below a leaf");
  }
  Require(node.lowest <= node.highest, "a range that holds something");
  for (const QueryNode& child : node.below) {
    CheckShape(child, length);
  }
}

void Parse(const std::string& text) {
  QueryNode query;
  QueryError error;
  if (!ParseQuery(text, NOW, query, error)) {
    const std::string line = error.Line(text);
    Require(error.at <= text.size(), "the place of an error lies in the question");
    Require(!error.what.empty() && line.find('\n') == std::string::npos, "a reason in one line");
    Require(IsUtf8(line) && line.size() < 1000, "which shows no more than a piece of the question");
    return;
  }
  CheckShape(query, text.size());
  Require(!QueryText(query).empty(), "a tree has a text");
}

}  // namespace

}  // namespace fileindexd::fuzz

int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  const std::string text(reinterpret_cast<const char*>(data), size);
  if (fileindexd::IsUtf8(text)) {
    fileindexd::fuzz::Parse(text);
  }
  return 0;
}
