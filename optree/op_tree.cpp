// SPDX-License-Identifier: GPL-2.0-or-later
#include "optree/op_tree.h"

#include <algorithm>
#include <memory>

#include "platform/log.h"
#include "platform/paths.h"

namespace fileindexd {

namespace {

// Tests nodes against one path: path + "/" begins with the node's path + "/", so that /a/b does not
// cover /a/bc. An insertion tests every sibling on its way down. So the first string is built once,
// in a buffer that each thread keeps, and the second one is compared where it lies, its slash
// apart: a test writes nothing and allocates nothing.
class CoverTest {
 public:
  explicit CoverTest(const std::string& path) : text(Kept()) { text.assign(path).push_back('/'); }

  bool IsCoveredBy(const OpNode& node) const {
    const size_t length = node.name.size();
    return length < text.size() && text[length] == '/' &&
           TALO::FILEINDEX::StringStartWith(text, node.name);
  }

 private:
  static std::string& Kept() {
    thread_local std::string kept;
    return kept;
  }

  std::string& text;
};

// The first child that covers the path, the node itself when none does, null when not even that.
OpNode* FindCoveringChild(OpNode* node, const CoverTest& test) {
  if (!test.IsCoveredBy(*node)) {
    return nullptr;
  }

  for (OpNode* child : node->children) {
    if (test.IsCoveredBy(*child)) {
      return child;
    }
  }

  return node;
}

void Adopt(OpNode* parent, OpNode* child) {
  child->parent = parent;
  parent->children.push_back(child);
}

// Puts a grouping node over `node` and the new one, side by side in that order.
//
// Wanted: the grouping node is not merged with one of the same name, and `node` is not moved below
// the new node even when that covers it. Its operation is then executed first.
void SplitNode(OpTree* tree, OpNode* node, int op, const std::string& path,
               const Json::Value& data) {
  const std::string common = CommonParent(*node, path);
  auto added = std::make_unique<OpNode>(op, path, data);
  auto group = std::make_unique<OpNode>(OP_NOP, common, Json::Value(Json::nullValue));
  FI_DEBUG("SplitNode parent(%s, %s)=%s", node->name.c_str(), path.c_str(), common.c_str());

  OpNode* top = group.get();
  if (node->parent != nullptr) {
    OpNode* above = node->parent;
    RemoveChild(above, node);
    Adopt(above, group.release());
  } else {
    tree->root = group.release();
  }

  Adopt(top, node);
  Adopt(top, added.release());
}

// Adds a node below `node`, which covers it while none of its children does. Children that lie
// below the new path move under it.
void AppendNode(OpNode* node, int op, const std::string& path, const Json::Value& data) {
  auto added = std::make_unique<OpNode>(op, path, data);
  const std::vector<OpNode*> children = node->children;
  FI_DEBUG("AppendNode %s to %s", path.c_str(), node->name.c_str());

  if (node->op == OP_REINDEX) {
    return;  // the whole subtree is looked at again anyway
  }
  if (node->op < OP_UNKNOWN || node->op > OP_NOP) {
    FI_LOG("Unknown OP=%d, path=%s", op, path.c_str());
    return;
  }

  for (OpNode* child : children) {
    if (Covers(*added, child->name)) {
      RemoveChild(node, child);
      Adopt(added.get(), child);
    }
  }

  Adopt(node, added.release());
}

}  // namespace

OpNode::~OpNode() {
  ClearChildren(this);
}

bool Covers(const OpNode& node, const std::string& path) {
  return CoverTest(path).IsCoveredBy(node);
}

std::string CommonParent(const OpNode& node, const std::string& path) {
  const size_t length = std::min(path.size(), node.name.size());
  size_t last = 0;
  for (size_t i = 0; i < length; ++i) {
    if (path[i] == '/' && node.name[i] == '/') {
      last = i;
    }
    if (path[i] != node.name[i]) {
      break;
    }
  }

  return node.name.substr(0, last);
}

void RemoveChild(OpNode* node, OpNode* child) {
  const auto found = std::find(node->children.begin(), node->children.end(), child);
  if (found == node->children.end()) {
    return;
  }

  child->parent = nullptr;
  node->children.erase(found);
}

void ClearChildren(OpNode* node) {
  for (OpNode* child : node->children) {
    delete child;
  }
  node->children.clear();
}

bool OpTree::Insert(int op, const std::string& path, const Json::Value& data) {
  if (root == nullptr) {
    root = new OpNode(op, path, data);
    return true;
  }

  const CoverTest test(path);
  OpNode* current = root;
  for (;;) {
    if (current->name == path) {
      AbsortOP(current, op, data);
      return true;
    }

    OpNode* next = FindCoveringChild(current, test);
    if (next == nullptr) {
      SplitNode(this, current, op, path, data);
      return true;
    }
    if (next == current) {
      AppendNode(current, op, path, data);
      return true;
    }
    current = next;
  }
}

OpTree::iterator OpTree::begin() {
  iterator first(root, root);
  if (root != nullptr) {
    first.positions.push_back(0);
    if (root->op == OP_NOP) {
      ++first;
    }
  }
  return first;
}

OpTree::iterator& OpTree::iterator::operator++() {
  while (current != nullptr) {
    const int entered = positions.back() + 1;
    positions.pop_back();

    if (entered <= static_cast<int>(current->children.size())) {
      positions.push_back(entered);
      current = current->children.at(static_cast<size_t>(entered) - 1);
      positions.push_back(0);
      if (current->op != OP_NOP) {
        return *this;
      }
    } else {
      current = current->parent;
    }
  }
  return *this;
}

}  // namespace fileindexd
