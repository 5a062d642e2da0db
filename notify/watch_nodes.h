// SPDX-License-Identifier: GPL-2.0-or-later
// The directories that are watched, as a tree of names.
#pragma once

#include <cstddef>
#include <map>
#include <memory>
#include <string>
#include <unordered_map>

namespace fileindexd {

struct WatchNode {
  WatchNode* parent = nullptr;  // null: the root
  std::string name;             // of the root: its path
  int wd = -1;
  std::map<std::string, std::unique_ptr<WatchNode>, std::less<>> children;
};

// One thread. A watch descriptor belongs to one node: the kernel has one for each directory,
// whatever its names.
class WatchNodes {
 public:
  // Makes the root, and drops what was here. The watches themselves are the caller's.
  WatchNode* SetRoot(const std::string& path, int wd);

  // Null for a descriptor that belongs to none any more.
  WatchNode* Find(int wd) const;
  std::string PathOf(const WatchNode& node) const;

  // The node of `wd`, now called `name` in `parent`. Whatever had that name is moved to `dropped`,
  // or left to be null. A node that stood elsewhere is moved with all below it; null if `parent`
  // lies below it, which tells that the tree is out of date.
  WatchNode* Put(WatchNode& parent, const std::string& name, int wd,
                 std::unique_ptr<WatchNode>& dropped);

  // Takes a child out of the tree; null if there is none. Its descriptors stay known until Forget.
  static std::unique_ptr<WatchNode> Take(WatchNode& parent, const std::string& name);
  void Forget(int wd) { by_wd.erase(wd); }

  size_t Count() const { return by_wd.size(); }

  std::unique_ptr<WatchNode> root;
  std::unordered_map<int, WatchNode*> by_wd;
};

}  // namespace fileindexd
