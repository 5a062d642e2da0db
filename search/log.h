// SPDX-License-Identifier: GPL-2.0-or-later
// Log lines of the content service: syslog, as `talocontentsearchd`, facility daemon, and all at
// priority LOG_ERR, as the daemon's.
#pragma once

namespace fileindexd {

// Opens the log. Debug lines are written if FILEINDEXD_LOG_LEVEL is "debug".
void OpenServiceLog();

// "%m" tells of errno as it is at the call.
[[gnu::format(printf, 1, 2)]] void ServiceLog(const char* format, ...);
[[gnu::format(printf, 1, 2)]] void ServiceDebug(const char* format, ...);

}  // namespace fileindexd
