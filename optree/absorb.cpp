// SPDX-License-Identifier: GPL-2.0-or-later
#include "optree/op_tree.h"
#include "platform/log.h"
#include "platform/paths.h"

namespace fileindexd {

namespace {

// A flag once true stays true; afterwards all four are there, as booleans.
void MergeFlags(OpNode* node, const Json::Value& data) {
  // Wanted: one boolean serves all four reads and is not reset, so a flag that the new data lacks
  // takes the value that was read for the flag before it.
  bool flag = false;
  for (const char* key : {"document", "audio", "video", "photo"}) {
    TALO::FILEINDEX::RetrieveBoolFromJsonObj(flag, key, data);
    const bool before = node->data.get(key, false).asBool();
    node->data[key] = before || flag;
  }
}

}  // namespace

void AbsortOP(OpNode* node, int op, const Json::Value& data) {
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

  if (op == OP_DELETE || op == OP_REINDEX) {
    ClearChildren(node);
  }
}

}  // namespace fileindexd
