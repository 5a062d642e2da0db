// SPDX-License-Identifier: GPL-2.0-or-later
// fileindex-notifyd: the notification service. Stays in the foreground.
#include <sys/resource.h>
#include <sys/signalfd.h>

#include <CLI/CLI.hpp>
#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <exception>
#include <map>
#include <string>

#include "base/scoped_fd.h"
#include "base/standard_streams.h"
#include "notify/confinement.h"
#include "notify/log.h"
#include "notify/service.h"
#include "state/instance.h"
#include "state/layout.h"
#include "state/notifier.h"

namespace fileindexd {

namespace {

struct CommandLine {
  ServiceOptions service;
  LogTarget log = LogTarget::STANDARD_ERROR;
};

// False when there is nothing to run; `code` is the exit code then.
bool ParseCommandLine(int argc, char** argv, CommandLine& chosen, int& code) {
  CLI::App app("Watches the shares of fileindexd and writes what changes into their queues.",
               NOTIFIER_PROGRAM);
  bool to_syslog = false;
  int64_t interval = chosen.service.interval.count();
  app.add_flag("--syslog", to_syslog, "Log to syslog; otherwise to standard error");
  app.add_option("--watch-by", chosen.service.best,
                 "The best way to watch that is tried: fanotify, inotify or comparison")
      ->transform(
          CLI::Transformer(std::map<std::string, WatchedBy>{{"fanotify", WatchedBy::FANOTIFY},
                                                            {"inotify", WatchedBy::INOTIFY},
                                                            {"comparison", WatchedBy::COMPARISON}}))
      ->option_text("WAY");
  app.add_option("--interval", interval,
                 "Time between comparisons of shares that cannot be watched (10m)")
      ->transform(CLI::AsNumberWithUnit(
          std::map<std::string, int64_t>{{"s", 1}, {"m", 60}, {"h", 3600}, {"d", 86400}},
          CLI::AsNumberWithUnit::UNIT_REQUIRED, "DURATION"))
      ->check(CLI::Range(static_cast<int64_t>(1), static_cast<int64_t>(86400)))
      ->option_text("DURATION");

  try {
    app.parse(argc, argv);
  } catch (const CLI::CallForHelp&) {
    (void)fputs(app.help().c_str(), stdout);
    code = 0;
    return false;
  } catch (const CLI::ParseError& error) {
    (void)fprintf(stderr, "%s: %s\n", NOTIFIER_PROGRAM, error.what());
    code = 2;
    return false;
  }
  chosen.service.interval = std::chrono::seconds(interval);
  chosen.log = to_syslog ? LogTarget::SYSLOG : LogTarget::STANDARD_ERROR;
  return true;
}

int Complain(const std::string& error) {
  LogError("%s", error.c_str());
  return 1;
}

// Takes the signals that end the process out of their ordinary way, for all threads to come. Their
// dispositions come first: what the parent ignores would never arrive.
int OpenSignals() {
  sigset_t ending;
  sigemptyset(&ending);
  for (const int number : {SIGTERM, SIGINT, SIGHUP}) {
    (void)signal(number, SIG_DFL);
    sigaddset(&ending, number);
  }
  (void)signal(SIGPIPE, SIG_IGN);
  if (pthread_sigmask(SIG_BLOCK, &ending, nullptr) != 0) {
    return -1;
  }
  return signalfd(-1, &ending, SFD_CLOEXEC);
}

// A descriptor for each directory of a walk's depth, some for each file system.
void RaiseDescriptorLimit() {
  rlimit limit{};
  if (getrlimit(RLIMIT_NOFILE, &limit) == 0 && limit.rlim_cur < limit.rlim_max) {
    limit.rlim_cur = limit.rlim_max;
    (void)setrlimit(RLIMIT_NOFILE, &limit);
  }
}

int Serve(const CommandLine& chosen) {
  RaiseDescriptorLimit();
  const ScopedFd signals(OpenSignals());
  if (signals.fd < 0) {
    return Complain(std::string("signals: ") + strerror(errno));  // NOLINT: one thread yet
  }

  std::string error;
  Instance instance(NOTIFIER_PROGRAM, NOTIFIER_PID_FILE, NOTIFIER_LOCK_FILE);
  std::string missing;
  if (instance.Claim(error) != Claimed::BY_US || !MakeStateRoot(error) ||
      !Confine(missing, error)) {
    return Complain(error);
  }
  if (!missing.empty()) {
    LogInfo("%s", missing.c_str());
  }

  Service service(chosen.service);
  if (!service.Start(error) || !instance.Announce(error)) {
    return Complain(error);
  }
  LogInfo("runs");
  const int code = service.Run(signals.fd);
  LogInfo("ends");
  return code;
}

}  // namespace

}  // namespace fileindexd

int main(int argc, char** argv) {
  fileindexd::FillStandardStreams();
  try {
    fileindexd::CommandLine chosen;
    int code = 0;
    if (!fileindexd::ParseCommandLine(argc, argv, chosen, code)) {
      return code;
    }
    fileindexd::OpenLog(chosen.log);
    return fileindexd::Serve(chosen);
  } catch (const std::exception& error) {
    fileindexd::LogError("%s", error.what());
    return 1;
  }
}
