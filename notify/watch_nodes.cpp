// SPDX-License-Identifier: GPL-2.0-or-later
#include "notify/watch_nodes.h"

#include <utility>
#include <vector>

namespace fileindexd {

WatchNode* WatchNodes::SetRoot(const std::string& path, int wd) {
  by_wd.clear();
  root = std::make_unique<WatchNode>();
  root->name = path;
  root->wd = wd;
  by_wd[wd] = root.get();
  return root.get();
}

WatchNode* WatchNodes::Find(int wd) const {
  const auto found = by_wd.find(wd);
  return found == by_wd.end() ? nullptr : found->second;
}

std::string WatchNodes::PathOf(const WatchNode& node) const {
  std::vector<const WatchNode*> way;
  for (const WatchNode* at = &node; at->parent != nullptr; at = at->parent) {
    way.push_back(at);
  }
  std::string path = root->name;
  for (auto at = way.rbegin(); at != way.rend(); ++at) {
    if (path != "/") {
      path += '/';
    }
    path += (*at)->name;
  }
  return path;
}

std::unique_ptr<WatchNode> WatchNodes::Take(WatchNode& parent, const std::string& name) {
  const auto found = parent.children.find(name);
  if (found == parent.children.end()) {
    return nullptr;
  }
  auto taken = std::move(found->second);
  parent.children.erase(found);
  return taken;
}

WatchNode* WatchNodes::Put(WatchNode& parent, const std::string& name, int wd,
                           std::unique_ptr<WatchNode>& dropped) {
  WatchNode* known = Find(wd);
  if (known != nullptr && known->parent == &parent && known->name == name) {
    return known;
  }
  for (const WatchNode* above = &parent; above != nullptr; above = above->parent) {
    if (above == known) {
      return nullptr;
    }
  }

  std::unique_ptr<WatchNode> node =
      known != nullptr ? Take(*known->parent, known->name) : std::make_unique<WatchNode>();
  dropped = Take(parent, name);
  node->parent = &parent;
  node->name = name;
  node->wd = wd;
  by_wd[wd] = node.get();
  return (parent.children[name] = std::move(node)).get();
}

}  // namespace fileindexd
