// SPDX-License-Identifier: GPL-2.0-or-later
// What the Worker asked of its indexer, and the lines that it owes to how that ended.
#pragma once

namespace fileindexd::fault {

// Since the beginning of the process, in which the log level was debug: for each addition, update,
// deletion and commit, done or failed, the line that tells of it was written once, and no other.
void ExpectEachOperationLogged();

}  // namespace fileindexd::fault
