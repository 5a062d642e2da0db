// SPDX-License-Identifier: GPL-2.0-or-later
#include "bench/daemon.h"

#include <fcntl.h>
#include <poll.h>
#include <spawn.h>
#include <sys/inotify.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <unistd.h>

#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <deque>
#include <filesystem>
#include <fstream>
#include <mutex>
#include <thread>

#include "base/scoped_fd.h"
#include "bench/measure.h"
#include "state/layout.h"

extern char** environ;

namespace fileindexd {

namespace {

constexpr const char* LOG_SOCKET = "/dev/log";
constexpr const char* PID_FILE = "/run/fileindexd.pid";
constexpr size_t LOG_LINES = 40;      // the last ones are kept
constexpr int LIMIT_MS = 900 * 1000;  // for anything that is waited for
constexpr double LIMIT = LIMIT_MS / 1000.0;

bool Exists(const std::string& path) {
  return access(path.c_str(), F_OK) == 0;
}

// Wakes when something happens in a folder.
class FolderWatch {
 public:
  FolderWatch(const std::string& folder, uint32_t events)
      : inotify(inotify_init1(IN_CLOEXEC | IN_NONBLOCK)) {
    if (inotify_add_watch(inotify.fd, folder.c_str(), events) < 0) {
      Fail("cannot watch " + folder);
    }
  }

  // Returns once `path` does not exist, or does, as `wanted` says. False past the limit.
  bool WaitFor(const std::string& path, bool wanted) {
    while (Exists(path) != wanted) {
      pollfd readable = {inotify.fd, POLLIN, 0};
      if (poll(&readable, 1, LIMIT_MS) <= 0) {
        return false;
      }
      char events[4096];
      while (read(inotify.fd, events, sizeof(events)) > 0) {
      }
    }
    return true;
  }

 private:
  ScopedFd inotify;
};

}  // namespace

Ended RunProgram(const std::vector<std::string>& arguments, const std::string& output) {
  std::vector<char*> argv;
  for (const std::string& argument : arguments) {
    argv.push_back(const_cast<char*>(argument.c_str()));
  }
  argv.push_back(nullptr);

  posix_spawn_file_actions_t actions;
  posix_spawn_file_actions_init(&actions);
  if (!output.empty()) {
    posix_spawn_file_actions_addopen(&actions, STDOUT_FILENO, output.c_str(),
                                     O_WRONLY | O_CREAT | O_TRUNC, 0600);
    posix_spawn_file_actions_adddup2(&actions, STDOUT_FILENO, STDERR_FILENO);
  }
  pid_t child = -1;
  const int error = posix_spawnp(&child, argv[0], &actions, nullptr, argv.data(), environ);
  posix_spawn_file_actions_destroy(&actions);
  if (error != 0) {
    Fail("cannot start " + arguments[0] + ": " + strerror(error));
  }

  Ended ended;
  rusage used{};
  if (wait4(child, &ended.status, 0, &used) != child) {
    Fail("cannot wait for " + arguments[0]);
  }
  ended.peak_memory = static_cast<uint64_t>(used.ru_maxrss);
  for (const timeval& time : {used.ru_utime, used.ru_stime}) {
    ended.processor_time +=
        static_cast<double>(time.tv_sec) + static_cast<double>(time.tv_usec) / 1e6;
  }
  return ended;
}

std::string OwnFolder() {
  return std::filesystem::read_symlink("/proc/self/exe").parent_path().string();
}

// The system log, always drained: a full one would hold the daemon up.
struct DaemonUnderTest::Log {
  Log() : socket_fd(socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0)) {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    strncpy(address.sun_path, LOG_SOCKET, sizeof(address.sun_path) - 1);
    unlink(LOG_SOCKET);
    if (bind(socket_fd.fd, reinterpret_cast<sockaddr*>(&address), sizeof(address)) != 0) {
      Fail(std::string("cannot listen on ") + LOG_SOCKET);
    }
    drain = std::thread([this] { Drain(); });
  }
  ~Log() {
    (void)shutdown(socket_fd.fd, SHUT_RD);  // wakes the thread
    drain.join();
  }

  void Drain() {
    char line[4096];
    ssize_t length = 0;
    while ((length = recv(socket_fd.fd, line, sizeof(line), 0)) > 0) {
      const std::lock_guard<std::mutex> guard(mutex);
      lines.emplace_back(line, static_cast<size_t>(length));
      if (lines.size() > LOG_LINES) {
        lines.pop_front();
      }
    }
  }

  ScopedFd socket_fd;
  std::mutex mutex;
  std::deque<std::string> lines;
  std::thread drain;
};

DaemonUnderTest::DaemonUnderTest(const std::string& state_folder) {
  setenv("FILEINDEXD_STATE_DIR", state_folder.c_str(), 1);  // NOLINT(concurrency-mt-unsafe)
  log = std::make_unique<Log>();
  Start();
}

DaemonUnderTest::~DaemonUnderTest() {
  (void)kill(pid, SIGTERM);
  int status = 0;
  (void)waitpid(pid, &status, 0);  // process 1 of the namespace is the parent of what detaches
}

void DaemonUnderTest::Start() {
  FolderWatch watch("/run", IN_CREATE | IN_CLOSE_WRITE | IN_MOVED_TO | IN_DELETE);
  const Ended ended = RunProgram({OwnFolder() + "/../bin/fileindexd"});
  if (ended.status != 0 || !watch.WaitFor("/run/fileindexd.sock", true)) {
    FailWithLog("fileindexd did not start");
  }

  std::ifstream file(PID_FILE);
  if (!(file >> pid)) {
    FailWithLog("fileindexd left no pid file");
  }
}

void DaemonUnderTest::Control(const std::vector<std::string>& arguments) {
  std::vector<std::string> command = {OwnFolder() + "/../bin/fileindexctl"};
  command.insert(command.end(), arguments.begin(), arguments.end());
  if (RunProgram(command).status != 0) {
    FailWithLog("fileindexctl " + arguments[0] + " failed");
  }
}

void DaemonUnderTest::IndexShare(const std::string& share, const std::string& root) {
  Control({"share", "add", share, root});
  Control({"folder", "add", root});
  WaitUntilQuiet(share);
}

void DaemonUnderTest::WaitUntilQuiet(const std::string& share) {
  FolderWatch watch(ShareFolder(share), IN_DELETE | IN_MOVED_FROM | IN_MOVED_TO);
  const double begin = Now();
  do {
    if (!watch.WaitFor(QueuePath(share), false) || !watch.WaitFor(DrainedPath(share), false) ||
        Now() - begin > LIMIT) {
      FailWithLog("the queue of " + share + " was not taken");
    }
    // The thread's end is no event that others could wait for; it follows within microseconds. A
    // line that comes before it would lie until the next one.
    (void)sched_yield();
  } while (StatusNumber("Threads:") != 1 || Exists(QueuePath(share)));
}

uint64_t DaemonUnderTest::PeakMemory() {
  return StatusNumber("VmHWM:");
}

double DaemonUnderTest::ProcessorTime() {
  clockid_t clock{};
  timespec used{};
  if (clock_getcpuclockid(pid, &clock) != 0 || clock_gettime(clock, &used) != 0) {
    FailWithLog("the daemon is gone");
  }
  return Seconds(used);
}

uint64_t DaemonUnderTest::StatusNumber(const std::string& key) {
  std::ifstream file("/proc/" + std::to_string(pid) + "/status");
  std::string word;
  uint64_t number = 0;
  while (file >> word) {
    if (word == key && file >> number) {
      return number;
    }
  }
  FailWithLog("the daemon is gone");
}

void DaemonUnderTest::FailWithLog(const std::string& what) {
  {
    const std::lock_guard<std::mutex> guard(log->mutex);
    for (const std::string& line : log->lines) {
      fprintf(stderr, "log: %s\n", line.c_str());
    }
  }
  fprintf(stderr, "bench: %s\n", what.c_str());
  _exit(1);  // not the destructors: the daemon may be the one that hangs, and ends with us
}

}  // namespace fileindexd
