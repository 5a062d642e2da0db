// SPDX-License-Identifier: GPL-2.0-or-later
#include "search/watches.h"

#include <sys/inotify.h>
#include <unistd.h>

#include <cerrno>
#include <cstdint>
#include <cstring>
#include <string_view>

#include "index/suspicion.h"
#include "search/log.h"
#include "state/daemon_socket.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

constexpr uint32_t CAME_OR_WENT =
    IN_CREATE | IN_DELETE | IN_MOVED_FROM | IN_MOVED_TO | IN_DELETE_SELF | IN_MOVE_SELF;
// Writing is told of before the commit can be seen. Closing is told of after it, but readers, we
// among them, open a database's files for writing too: it only hastens a look.
constexpr uint32_t CHANGED = CAME_OR_WENT | IN_MODIFY;
constexpr uint32_t CHANGED_OR_CLOSED = CHANGED | IN_CLOSE_WRITE;

constexpr uint32_t WENT = IN_DELETE | IN_MOVED_FROM;

// Of the contents nothing else is watched: it is us who write them. The note's time is set each
// time it is left.
constexpr uint32_t SUSPECTED = IN_ATTRIB;

constexpr const char* PID_FOLDER = "/var/run";
constexpr std::string_view DAEMON_PID_NAME =
    std::string_view(DAEMON_PID_FILE).substr(std::string_view(PID_FOLDER).size() + 1);

// Rounds of one Read. What is left comes with the next one.
constexpr int MAX_READS = 64;

// A database's shared memory changes with every reader.
bool IsDatabaseFile(const std::string& name, std::string_view database) {
  return name.starts_with(database) && !name.ends_with("-shm");
}

}  // namespace

bool Watches::Open() {
  ScopedFd opened(inotify_init1(IN_NONBLOCK | IN_CLOEXEC));
  if (opened.fd < 0) {
    return false;
  }

  inotify.Swap(opened);
  return true;
}

void Watches::Set(const Settings& settings) {
  // A parent before its child: what appears after the parent's watch is set raises an event.
  std::map<int, Target> kept;
  refused = false;
  Add(PID_FOLDER, {Target::RUN, ""}, kept);
  Add(StateRoot(), {Target::ROOT, ""}, kept);
  Add(SharesFolder(), {Target::SHARES, ""}, kept);
  for (const Share& share : settings.shares) {
    Add(ShareFolder(share.name), {Target::SHARE, share.name}, kept);
    Add(IndexPath(share.name), {Target::INDEX, share.name}, kept);
    Add(ContentsPath(share.name), {Target::CONTENTS, share.name}, kept);
  }
  told = refused && told;

  for (const auto& [watch, target] : targets) {
    if (!kept.contains(watch)) {
      (void)inotify_rm_watch(inotify.fd, watch);  // gone already if its folder is
    }
  }
  targets.swap(kept);
}

void Watches::Add(const std::string& path, const Target& target, std::map<int, Target>& kept) {
  const bool is_given = target.place == Target::ROOT || target.place == Target::RUN;
  const uint32_t wanted = target.place == Target::INDEX      ? CHANGED_OR_CLOSED
                          : target.place == Target::CONTENTS ? SUSPECTED
                          : is_given                         ? CHANGED
                                                             : CAME_OR_WENT;
  // The state root, and the folder of pid files, may be named by a link.
  const uint32_t mask = wanted | IN_ONLYDIR | (is_given ? 0U : IN_DONT_FOLLOW);
  const int watch = inotify_add_watch(inotify.fd, path.c_str(), mask);
  if (watch >= 0) {
    kept[watch] = target;
    return;
  }
  if (errno == ENOENT || errno == ENOTDIR) {
    return;
  }

  refused = true;
  if (!told) {
    ServiceLog("cannot watch %s, looking every minute instead, reason=%m", path.c_str());
    told = true;
  }
}

void Watches::Read(Hints& hints) {
  alignas(inotify_event) char buffer[16 * 1024];
  for (int round = 0; round < MAX_READS; ++round) {
    const ssize_t length = read(inotify.fd, buffer, sizeof(buffer));
    if (length <= 0) {  // EAGAIN: nothing is waiting
      return;
    }

    for (const char* at = buffer; at < buffer + length;) {
      inotify_event event = {};
      memcpy(&event, at, sizeof(event));
      const std::string name = event.len > 0 ? at + sizeof(event) : "";
      Judge(event.wd, event.mask, name, hints);
      at += sizeof(event) + event.len;
    }
  }
}

void Watches::Judge(int watch, unsigned mask, const std::string& name, Hints& hints) const {
  if ((mask & IN_Q_OVERFLOW) != 0) {
    hints.everything = true;
    for (const auto& [other, target] : targets) {
      if (target.place == Target::INDEX) {
        hints.shares.insert(target.share);
      }
    }
    return;
  }

  const auto found = targets.find(watch);
  if (found == targets.end()) {  // of a watch that was given up
    return;
  }
  if ((mask & (IN_IGNORED | IN_DELETE_SELF | IN_MOVE_SELF)) != 0) {
    hints.everything = true;
    return;
  }

  const Target& target = found->second;
  switch (target.place) {
    case Target::ROOT:
      hints.everything = hints.everything || name == "shares" || IsDatabaseFile(name, "state.db");
      break;
    case Target::SHARES:
      hints.everything = true;
      break;
    case Target::SHARE:
      hints.everything = hints.everything || name == "index" || name == "contents";
      if (name == "index" || (name == "contents" && (mask & WENT) != 0)) {
        hints.remade.insert(target.share);
      }
      break;
    case Target::INDEX:
      if (name == "entries.db" && (mask & CAME_OR_WENT) != 0) {
        hints.remade.insert(target.share);
      } else if ((mask & IN_CLOSE_WRITE) != 0) {
        if (name == "entries.db-wal") {
          hints.closed.insert(target.share);
        }
      } else if (IsDatabaseFile(name, "entries.db")) {
        hints.shares.insert(target.share);
      }
      break;
    case Target::CONTENTS:
      if (name == SUSPICION_NOTE) {
        hints.remade.insert(target.share);
      }
      break;
    case Target::RUN:
      hints.everything = hints.everything || name == DAEMON_PID_NAME;
      break;
  }
}

}  // namespace fileindexd
