// SPDX-License-Identifier: GPL-2.0-or-later
// Commands to the daemon, and what their replies mean to the user.
#pragma once

#include <json/value.h>

#include <string>

#include "state/daemon_socket.h"

namespace fileindexd {

// Sends one command and waits for its reply. `data` is an object.
Reply AskDaemon(const std::string& type, const Json::Value& data);

// The exit code that a reply means, its line written unless it is EXIT_DONE. `subject` is what the
// command was about. A daemon that does not run is no failure here: what it needs to know is
// stored, and read when it starts.
int CodeOfReply(Reply reply, const std::string& subject);
// The same for a command that is nothing without the daemon.
int CodeOfNeededReply(Reply reply, const std::string& subject);

}  // namespace fileindexd
