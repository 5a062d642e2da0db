// SPDX-License-Identifier: GPL-2.0-or-later
#include "search/permission.h"

#include <sys/syscall.h>
#include <sys/timerfd.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <ctime>

#include "search/log.h"
#include "state/daemon_socket.h"
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

bool Permission::Look(StateStore& store) {
  LookAtDaemon();

  int64_t resume_time = 0;
  if (!store.GetPause(resume_time)) {
    ServiceLog("%s", store.Error().c_str());
    resume.Close();  // what has come true once would be told of without end
    return false;
  }
  paused = resume_time == 0 || resume_time > time(nullptr);
  AwaitResume(paused ? resume_time : 0);
  return true;
}

void Permission::LookAtDaemon() {
  const pid_t alive = std::max(AliveByPidFile(DAEMON_PID_FILE, DAEMON_PROGRAM), 0);
  if (alive == daemon && alive > 0 && !IsReady(daemon_end.fd)) {
    return;
  }

  daemon = 0;
  daemon_end.Close();
  if (alive == 0) {
    return;
  }
  ScopedFd end(OpenPidFd(alive));
  // The number may have become another process's before it was opened.
  if (end.fd < 0 || AliveByPidFile(DAEMON_PID_FILE, DAEMON_PROGRAM) != alive || IsReady(end.fd)) {
    return;
  }
  daemon = alive;
  daemon_end.Swap(end);
}

// By the wall clock, which is what the pause is kept in; that clock being set wakes as well.
void Permission::AwaitResume(int64_t resume_time) {
  resume.Close();
  if (resume_time <= 0) {
    return;
  }
  ScopedFd timer(timerfd_create(CLOCK_REALTIME, TFD_CLOEXEC | TFD_NONBLOCK));
  itimerspec at = {};
  at.it_value.tv_sec = static_cast<time_t>(resume_time);
  constexpr int FLAGS = TFD_TIMER_ABSTIME | TFD_TIMER_CANCEL_ON_SET;
  if (timer.fd < 0 || timerfd_settime(timer.fd, FLAGS, &at, nullptr) != 0) {
    ServiceLog("cannot await the end of the pause, reason=%m");
    return;
  }
  resume.Swap(timer);
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
