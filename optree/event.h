// SPDX-License-Identifier: GPL-2.0-or-later
// Event records: the lines of a queue file, and the operations that they stand for.
//
//   line  = JSON object
//   keys  = "event"     unsigned integer, the bits, base/event_codes.h         (required)
//           "path"      string, full path of what changed         (required)
//           "path_old"  string, the former path of a rename
//           "data"      any value; goes into the tree unchanged
#pragma once

#include <cstdint>
#include <string>

#include "base/event_codes.h"
#include "optree/op_tree.h"
#include "platform/json.h"

namespace fileindexd {

// One parsed line.
struct FileEvent {
  uint32_t code = 0;
  std::string path;
  std::string path_old;
  Json::Value data;
};

// Parses one line and inserts its operations. False for a malformed line, and never otherwise.
// Throws where a member cannot be read as what it has to be, or where absorption does.
bool AddEvent(OpTree& tree, const std::string& line);

// The operation of a code without a rename bit; of several bits the last in a fixed order holds.
// OP_UNKNOWN, with a log line, when no bit is known. `path` is only logged.
int EventToOp(uint32_t code, const std::string& path);

}  // namespace fileindexd
