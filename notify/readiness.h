// SPDX-License-Identifier: GPL-2.0-or-later
// What the service tells the service manager, if one started it; without one nothing happens.
#pragma once

#include <chrono>
#include <optional>
#include <string>

namespace fileindexd {

// From any thread. The service is ready: it watches, and answers on its socket.
void TellReady();
// One line for `systemctl status`.
void TellStatus(const std::string& line);
void TellAlive();
// The same from inside long work, also before it is ready: there is progress.
void TellBusy();
void TellStopping();

// How often TellAlive has to be called: at half of the time after which the service manager would
// end the process. None: it does not look.
std::optional<std::chrono::microseconds> AliveInterval();

}  // namespace fileindexd
