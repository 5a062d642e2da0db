// SPDX-License-Identifier: GPL-2.0-or-later
#include <utility>

#include "optree/op_tree.h"
#include "platform/log.h"
#include "platform/paths.h"

namespace fileindexd {

namespace {

// A flag once true stays true; afterwards all four are there, as booleans. All or nothing: where
// the data cannot take them, or holds a member of that name that is no flag, it stays as it was.
void MergeFlags(OpNode* node, const Json::Value& data) {
  // Wanted: one boolean serves all four reads and is not reset, so a flag that the new data lacks
  // takes the value that was read for the flag before it.
  bool flag = false;
  Json::Value merged = node->data;
  for (const char* key : {"document", "audio", "video", "photo"}) {
    TALO::FILEINDEX::RetrieveBoolFromJsonObj(flag, key, data);
    const bool before = merged.get(key, false).asBool();
    merged[key] = before || flag;
  }
  node->data = std::move(merged);
}

}  // namespace

void AbsortOP(OpNode* node, int op, const Json::Value& data) {
  // First, as a merge may throw: what was pending below is dropped in any case.
  if (op == OP_DELETE || op == OP_REINDEX) {
    ClearChildren(node);
  }

  // Wanted: the pending operation decides, not the new one. An update of a subtree stays one even
  // when the path is deleted: it is followed by a clean walk.
  if (node->op == OP_UPDATE_DIR) {
    FI_DEBUG("AbsortOP %s: %d, data merged", node->name.c_str(), node->op);
    MergeFlags(node, data);
  } else if (node->op == OP_REINDEX) {
    FI_DEBUG("AbsortOP %s: %d, ignored", node->name.c_str(), node->op);
  } else {
    FI_DEBUG("AbsortOP %s: %d -> %d", node->name.c_str(), node->op, op);
    node->op = op;
    node->data = data;
  }
}

}  // namespace fileindexd
