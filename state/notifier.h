// SPDX-License-Identifier: GPL-2.0-or-later
// Asking the notification service.
//
//   request  one JSON object and a newline    {"type":"status"}
//                                             {"type":"sync","shares":[NAME,...]}
//   reply    one JSON object and a newline    {"ok":true,...} or {"ok":false,"error":TEXT}
//
// "sync" answers when all that had happened before on the disks of those shares (none given: of
// all) is in queue files. "status" answers {"ok":true,"shares":[{...},...]} at once:
//
//   name           text
//   watched_by     "fanotify", "inotify" or "comparison"; null: not at all, `problem` says why
//   problem        text; empty: none
//   changes, lines, folded, overflows    numbers, since the service started
//   backlog        lines that are not in the queue file yet
//   complete_until seconds since the epoch: all that happened before is in the queue or the index;
//                  null: nobody knows, a comparison is due
//   compared       null, or {"ended":S,"differences":N,"error":TEXT or null}: the last comparison
//   comparing      bool: one runs or waits
#pragma once

#include <chrono>
#include <string>

namespace fileindexd {

constexpr const char* NOTIFIER_PROGRAM = "fileindex-notifyd";
constexpr const char* NOTIFIER_SOCKET = "/var/run/fileindex-notifyd.sock";
constexpr const char* NOTIFIER_PID_FILE = "/var/run/fileindex-notifyd.pid";
constexpr const char* NOTIFIER_LOCK_FILE = "/var/run/fileindex-notifyd.lock";

enum class NotifierReply {
  ANSWERED,
  NOT_RUNNING,  // nobody listens
  NO_ANSWER,    // not within the time, or it hung up
};

// Sends a request (without its newline) and waits for the reply, which comes without its newline.
NotifierReply AskNotifier(const std::string& request, std::chrono::milliseconds patience,
                          std::string& reply);

}  // namespace fileindexd
