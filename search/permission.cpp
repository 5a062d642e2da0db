// SPDX-License-Identifier: GPL-2.0-or-later
#include "search/permission.h"

#include <sys/syscall.h>
#include <sys/timerfd.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <ctime>

#include "state/daemon_socket.h"
#include "state/pause.h"
#include "state/pid_file.h"

namespace fileindexd {

namespace {

int OpenPidFd(pid_t process) {
  return static_cast<int>(syscall(SYS_pidfd_open, process, 0));
}

bool IsReady(int fd) {
  pollfd one = {fd, POLLIN, 0};
  return fd >= 0 && poll(&one, 1, 0) == 1;
}

}  // namespace

bool Permission::Look(StateStore& store, std::string& error) {
  const bool is_good = LookAtDaemon(error);

  int64_t resume_time = 0;
  if (!store.GetPause(resume_time)) {
    error = store.Error();
    resume.Close();  // what has come true once would be told of without end
    return false;
  }
  // The clock that the timer goes by: time() is behind it by up to a tick, in which the timer
  // would be due without end.
  timespec now = {};
  (void)clock_gettime(CLOCK_REALTIME, &now);
  paused = IsPaused(resume_time, now.tv_sec);
  return AwaitResume(paused ? resume_time : 0, error) && is_good;
}

bool Permission::LookAtDaemon(std::string& error) {
  const pid_t alive = AliveByPidFile(DAEMON_PID_FILE, DAEMON_PROGRAM);
  if (alive < 0) {
    error = std::string("cannot read ") + DAEMON_PID_FILE + ", reason=" + strerror(errno);
    if (IsReady(daemon_end.fd)) {  // its end would be told of without end
      daemon = 0;
      daemon_end.Close();
    }
    return false;
  }
  if (alive == daemon && alive > 0 && !IsReady(daemon_end.fd)) {
    return true;
  }

  daemon = 0;
  daemon_end.Close();
  if (alive == 0) {
    return true;
  }
  ScopedFd end(OpenPidFd(alive));
  if (end.fd < 0 && errno != ESRCH) {
    error = std::string("cannot follow the daemon, reason=") + strerror(errno);
    return false;
  }
  // The number may have become another process's before it was opened.
  if (end.fd < 0 || AliveByPidFile(DAEMON_PID_FILE, DAEMON_PROGRAM) != alive || IsReady(end.fd)) {
    return true;
  }
  daemon = alive;
  daemon_end.Swap(end);
  return true;
}

// By the wall clock, which is what the pause is kept in; that clock being set wakes as well.
bool Permission::AwaitResume(int64_t resume_time, std::string& error) {
  resume.Close();
  if (resume_time <= 0) {
    return true;
  }
  ScopedFd timer(timerfd_create(CLOCK_REALTIME, TFD_CLOEXEC | TFD_NONBLOCK));
  itimerspec at = {};
  at.it_value.tv_sec = static_cast<time_t>(resume_time);
  constexpr int FLAGS = TFD_TIMER_ABSTIME | TFD_TIMER_CANCEL_ON_SET;
  if (timer.fd < 0 || timerfd_settime(timer.fd, FLAGS, &at, nullptr) != 0) {
    error = std::string("cannot await the end of the pause, reason=") + strerror(errno);
    return false;
  }
  resume.Swap(timer);
  return true;
}

void Permission::AddPolled(std::vector<pollfd>& polled) const {
  for (const int fd : {daemon_end.fd, resume.fd}) {
    if (fd >= 0) {
      polled.push_back({fd, POLLIN, 0});
    }
  }
}

bool Permission::IsTold(const std::vector<pollfd>& polled) const {
  return std::any_of(polled.begin(), polled.end(), [this](const pollfd& one) {
    return one.revents != 0 && (one.fd == daemon_end.fd || one.fd == resume.fd);
  });
}

}  // namespace fileindexd
