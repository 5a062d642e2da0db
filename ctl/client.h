// SPDX-License-Identifier: GPL-2.0-or-later
// The daemon's control socket, from the client's side.
//
//   request  length (4 bytes, host byte order) body (`length` bytes: JSON text and its NUL)
//   reply    0 or -1 (4 bytes, host byte order)
//
// The daemon serves one client at a time and may be busy with stopping a Worker for 52 s.
#pragma once

#include <json/value.h>

#include <string>

namespace fileindexd {

constexpr const char* DAEMON_PROGRAM = "fileindexd";
constexpr const char* DAEMON_PID_FILE = "/var/run/fileindexd.pid";
constexpr const char* CONTROL_SOCKET = "/var/run/fileindexd.sock";

enum class Reply {
  DONE,
  REFUSED,      // the daemon answered -1
  NOT_RUNNING,  // nobody listens
  NO_ANSWER,    // the daemon is there and did not answer within 70 s, or hung up
};

// Sends one command and waits for its reply. `data` is an object.
Reply AskDaemon(const std::string& type, const Json::Value& data);

// The exit code that a reply means, its line written unless it is EXIT_DONE. `subject` is what the
// command was about. A daemon that does not run is no failure here: what it needs to know is
// stored, and read when it starts.
int CodeOfReply(Reply reply, const std::string& subject);
// The same for a command that is nothing without the daemon.
int CodeOfNeededReply(Reply reply, const std::string& subject);

}  // namespace fileindexd
