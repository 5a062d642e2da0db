// SPDX-License-Identifier: GPL-2.0-or-later
// talocontentsearchd: the content service. Started and stopped by the daemon; stays in the
// foreground.
#include <malloc.h>
#include <poll.h>
#include <sys/resource.h>
#include <sys/signalfd.h>
#include <systemd/sd-daemon.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <chrono>
#include <climits>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <ctime>
#include <exception>
#include <string>
#include <thread>
#include <vector>

#include "base/standard_streams.h"
#include "search/content_loop.h"
#include "search/log.h"
#include "search/service.h"
#include "state/content_service.h"
#include "state/instance.h"

namespace fileindexd {

namespace {

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
  (void)signal(SIGCHLD, SIG_DFL);  // what is ignored leaves no status of a helper's end
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

// A file for each helper, some for each share, and some to be given out next.
void RaiseDescriptorLimit() {
  rlimit limit = {};
  if (getrlimit(RLIMIT_NOFILE, &limit) == 0) {
    limit.rlim_cur = limit.rlim_max;
    (void)setrlimit(RLIMIT_NOFILE, &limit);  // as good as it gets
  }
}

// The helper beside this program, or where it is installed.
std::string HelperPath() {
  std::array<char, PATH_MAX> own = {};
  const ssize_t size = readlink("/proc/self/exe", own.data(), own.size());
  std::string folder(own.data(), size > 0 ? static_cast<size_t>(size) : 0);
  folder.erase(std::min(folder.rfind('/'), folder.size()));
  for (const char* place : {"/", "/../libexec/", "/../libexec/fileindexd/"}) {
    std::string path = folder + place + HELPER_PROGRAM;
    if (access(path.c_str(), X_OK) == 0) {
      return path;
    }
  }
  return folder + "/" + HELPER_PROGRAM;
}

// -1: for ever.
int MillisecondsUntil(Time due, Time now) {
  if (due == Time::max()) {
    return -1;
  }
  const auto left = std::chrono::ceil<std::chrono::milliseconds>(due - now).count();
  return static_cast<int>(std::clamp<int64_t>(left, 0, INT_MAX));
}

// Until a signal comes.
int Follow(ContentLoop& loop, int signal_fd) {
  std::vector<pollfd> polled;
  while (true) {
    const Time before = Clock::now();
    polled = {{signal_fd, POLLIN, 0}};
    loop.AddPolled(polled, before);
    const int timeout = MillisecondsUntil(loop.Due(before), before);
    if (poll(polled.data(), polled.size(), timeout) < 0 && errno != EINTR) {
      return Complain(std::string("poll: ") + strerror(errno));
    }
    if (polled[0].revents != 0) {
      loop.End();
      return 0;
    }

    loop.Step(polled, Clock::now(), time(nullptr));
  }
}

int Serve() {
  OpenServiceLog();
  const ScopedFd signals(OpenSignals());
  if (signals.fd < 0) {
    return Complain(std::string("signals: ") + strerror(errno));
  }

  Instance instance(SERVICE_PROGRAM, SERVICE_PID_FILE, SERVICE_LOCK_FILE);
  RaiseDescriptorLimit();
  // What one thread freed is of use to the others: they seldom allocate at the same time.
  (void)mallopt(M_ARENA_MAX, 1);
  ContentLoop loop(
      {.helpers = std::max(std::thread::hardware_concurrency(), 1U), .program = HelperPath()});
  std::string error;
  if (instance.Claim(error) != Claimed::BY_US || !loop.Start(error) || !instance.Announce(error)) {
    return Complain(error);
  }

  (void)sd_notify(0, "READY=1");  // without a service manager nothing happens
  ServiceDebug("runs");
  const int code = Follow(loop, signals.fd);
  ServiceDebug("ends");
  return code;
}

}  // namespace

}  // namespace fileindexd

int main(int argc, char** argv) {
  fileindexd::FillStandardStreams();
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
