// SPDX-License-Identifier: GPL-2.0-or-later
// Draining a share's queue file.
//
// The notification service appends one JSON object per line, under an exclusive flock on the queue
// file. A drain takes the same lock only to move the file aside, and then reads the copy in peace.
// Runs on the share's Worker thread; there is never a second reader of one queue.
#pragma once

#include <string>

#include "optree/op_tree.h"

namespace fileindexd {

// Drains the queue once into a new tree, which the caller deletes; it is empty when there was no
// line. Null when there is nothing to read or the queue cannot be taken. A copy left by an earlier
// drain is read first, and the queue file then waits for a later drain. The copy stays: the caller
// removes it once the tree is executed.
// Blocks for 1.5 s at most while a writer holds the lock, and 16 s where the file cannot be moved.
OpTree* ReadQueue(const std::string& share_path, const std::string& queue_path);

}  // namespace fileindexd
