// SPDX-License-Identifier: GPL-2.0-or-later
// Waiting until the index has caught up with the disk.
#pragma once

#include <chrono>
#include <string>
#include <vector>

#include "ctl/places.h"

namespace fileindexd {

// Until all that had happened before to the files of these shares is in the index, names and
// attributes; of no share, at once. Returns EXIT_DONE, or the exit code with its line written:
// EXIT_FAILED after `patience`, or when the notification service is of no help; EXIT_NO_DAEMON when
// there is work for the daemon and it does not run.
int AwaitChanges(Session& session, const std::vector<std::string>& shares,
                 std::chrono::seconds patience);

}  // namespace fileindexd
