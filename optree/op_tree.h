// SPDX-License-Identifier: GPL-2.0-or-later
// Pending operations of one drained batch, by path.
//
// Inserting merges operations on the same path and groups neighbours under their common directory,
// so that each path is executed once, parents first. A tree belongs to one thread and one batch;
// nothing here locks.
//
// Paths are byte strings: "." and "//" are not resolved, letter case counts.
#pragma once

#include <deque>
#include <string>
#include <vector>

#include "platform/json.h"

namespace fileindexd {

// The one operation still to be done at a path. Codes 1 to 6 are executed, nothing else is.
enum OpCode : int {
  OP_UNKNOWN = 0,     // an event without a known bit
  OP_ADD = 1,         // add the document
  OP_DELETE = 2,      // remove the path
  OP_ADD_DIR = 3,     // walk the directory and add what it holds
  OP_UPDATE = 4,      // update the document
  OP_UPDATE_DIR = 5,  // update the subtree with the node's flags, then clean it
  OP_REINDEX = 6,     // index the whole subtree again
  OP_NOP = 7,         // groups children, is never executed
};

struct OpNode {
  OpNode(int pending, const std::string& path, const Json::Value& event_data)
      : op(pending), name(path), data(event_data) {}
  OpNode(const OpNode&) = delete;
  OpNode& operator=(const OpNode&) = delete;
  ~OpNode();  // deletes all descendants

  int op;                         // an OpCode
  std::string name;               // the full path, not one component
  Json::Value data;               // the event's, null when it had none
  std::vector<OpNode*> children;  // owned; below this path, in order of insertion
  OpNode* parent = nullptr;       // null for the root
};

class OpTree {
 public:
  explicit OpTree(const std::string& share) : share_path(share) {}
  ~OpTree() { delete root; }
  OpTree(const OpTree&) = delete;
  OpTree& operator=(const OpTree&) = delete;

  // Records `op` at `path` and copies `data`. A node at that path absorbs it; below a pending
  // reindex it is dropped. Always true. Cost: one comparison per child on the way down.
  // Throws where absorption does.
  bool Insert(int op, const std::string& path, const Json::Value& data);

  // Yields nodes in pre-order, children in order of insertion; passes over OP_NOP nodes, not over
  // their descendants.
  class iterator {  // NOLINT(readability-identifier-naming): named as iterators are
   public:
    iterator(OpNode* from, OpNode* at) : root(from), current(at) {}

    OpNode* operator*() const { return current; }
    iterator& operator++();
    bool operator!=(const iterator& other) const {
      return root != other.root || current != other.current;
    }

    OpNode* root;
    OpNode* current;            // null at the end
    std::deque<int> positions;  // top: how many children of `current` were entered
  };
  iterator begin();
  iterator end() { return iterator(root, nullptr); }

  std::string share_path;  // root of the share
  OpNode* root = nullptr;  // owned; null while the tree is empty
};

// True when `path` is the node's own or lies below it.
bool Covers(const OpNode& node, const std::string& path);

// The longest common directory of the node's path and `path`, without a final slash. Empty when
// they share no slash at the same place.
std::string CommonParent(const OpNode& node, const std::string& path);

// Merges a new operation into a node of the same path. Which operation survives is decided by the
// node's own; a new delete or reindex drops what was pending below, in any case. Throws where
// flags have to be merged into data that is neither an object nor null, or that has text, an array
// or an object for one of the four; the data is unchanged then.
void AbsortOP(OpNode* node, int op, const Json::Value& data);

// Takes `child` out of the node's children without deleting it; one that is not there is ignored.
void RemoveChild(OpNode* node, OpNode* child);

// Deletes all children with their descendants.
void ClearChildren(OpNode* node);

}  // namespace fileindexd
