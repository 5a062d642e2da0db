// SPDX-License-Identifier: GPL-2.0-or-later
#include "optree/event.h"

#include "platform/log.h"

namespace fileindexd {

namespace {

bool ParseEvent(const std::string& line, FileEvent& event) {
  Json::Value value;
  if (!value.fromString(line) || !value.isObject() || !value.isMember("event") ||
      !value.isMember("path") || !value["event"].isConvertibleTo(Json::uintValue) ||
      !value["path"].isString()) {
    FI_LOG("Malformed event: %s", line.c_str());
    return false;
  }

  event.code = value["event"].asUInt();
  event.data = value.get("data", Json::Value(Json::nullValue));
  event.path = value["path"].asString();
  event.path_old = value.get("path_old", "").asString();
  return true;
}

}  // namespace

bool AddEvent(OpTree& tree, const std::string& line) {
  FileEvent event;
  if (!ParseEvent(line, event)) {
    return false;
  }

  if ((event.code & QLIB_NOTIFY_RENAME) != 0) {
    FI_DEBUG("QLIB_NOTIFY_RENAME: %s", event.path.c_str());
    return tree.Insert(OP_REINDEX, event.path_old, event.data) &&
           tree.Insert(OP_ADD_DIR, event.path, event.data);
  }

  if ((event.code & QLIB_NOTIFY_RENAME_FULL) != 0) {
    // Wanted: the words of a plain rename.
    FI_DEBUG("QLIB_NOTIFY_RENAME: %s", event.path.c_str());
    return tree.Insert(OP_REINDEX, tree.share_path, Json::Value(Json::nullValue));
  }

  return tree.Insert(EventToOp(event.code, event.path), event.path, event.data);
}

int EventToOp(uint32_t code, const std::string& path) {
  int op = OP_UNKNOWN;

  if ((code & QLIB_NOTIFY_MODIFY) != 0) {
    op = OP_UPDATE;
    FI_DEBUG("QLIB_NOTIFY_MODIFY: %s", path.c_str());
  }
  if ((code & QLIB_NOTIFY_ATTRIB) != 0) {
    op = OP_UPDATE;
    FI_DEBUG("QLIB_NOTIFY_ATTRIB: %s", path.c_str());
  }
  if ((code & QLIB_NOTIFY_CLOSE_WRITE) != 0) {
    op = OP_ADD;
    FI_DEBUG("QLIB_NOTIFY_CLOSE_WRITE: %s", path.c_str());
  }
  if ((code & QLIB_NOTIFY_CREATE) != 0) {
    op = OP_ADD;
    FI_DEBUG("QLIB_NOTIFY_CREATE: %s", path.c_str());
  }
  if ((code & QLIB_NOTIFY_DELETE) != 0) {
    op = OP_DELETE;
    FI_DEBUG("QLIB_NOTIFY_DELETE: %s", path.c_str());
  }
  if ((code & QLIB_NOTIFY_QUEUE_RESET) != 0) {
    op = OP_NOP;
    FI_DEBUG("QLIB_NOTIFY_QUEUE_RESET: %s", path.c_str());
  }
  if ((code & CUSTOM_EVENT_REINDEX) != 0) {
    op = OP_REINDEX;
    FI_DEBUG("CUSTOM_EVENT_REINDEX: %s", path.c_str());
  }
  if ((code & CUSTOM_EVENT_UPDATE) != 0) {
    op = OP_UPDATE_DIR;
    FI_DEBUG("CUSTOM_EVENT_UPDATE: %s", path.c_str());
  }

  if (op == OP_UNKNOWN) {
    FI_LOG("Unknown event: %u, path=%s", code, path.c_str());
  }
  return op;
}

}  // namespace fileindexd
