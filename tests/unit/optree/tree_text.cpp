// SPDX-License-Identifier: GPL-2.0-or-later
#include "unit/optree/tree_text.h"

#include <gtest/gtest.h>

namespace fileindexd {

namespace {

void RenderNode(const OpNode& node, const OpNode* parent, std::string& text) {
  text += node.parent == parent ? "" : "!";
  text += std::to_string(node.op) + " " + node.name;
  if (!node.data.isNull()) {
    text += "=" + node.data.toString();
  }
  const char* separator = " {";
  for (const OpNode* child : node.children) {
    text += separator;
    RenderNode(*child, &node, text);
    separator = ", ";
  }
  text += node.children.empty() ? "" : "}";
}

}  // namespace

std::string Render(const OpTree& tree) {
  if (tree.root == nullptr) {
    return "empty";
  }
  std::string text;
  RenderNode(*tree.root, nullptr, text);
  return text;
}

std::vector<std::string> Walk(OpTree& tree) {
  std::vector<std::string> yielded;
  for (auto at = tree.begin(); at != tree.end(); ++at) {
    yielded.push_back(std::to_string((*at)->op) + " " + (*at)->name);
  }
  return yielded;
}

Json::Value Parse(const std::string& text) {
  Json::Value value;
  EXPECT_TRUE(value.fromString(text)) << text;
  return value;
}

}  // namespace fileindexd
