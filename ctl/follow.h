// SPDX-License-Identifier: GPL-2.0-or-later
// Following the status.
#pragma once

#include "ctl/places.h"

namespace fileindexd {

// Shows the status, and again whenever it has changed: on a terminal in place, elsewhere as one
// more block, with `json` as one more line. Until SIGINT or SIGTERM comes, or nobody reads. Returns
// the exit code.
int FollowStatus(Session& session, bool json);

}  // namespace fileindexd
