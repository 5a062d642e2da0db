// SPDX-License-Identifier: GPL-2.0-or-later
//
// DESIGN. The notification service answers once all that had happened is in queue files. What
// stands there then, queues and drained copies, is opened: a Worker removes a drained copy only
// after it has committed, so a file without a name is one whose lines are in the index. Holding it
// open keeps its inode number from being given to the next queue. A whole reindex removes the queue
// first; the share's flags stand until it has ended.
//
//   look --(something is left)--> wait for a change of a share's folder or of the store, look again
#include "ctl/wait.h"

#include <fcntl.h>
#include <json/reader.h>
#include <poll.h>
#include <sys/inotify.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <climits>
#include <cstring>
#include <ctime>
#include <exception>
#include <list>
#include <memory>

#include "base/scoped_fd.h"
#include "ctl/client.h"
#include "ctl/output.h"
#include "state/belonging.h"
#include "state/layout.h"
#include "state/notifier.h"
#include "state/pause.h"
#include "state/pid_file.h"

namespace fileindexd {

namespace {

using Clock = std::chrono::steady_clock;

struct Waiting {
  Share share;
  std::list<ScopedFd> files;  // what stood there and may still have its name
  ShareStatus status;
};

class Waiter {
 public:
  Waiter(Session& in_session, std::chrono::seconds patience)
      : session(in_session), limit(patience), deadline(Clock::now() + patience) {}

  int AskService(const std::vector<std::string>& shares);
  int Watch(const std::vector<std::string>& shares);
  int Await();

 private:
  bool IsOver() const { return Clock::now() >= deadline; }
  // False, with its line written, when the store cannot be read.
  bool Look();
  // Until something may have changed, or the deadline.
  void WaitForChange();
  int TooLate();
  std::string Reason() const;

  Session& session;
  const std::chrono::seconds limit;
  const Clock::time_point deadline;
  ScopedFd changes;
  ScopedFd daemon_end;
  pid_t daemon_watched = 0;
  std::list<Waiting> waiting;  // shares that are not done
};

std::string SyncRequest(const std::vector<std::string>& shares) {
  Json::Value request(Json::objectValue);
  request["type"] = "sync";
  request["shares"] = Json::arrayValue;
  for (const std::string& share : shares) {
    request["shares"].append(share);
  }
  return ToText(request);
}

// Empty when the service has done what it was asked for.
std::string ErrorOfReply(const std::string& text) {
  try {
    Json::CharReaderBuilder builder;
    const std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
    Json::Value reply;
    if (!reader->parse(text.data(), text.data() + text.size(), &reply, nullptr) ||
        !reply.isObject()) {
      return "its answer makes no sense";
    }
    if (reply["ok"] == true) {
      return {};
    }
    return reply["error"].isString() ? reply["error"].asString() : "it does not say why not";
  } catch (const std::exception& error) {
    return error.what();
  }
}

int Waiter::AskService(const std::vector<std::string>& shares) {
  const auto left = std::chrono::ceil<std::chrono::milliseconds>(deadline - Clock::now());
  std::string reply;
  switch (AskNotifier(SyncRequest(shares), left, reply)) {
    case NotifierReply::NOT_RUNNING:
      return Fail(EXIT_FAILED, "search: --wait: %s does not run", NOTIFIER_PROGRAM);
    case NotifierReply::NO_ANSWER:
      return IsOver() ? Fail(EXIT_FAILED, "search: --wait: %s has not answered within %lld s",
                             NOTIFIER_PROGRAM, static_cast<long long>(limit.count()))
                      : Fail(EXIT_FAILED, "search: --wait: %s gave no answer", NOTIFIER_PROGRAM);
    case NotifierReply::ANSWERED:
      break;
  }

  const std::string error = ErrorOfReply(reply);
  return error.empty()
             ? EXIT_DONE
             : Fail(EXIT_FAILED, "search: --wait: %s: %s", NOTIFIER_PROGRAM, error.c_str());
}

int Waiter::Watch(const std::vector<std::string>& shares) {
  constexpr uint32_t NAMES = IN_MOVED_FROM | IN_MOVED_TO | IN_CREATE | IN_DELETE;
  ScopedFd opened(inotify_init1(IN_CLOEXEC | IN_NONBLOCK));
  if (opened.fd < 0) {
    return Fail(EXIT_FAILED, "search: --wait: cannot watch for changes: %s", strerror(errno));
  }
  changes.Swap(opened);

  // The store's own files: flags are in them. A daemon that comes or goes writes its pid file.
  (void)inotify_add_watch(changes.fd, StateRoot().c_str(), NAMES | IN_MODIFY);
  (void)inotify_add_watch(changes.fd, "/var/run", NAMES | IN_MODIFY);
  for (const std::string& name : shares) {
    const Share* share = session.settings->ShareByName(name);
    const auto& folders = session.settings->folders;
    // Nobody works for a share of which nothing is indexed.
    if (share == nullptr ||
        std::none_of(folders.begin(), folders.end(),
                     [&name](const IndexedFolder& folder) { return folder.share == name; })) {
      continue;
    }
    (void)inotify_add_watch(changes.fd, ShareFolder(name).c_str(), NAMES);
    Waiting& one = waiting.emplace_back();
    one.share = *share;
    // The queue first: moved aside between the two, it is met twice, and never missed.
    for (const std::string& path : {QueuePath(name), DrainedPath(name)}) {
      ScopedFd file(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOFOLLOW));
      if (file.fd >= 0) {
        one.files.emplace_back().Swap(file);
      } else if (errno != ENOENT) {
        return Fail(EXIT_FAILED, "search: --wait: %s: %s", path.c_str(), strerror(errno));
      }
    }
  }
  return EXIT_DONE;
}

bool IsGone(const ScopedFd& file) {
  struct stat found = {};
  return fstat(file.fd, &found) != 0 || found.st_nlink == 0;
}

// The files first: a Worker clears a share's flags after it has removed them, never before.
bool Waiter::Look() {
  for (auto one = waiting.begin(); one != waiting.end();) {
    std::erase_if(one->files, IsGone);
    if (!session.store->GetStatus(one->share.name, one->status)) {
      const std::string error = session.store->Error();
      if (session.store->GetSettings(session.settings) &&
          session.settings->ShareByName(one->share.name) == nullptr) {
        one = waiting.erase(one);  // it was removed meanwhile
        continue;
      }
      (void)Fail(EXIT_FAILED, "%s", error.c_str());
      return false;
    }
    const bool is_done =
        one->files.empty() && !one->status.needs_reindex && !one->status.reindex_begun;
    one = is_done ? waiting.erase(one) : std::next(one);
  }
  return true;
}

void Waiter::WaitForChange() {
  std::array<pollfd, 2> watched = {{{changes.fd, POLLIN, 0}, {daemon_end.fd, POLLIN, 0}}};
  const auto left = std::chrono::ceil<std::chrono::milliseconds>(deadline - Clock::now()).count();
  const int timeout = static_cast<int>(std::clamp<int64_t>(left, 0, INT_MAX));
  (void)poll(watched.data(), watched.size(), timeout);

  alignas(inotify_event) std::array<char, 16384> ignored;
  while (read(changes.fd, ignored.data(), ignored.size()) > 0) {
  }
}

int Waiter::Await() {
  while (Look()) {
    if (waiting.empty()) {
      return EXIT_DONE;
    }

    const pid_t daemon = AliveByPidFile(DAEMON_PID_FILE, DAEMON_PROGRAM);
    if (daemon <= 0) {
      return Fail(EXIT_NO_DAEMON, "search: --wait: the daemon does not run");
    }
    if (daemon != daemon_watched) {  // its end leaves the pid file as it is
      ScopedFd opened(static_cast<int>(syscall(SYS_pidfd_open, daemon, 0)));
      daemon_end.Swap(opened);
      daemon_watched = daemon;
      continue;
    }
    if (IsOver()) {
      return TooLate();
    }
    WaitForChange();
  }
  return EXIT_FAILED;
}

// Why the first of the shares waits, as far as that can be told.
std::string Waiter::Reason() const {
  const Waiting& first = waiting.front();
  if (first.status.no_space) {
    return "the disk is too full";
  }
  if (const RootState root = LookAtRoot(first.share); root == RootState::MISSING) {
    return "its path is missing";
  } else if (root == RootState::FOREIGN) {
    return "its path lies on another file system than before";
  }
  int64_t resume_time = -1;
  if (session.store->GetPause(resume_time) && IsPaused(resume_time, std::time(nullptr))) {
    return "indexing is paused";
  }
  return first.files.empty() ? "it is being indexed again" : "lines wait in its queue";
}

int Waiter::TooLate() {
  std::string names;
  for (const Waiting& one : waiting) {
    names += (names.empty() ? "" : ", ") + OneLine(one.share.name);
  }
  return Fail(EXIT_FAILED, "search: --wait: not done within %lld s: %s %s: %s",
              static_cast<long long>(limit.count()), waiting.size() == 1 ? "share" : "shares",
              names.c_str(), Reason().c_str());
}

}  // namespace

int AwaitChanges(Session& session, const std::vector<std::string>& shares,
                 std::chrono::seconds patience) {
  if (shares.empty()) {
    return EXIT_DONE;  // the service would take none for all
  }
  const Progress progress("Waiting for the index …");
  Waiter waiter(session, patience);
  int code = waiter.AskService(shares);
  if (code == EXIT_DONE) {
    code = waiter.Watch(shares);
  }
  return code == EXIT_DONE ? waiter.Await() : code;
}

}  // namespace fileindexd
