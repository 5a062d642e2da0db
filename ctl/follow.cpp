// SPDX-License-Identifier: GPL-2.0-or-later
// DESIGN. Watch, look, show if it is other than before, wait:
//
//   inotify    the state's folders, the pid files' folder, the shares' roots
//   mounts     the kernel's table of mounts has changed
//   daemon     its end, which leaves the pid file as it is
//   signals    SIGINT, SIGTERM; SIGWINCH on a terminal
//   output     the reader has gone
//
// and a second at most while something runs, until the end of a pause at most. What is watched is
// watched before it is looked at, so nothing is missed. Between two looks lies a fifth of a second:
// a busy daemon writes all the time. The notification service is asked at a look, at most once a
// second; that time has gone on, and up to when the index is complete, is nothing new.
#include "ctl/follow.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/inotify.h>
#include <sys/ioctl.h>
#include <sys/signalfd.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <climits>
#include <csignal>
#include <cstring>
#include <ctime>

#include "base/scoped_fd.h"
#include "ctl/output.h"
#include "ctl/status_report.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

constexpr int TICK_MS = 1000;
constexpr int SHORTEST_MS = 200;
constexpr const char* PID_FOLDER = "/var/run";
// Not the closing of a file that was open for writing: looking at a database does that itself.
constexpr uint32_t ENTRIES = IN_CREATE | IN_DELETE | IN_MOVE;
constexpr uint32_t FOLDER = ENTRIES | IN_MODIFY;

enum class Event { CHANGE, WINDOW, STOP };

int64_t NowMs() {
  timespec now = {};
  (void)clock_gettime(CLOCK_MONOTONIC, &now);
  return static_cast<int64_t>(now.tv_sec) * 1000 + now.tv_nsec / 1'000'000;
}

class Follower {
 public:
  bool Open();
  void Watch(const Settings& settings);
  // False when it has ended already.
  bool WatchDaemon(pid_t daemon);
  // Until something may have changed; -1: however long that takes.
  Event Wait(int timeout_ms);
  // False when nobody reads, or a signal came; `error` is then set where writing failed.
  bool Write(std::string_view text, int& error);

  bool is_terminal = false;

 private:
  Event ReadSignal();
  void Drain();

  ScopedFd changes;
  ScopedFd signals;
  ScopedFd mounts;
  ScopedFd daemon_end;
  pid_t daemon_watched = 0;
  int64_t last_look = 0;
};

bool Follower::Open() {
  is_terminal = isatty(STDOUT_FILENO) == 1;
  sigset_t wanted;
  sigemptyset(&wanted);
  sigaddset(&wanted, SIGINT);
  sigaddset(&wanted, SIGTERM);
  if (is_terminal) {
    sigaddset(&wanted, SIGWINCH);
  }
  ScopedFd opened_signals(signalfd(-1, &wanted, SFD_CLOEXEC | SFD_NONBLOCK));
  ScopedFd opened_changes(inotify_init1(IN_CLOEXEC | IN_NONBLOCK));
  if (opened_signals.fd < 0 || opened_changes.fd < 0 ||
      sigprocmask(SIG_BLOCK, &wanted, nullptr) != 0) {
    return false;
  }
  ScopedFd opened_mounts(open("/proc/self/mounts", O_RDONLY | O_CLOEXEC));  // none: do without
  signals.Swap(opened_signals);
  changes.Swap(opened_changes);
  mounts.Swap(opened_mounts);
  return true;
}

// Watching again what is watched changes nothing. What is not there is told of by its folder.
void Follower::Watch(const Settings& settings) {
  (void)inotify_add_watch(changes.fd, PID_FOLDER, FOLDER);
  (void)inotify_add_watch(changes.fd, StateRoot().c_str(), FOLDER);
  (void)inotify_add_watch(changes.fd, SharesFolder().c_str(), ENTRIES);
  for (const Share& share : settings.shares) {
    (void)inotify_add_watch(changes.fd, ShareFolder(share.name).c_str(), FOLDER);
    (void)inotify_add_watch(changes.fd, IndexPath(share.name).c_str(), FOLDER);
    (void)inotify_add_watch(changes.fd, ContentsPath(share.name).c_str(), FOLDER);
    (void)inotify_add_watch(changes.fd, share.path.c_str(),
                            ENTRIES | IN_DELETE_SELF | IN_MOVE_SELF);
  }
  last_look = NowMs();
}

bool Follower::WatchDaemon(pid_t daemon) {
  if (daemon == daemon_watched) {
    return true;
  }
  errno = 0;
  ScopedFd opened(daemon > 0 ? static_cast<int>(syscall(SYS_pidfd_open, daemon, 0)) : -1);
  daemon_end.Swap(opened);
  daemon_watched = daemon;
  return errno != ESRCH;
}

Event Follower::ReadSignal() {
  signalfd_siginfo info = {};
  Event event = Event::CHANGE;
  while (read(signals.fd, &info, sizeof(info)) == static_cast<ssize_t>(sizeof(info))) {
    if (info.ssi_signo != SIGWINCH) {
      return Event::STOP;
    }
    event = Event::WINDOW;
  }
  return event;
}

void Follower::Drain() {
  std::array<char, 16384> ignored;
  while (read(changes.fd, ignored.data(), ignored.size()) > 0) {
  }
}

Event Follower::Wait(int timeout_ms) {
  const int64_t deadline = NowMs() + timeout_ms;
  bool changed = false;
  for (;;) {
    const int64_t now = NowMs();
    const int64_t until = changed ? last_look + SHORTEST_MS : deadline;
    if ((changed || timeout_ms >= 0) && now >= until) {
      Drain();
      return Event::CHANGE;
    }

    // A negative descriptor is passed over.
    std::array<pollfd, 5> waiting = {{{signals.fd, POLLIN, 0},
                                      {STDOUT_FILENO, 0, 0},
                                      {changed ? -1 : changes.fd, POLLIN, 0},
                                      {changed ? -1 : mounts.fd, POLLPRI, 0},
                                      {changed ? -1 : daemon_end.fd, POLLIN, 0}}};
    const bool endless = !changed && timeout_ms < 0;
    const int left = endless ? -1 : static_cast<int>(until - now);
    if (poll(waiting.data(), waiting.size(), left) < 0 && errno != EINTR) {
      return Event::STOP;
    }
    if (waiting[1].revents != 0) {
      return Event::STOP;
    }
    const Event event = waiting[0].revents != 0 ? ReadSignal() : Event::CHANGE;
    if (event != Event::CHANGE) {
      return event;
    }
    changed =
        changed || waiting[2].revents != 0 || waiting[3].revents != 0 || waiting[4].revents != 0;
    if (waiting[4].revents != 0) {
      daemon_end.Close();  // told once
    }
  }
}

// In pieces that a pipe with any room takes at once: a reader that stands still must not keep a
// signal from being seen.
bool Follower::Write(std::string_view text, int& error) {
  while (!text.empty()) {
    std::array<pollfd, 2> waiting = {{{signals.fd, POLLIN, 0}, {STDOUT_FILENO, POLLOUT, 0}}};
    if (poll(waiting.data(), waiting.size(), -1) < 0 && errno != EINTR) {
      error = errno;
      return false;
    }
    if (waiting[0].revents != 0 && ReadSignal() == Event::STOP) {
      return false;
    }
    if (waiting[1].revents == 0) {
      continue;
    }
    const ssize_t written =
        write(STDOUT_FILENO, text.data(), std::min(text.size(), static_cast<size_t>(PIPE_BUF)));
    if (written < 0 && errno != EINTR && errno != EAGAIN) {
      error = errno == EPIPE ? 0 : errno;
      return false;
    }
    text.remove_prefix(written > 0 ? static_cast<size_t>(written) : 0);
  }
  return true;
}

// The text over what the screen shows, as much of it as there is room for. Lines are cut by the
// terminal, which is told not to wrap them.
std::string OnScreen(const std::string& text, bool first) {
  winsize size = {};
  const bool known = ioctl(STDOUT_FILENO, TIOCGWINSZ, &size) == 0 && size.ws_row > 1;
  int rows = known ? size.ws_row - 1 : INT_MAX;
  std::string screen = first ? "\033[?7l\033[2J\033[H" : "\033[H";
  for (size_t at = 0; at < text.size() && rows > 0; --rows) {
    const size_t end = text.find('\n', at);
    screen.append(text, at, end - at).append("\033[K\n");
    at = end + 1;
  }
  return screen + "\033[J";
}

// Has the terminal wrap lines again, whatever ended the command.
class WrapGuard {
 public:
  explicit WrapGuard(bool on_screen) : is_needed(on_screen) {}
  WrapGuard(const WrapGuard&) = delete;
  WrapGuard& operator=(const WrapGuard&) = delete;
  // As good as it gets: a terminal that stands still is not waited for.
  ~WrapGuard() {
    pollfd room = {STDOUT_FILENO, POLLOUT, 0};
    if (is_needed && poll(&room, 1, 0) == 1 && room.revents == POLLOUT) {
      constexpr std::string_view WRAP = "\033[?7h";
      (void)!write(STDOUT_FILENO, WRAP.data(), WRAP.size());
    }
  }

 private:
  bool is_needed;
};

// Milliseconds until it may look different without anything happening; -1: it will not.
int Timeout(const StatusReport& report) {
  const bool runs =
      std::any_of(report.shares.begin(), report.shares.end(), [](const ShareReport& share) {
        return share.work || share.comparison || share.watch.comparing || share.watch.backlog > 0;
      });
  if (runs) {
    return TICK_MS;
  }
  if (report.paused_until.value_or(0) == 0) {
    return -1;
  }
  constexpr int64_t LONGEST_S = 3600;
  return static_cast<int>(
             std::clamp<int64_t>(*report.paused_until - std::time(nullptr), 1, LONGEST_S)) *
         1000;
}

// True when the service was asked now.
bool AskIfDue(Watches& watches) {
  const bool is_due = Watches::Clock::now() >= watches.NextAsk();
  if (is_due) {
    watches.Ask();
  }
  return is_due;
}

// The same, or what is left until the service may be asked again.
int UntilNextAsk(const Watches& watches, int timeout_ms) {
  const auto left =
      std::chrono::ceil<std::chrono::milliseconds>(watches.NextAsk() - Watches::Clock::now());
  const int left_ms = std::max(static_cast<int>(left.count()), 1);
  return timeout_ms < 0 ? left_ms : std::min(timeout_ms, left_ms);
}

std::string Text(const StatusReport& report, bool json) {
  return json ? JsonLine(ReportObject(report)) : ReportText(report);
}

// What has to differ for another block.
std::string Core(StatusReport report, bool json) {
  for (ShareReport& share : report.shares) {
    if (share.watch.complete_until) {
      share.watch.complete_until = 0;
    }
  }
  return Text(report, json);
}

}  // namespace

int FollowStatus(Session& session, bool json) {
  Follower follower;
  if (!follower.Open()) {
    return Fail(EXIT_FAILED, "cannot watch for changes: %s", strerror(errno));
  }

  const bool in_place = follower.is_terminal && !json;
  const WrapGuard wrap(in_place);
  std::string shown;
  int error = 0;
  Watches watches;
  StatusReport report;
  for (Event event = Event::CHANGE; event != Event::STOP;) {
    const std::shared_ptr<const Settings> watched = session.settings;
    follower.Watch(*watched);
    const bool is_asked = AskIfDue(watches);
    if (!MakeReport(session, watches, report)) {
      return EXIT_FAILED;
    }
    if (!follower.WatchDaemon(report.daemon) || session.settings != watched) {
      continue;
    }
    const std::string core = Core(report, json);
    if (core != shown || event == Event::WINDOW) {
      const std::string text = Text(report, json);
      const char* between = json || shown.empty() ? "" : "\n";
      if (!follower.Write(in_place ? OnScreen(text, shown.empty()) : between + text, error)) {
        break;
      }
      shown = core;
    }
    const int timeout_ms = Timeout(report);
    event = follower.Wait(is_asked ? timeout_ms : UntilNextAsk(watches, timeout_ms));
  }
  return error == 0 ? EXIT_DONE : Fail(EXIT_FAILED, "standard output: %s", strerror(error));
}

}  // namespace fileindexd
