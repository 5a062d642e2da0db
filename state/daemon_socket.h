// SPDX-License-Identifier: GPL-2.0-or-later
// The daemon's control socket, from the client's side.
//
//   request  length (4 bytes, host byte order) body (`length` bytes: JSON text and its NUL)
//   reply    0 or -1 (4 bytes, host byte order)
//
// The body is {"type":TEXT,"data":{...}}. The daemon serves one client at a time and may be busy
// with stopping a Worker for 52 s.
#pragma once

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

// Sends one command, the body without its NUL, and waits for its reply. When `cancel_fd` becomes
// readable, waiting ends at once with NO_ANSWER; the daemon may carry out the command all the same.
Reply SendToDaemon(const std::string& command, int cancel_fd = -1);

}  // namespace fileindexd
