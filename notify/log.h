// SPDX-License-Identifier: GPL-2.0-or-later
// Log lines of the notification service: standard error, or syslog as `fileindex-notifyd`,
// facility daemon.
#pragma once

namespace fileindexd {

enum class LogTarget { STANDARD_ERROR, SYSLOG };

// Opens the log. Debug lines are written if FILEINDEXD_LOG_LEVEL is "debug".
void OpenLog(LogTarget target);

// One line each, from any thread. On standard error with systemd's priority prefix ("<3>") when
// that is the journal. "%m" tells of errno as it is at the call.
[[gnu::format(printf, 1, 2)]] void LogError(const char* format, ...);
[[gnu::format(printf, 1, 2)]] void LogInfo(const char* format, ...);
[[gnu::format(printf, 1, 2)]] void LogDebug(const char* format, ...);

}  // namespace fileindexd
