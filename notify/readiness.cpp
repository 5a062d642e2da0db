// SPDX-License-Identifier: GPL-2.0-or-later
#include "notify/readiness.h"

#include <systemd/sd-daemon.h>

#include <algorithm>
#include <cstdint>

namespace fileindexd {

// A service manager that cannot be told is no reason to stop watching: the results are dropped.

void TellReady() {
  (void)sd_notify(0, "READY=1");
}

void TellStatus(const std::string& line) {
  std::string message = "STATUS=" + line;
  // A newline would begin another assignment.
  std::replace(message.begin(), message.end(), '\n', ' ');
  (void)sd_notify(0, message.c_str());
}

void TellAlive() {
  (void)sd_notify(0, "WATCHDOG=1");
}

void TellBusy() {
  (void)sd_notify(0, "WATCHDOG=1\nEXTEND_TIMEOUT_USEC=60000000");
}

void TellStopping() {
  (void)sd_notify(0, "STOPPING=1");
}

std::optional<std::chrono::microseconds> AliveInterval() {
  uint64_t limit = 0;
  if (sd_watchdog_enabled(0, &limit) <= 0) {
    return std::nullopt;
  }
  return std::chrono::microseconds(limit / 2);
}

}  // namespace fileindexd
