// SPDX-License-Identifier: GPL-2.0-or-later
#include "notify/queue_watch.h"

#include <sys/inotify.h>
#include <unistd.h>

#include <cstddef>
#include <cstring>
#include <string_view>

#include "state/layout.h"

namespace fileindexd {

namespace {

constexpr uint32_t ROOT_EVENTS = IN_MODIFY | IN_CREATE | IN_MOVED_TO | IN_CLOSE_WRITE |
                                 IN_MOVE_SELF | IN_DELETE_SELF | IN_ONLYDIR;
constexpr uint32_t FOLDER_EVENTS = IN_MOVED_FROM | IN_DELETE | IN_ONLYDIR;
constexpr size_t BUFFER_SIZE = 65536;

}  // namespace

bool QueueWatch::Open() {
  ScopedFd opened(inotify_init1(IN_NONBLOCK | IN_CLOEXEC));
  if (opened.fd < 0) {
    return false;
  }
  root = inotify_add_watch(opened.fd, StateRoot().c_str(), ROOT_EVENTS);
  if (root < 0) {
    return false;
  }
  inotify.Swap(opened);
  return true;
}

void QueueWatch::Set(const std::set<std::string>& share_names) {
  std::map<int, std::string> kept;
  for (const std::string& name : share_names) {
    // The same descriptor again where the folder is watched already.
    const int watch = inotify_add_watch(inotify.fd, ShareFolder(name).c_str(), FOLDER_EVENTS);
    if (watch >= 0) {
      kept.emplace(watch, name);
    }
  }
  for (const auto& [watch, name] : folders) {
    if (!kept.contains(watch)) {
      (void)inotify_rm_watch(inotify.fd, watch);
    }
  }
  folders.swap(kept);
}

bool QueueWatch::Read(std::set<std::string>& taken) {
  alignas(inotify_event) char buffer[BUFFER_SIZE];
  bool settings_touched = false;
  for (;;) {
    const ssize_t length = read(inotify.fd, buffer, sizeof buffer);
    if (length <= 0) {
      return settings_touched;
    }
    for (ssize_t at = 0; at < length;) {
      const auto* event = reinterpret_cast<const inotify_event*>(buffer + at);
      at += static_cast<ssize_t>(sizeof(inotify_event) + event->len);
      const std::string_view name = event->len > 0 ? event->name : "";
      if ((event->mask & IN_Q_OVERFLOW) != 0) {
        settings_touched = true;
        for (const auto& [watch, share] : folders) {
          taken.insert(share);
        }
      } else if (event->wd == root && (event->mask & (IN_MOVE_SELF | IN_DELETE_SELF)) != 0) {
        root_is_gone = true;
      } else if (event->wd == root) {
        settings_touched = settings_touched || name.starts_with("state.db");
      } else if (const auto share = folders.find(event->wd);
                 share != folders.end() && name == QUEUE_NAME) {
        taken.insert(share->second);
      }
    }
  }
}

}  // namespace fileindexd
