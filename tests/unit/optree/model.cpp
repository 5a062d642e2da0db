// SPDX-License-Identifier: GPL-2.0-or-later
#include "unit/optree/model.h"

#include <set>

namespace fileindexd {

namespace {

constexpr int DELETE = 2;
constexpr int UPDATE_DIR = 5;
constexpr int REINDEX = 6;
constexpr int NOP = 7;

// All directories of an absolute path, itself included: "" for "/a", then "/a", then "/a/b".
std::set<std::string> SelfAndAbove(const std::string& path) {
  std::set<std::string> all = {path};
  for (size_t slash = path.find('/'); slash != std::string::npos;
       slash = path.find('/', slash + 1)) {
    all.insert(path.substr(0, slash));
  }
  return all;
}

bool IsAtOrBelow(const std::string& path, const std::string& above) {
  return SelfAndAbove(path).contains(above);
}

std::string DeepestShared(const std::string& one, const std::string& other) {
  std::string deepest;
  for (const std::string& above : SelfAndAbove(one)) {
    const bool strict = above != one && above != other;
    if (strict && IsAtOrBelow(other, above) && above.size() > deepest.size()) {
      deepest = above;
    }
  }
  return deepest;
}

void Merge(Json::Value& into, const Json::Value& added) {
  bool carried = false;
  for (const char* flag : {"document", "audio", "video", "photo"}) {
    if (added.isObject() && added.isMember(flag) && added[flag].isBool()) {
      carried = added[flag].asBool();
    }
    const bool was = into.isObject() && into.isMember(flag) && into[flag].asBool();
    into[flag] = was || carried;
  }
}

void Absorb(ModelNode& node, int op, const Json::Value& data) {
  const int pending = node.op;
  if (pending == UPDATE_DIR) {
    Merge(node.data, data);
  }
  if (pending != UPDATE_DIR && pending != REINDEX) {
    node.op = op;
    node.data = data;
  }
  if (op == DELETE || op == REINDEX) {
    node.children.clear();
  }
}

// `node` is at or above `path`.
void Place(ModelNode& node, int op, const std::string& path, const Json::Value& data) {
  if (node.path == path) {
    Absorb(node, op, data);
    return;
  }
  for (ModelNode& child : node.children) {
    if (IsAtOrBelow(path, child.path)) {
      Place(child, op, path, data);
      return;
    }
  }
  if (node.op == REINDEX) {
    return;
  }

  ModelNode added{op, path, data, {}};
  std::vector<ModelNode> staying;
  for (const ModelNode& child : node.children) {
    (IsAtOrBelow(child.path, path) ? added.children : staying).push_back(child);
  }
  staying.push_back(added);
  node.children = staying;
}

std::string Text(const ModelNode& node) {
  std::string text = std::to_string(node.op) + " " + node.path;
  if (!node.data.isNull()) {
    text += "=" + node.data.toString();
  }
  std::string below;
  for (const ModelNode& child : node.children) {
    below += (below.empty() ? "" : ", ") + Text(child);
  }
  return below.empty() ? text : text + " {" + below + "}";
}

void Yield(const ModelNode& node, std::vector<std::string>& yielded) {
  if (node.op != NOP) {
    yielded.push_back(std::to_string(node.op) + " " + node.path);
  }
  for (const ModelNode& child : node.children) {
    Yield(child, yielded);
  }
}

}  // namespace

void Model::Insert(int op, const std::string& path, const Json::Value& data) {
  if (root.empty()) {
    root.push_back({op, path, data, {}});
  } else if (IsAtOrBelow(path, root[0].path)) {
    Place(root[0], op, path, data);
  } else {
    const ModelNode old = root[0];
    root[0] = {NOP, DeepestShared(old.path, path), Json::Value(), {old, {op, path, data, {}}}};
  }
}

std::string Model::Render() const {
  return root.empty() ? "empty" : Text(root[0]);
}

std::vector<std::string> Model::Walk() const {
  std::vector<std::string> yielded;
  for (const ModelNode& node : root) {
    Yield(node, yielded);
  }
  return yielded;
}

}  // namespace fileindexd
