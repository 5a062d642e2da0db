// SPDX-License-Identifier: GPL-2.0-or-later
// The input is a drained queue file: its lines go into a tree, which is then walked.
#include <exception>
#include <sstream>
#include <string>

#include "fuzz/target.h"
#include "optree/event.h"
#include "optree/op_tree.h"
#include "scripted/script.h"

namespace fileindexd::fuzz {

namespace {

// Every node has the tree's shape around it right, and is an operation that exists.
size_t CountNodes(const OpNode& node) {
  Require(node.op >= OP_UNKNOWN && node.op <= OP_NOP, "an operation that exists");
  size_t count = 1;
  for (const OpNode* child : node.children) {
    Require(child->parent == &node, "a child knows its parent");
    count += CountNodes(*child);
  }
  return count;
}

void Fill(OpTree& tree, const std::string& text, size_t& lines) {
  std::istringstream stream(text);
  for (std::string line; std::getline(stream, line); ++lines) {
    try {
      (void)AddEvent(tree, line);
    } catch (const std::exception&) {
      continue;  // costs this line, as in a drain
    }
  }
}

}  // namespace

}  // namespace fileindexd::fuzz

int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  using namespace fileindexd;  // NOLINT: a function that only C can name
  OpTree tree("/share");
  size_t lines = 0;
  fuzz::Fill(tree, std::string(reinterpret_cast<const char*>(data), size), lines);

  const size_t nodes = tree.root == nullptr ? 0 : fuzz::CountNodes(*tree.root);
  fuzz::Require(nodes <= 4 * lines, "two operations a line, and a group for each");
  size_t walked = 0;
  const OpTree::iterator end = tree.end();
  for (OpTree::iterator it = tree.begin(); it != end && *it != nullptr; ++it) {
    ++walked;
    (void)(*it)->data.toString();
  }
  fuzz::Require(walked <= nodes, "the walk ends");
  scripted::TheScript().Forget();
  return 0;
}
