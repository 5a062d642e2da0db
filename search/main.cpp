// SPDX-License-Identifier: GPL-2.0-or-later
// talocontentsearchd: the content service. Started and stopped by the daemon; stays in the
// foreground.
#include <poll.h>
#include <sys/signalfd.h>

#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <exception>

#include "search/follower.h"
#include "search/log.h"
#include "search/service.h"
#include "state/instance.h"

namespace fileindexd {

namespace {

using Clock = std::chrono::steady_clock;

// A busy daemon commits many times a second: one look serves them all.
constexpr std::chrono::seconds BETWEEN_STEPS(1);
// For what no watch could be set on.
constexpr std::chrono::seconds BETWEEN_LOOKS(60);

int Complain(const std::string& error) {
  (void)fprintf(stderr, "%s: %s\n", SERVICE_PROGRAM, error.c_str());
  ServiceLog("%s", error.c_str());
  return 1;
}

// Takes the signals that end the process out of their ordinary way. Their dispositions come first:
// what the parent ignores would never arrive.
int OpenSignals() {
  (void)signal(SIGTERM, SIG_DFL);
  (void)signal(SIGINT, SIG_DFL);
  (void)signal(SIGPIPE, SIG_IGN);

  sigset_t ending;
  sigemptyset(&ending);
  sigaddset(&ending, SIGTERM);
  sigaddset(&ending, SIGINT);
  if (sigprocmask(SIG_BLOCK, &ending, nullptr) != 0) {
    return -1;
  }

  return signalfd(-1, &ending, SFD_CLOEXEC);
}

int MillisecondsUntil(Clock::time_point time) {
  const auto left = std::chrono::ceil<std::chrono::milliseconds>(time - Clock::now());
  return left.count() > 0 ? static_cast<int>(left.count()) : 0;
}

// Until a signal comes.
int Follow(Follower& follower, int signal_fd) {
  Clock::time_point next_step = Clock::now();
  Clock::time_point next_look = next_step + BETWEEN_LOOKS;
  pollfd waiting[] = {{signal_fd, POLLIN, 0}, {follower.watches.inotify.fd, POLLIN, 0}};

  while (true) {
    // With work at hand the events wait as well: one step takes in all that came until it begins.
    const bool has_work = follower.HasWork();
    const int ready =
        poll(waiting, has_work ? 1 : 2, MillisecondsUntil(has_work ? next_step : next_look));
    if (ready < 0 && errno != EINTR) {
      return Complain(std::string("poll: ") + strerror(errno));
    }
    if (ready > 0 && waiting[0].revents != 0) {
      return 0;
    }

    follower.Listen();
    const Clock::time_point now = Clock::now();
    if (now >= next_look) {
      follower.LookAtAll();
      next_look = now + BETWEEN_LOOKS;
    }
    if (follower.HasWork() && now >= next_step) {
      follower.Step();
      next_step = Clock::now() + BETWEEN_STEPS;
    }
  }
}

int Serve() {
  OpenServiceLog();
  const ScopedFd signals(OpenSignals());
  if (signals.fd < 0) {
    return Complain(std::string("signals: ") + strerror(errno));
  }

  Instance instance(SERVICE_PROGRAM, SERVICE_PID_FILE, SERVICE_LOCK_FILE);
  Follower follower;
  std::string error;
  if (!instance.Claim(error) || !follower.Start(error) || !instance.Announce(error)) {
    return Complain(error);
  }

  ServiceDebug("runs");
  const int code = Follow(follower, signals.fd);
  ServiceDebug("ends");
  return code;
}

}  // namespace

}  // namespace fileindexd

int main(int argc, char** argv) {
  if (argc > 1) {
    (void)fprintf(stderr, "%s: %s: takes no arguments\n", fileindexd::SERVICE_PROGRAM, argv[1]);
    return 2;
  }

  try {
    return fileindexd::Serve();
  } catch (const std::exception& error) {
    (void)fprintf(stderr, "%s: %s\n", fileindexd::SERVICE_PROGRAM, error.what());
    return 1;
  }
}
