// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/child.h"

#include <fcntl.h>
#include <spawn.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <cstring>
#include <ctime>

#include "extract/error_text.h"
#include "extract/sanitized.h"

namespace fileindexd {

namespace {

// What posix_spawn takes, freed at the end of a scope. Every step's result is the first failure's.
class SpawnPlan {
 public:
  SpawnPlan() {
    Note(posix_spawn_file_actions_init(&actions));
    Note(posix_spawnattr_init(&attributes));
  }
  SpawnPlan(const SpawnPlan&) = delete;
  SpawnPlan& operator=(const SpawnPlan&) = delete;
  ~SpawnPlan() {
    (void)posix_spawnattr_destroy(&attributes);
    (void)posix_spawn_file_actions_destroy(&actions);
  }

  void Signals() {
    sigset_t none;
    sigset_t all;
    sigemptyset(&none);
    sigfillset(&all);
    Note(posix_spawnattr_setsigmask(&attributes, &none));
    Note(posix_spawnattr_setsigdefault(&attributes, &all));
    Note(posix_spawnattr_setflags(
        &attributes, POSIX_SPAWN_SETSIGMASK | POSIX_SPAWN_SETSIGDEF | POSIX_SPAWN_SETSID));
  }

  void Give(int file, int as) {
    if (file >= 0) {
      Note(posix_spawn_file_actions_adddup2(&actions, file, as));
    } else {
      Note(posix_spawn_file_actions_addopen(&actions, as, "/dev/null", O_RDWR, 0));
    }
  }

  void Files(const ChildFiles& files) {
    // All are out of the way before the first number is given away.
    const int input = OutOfTheWay(files.input, moved[0]);
    const int output = OutOfTheWay(files.output, moved[1]);
    const int socket = OutOfTheWay(files.socket, moved[2]);
    Give(input, STDIN_FILENO);
    Give(output, STDOUT_FILENO);
    if (!IS_SANITIZED) {
      Give(-1, STDERR_FILENO);
    }
    if (files.socket >= 0) {
      Give(socket, HELPER_SOCKET);
    }
    Note(posix_spawn_file_actions_addclosefrom_np(
        &actions, files.socket >= 0 ? HELPER_SOCKET + 1 : HELPER_SOCKET));
    Note(posix_spawn_file_actions_addchdir_np(&actions, "/"));
  }

  // A file whose number the plan gives away first would be lost.
  int OutOfTheWay(int file, ScopedFd& copy) {
    if (file < 0 || file > HELPER_SOCKET) {
      return file;
    }
    copy.fd = fcntl(file, F_DUPFD_CLOEXEC, HELPER_SOCKET + 1);
    Note(copy.fd < 0 ? errno : 0);
    return copy.fd;
  }

  void Note(int result) { failure = failure == 0 ? result : failure; }

  posix_spawn_file_actions_t actions = {};
  posix_spawnattr_t attributes = {};
  ScopedFd moved[3];
  int failure = 0;
};

// Text is UTF-8, and clocks without a zone count as UTC, whatever the service was started with.
std::vector<std::string> Environment() {
  std::vector<std::string> set = {"PATH=/usr/bin:/bin", "LC_ALL=C.UTF-8", "TZ=UTC0", "HOME=/"};
  if constexpr (IS_SANITIZED) {
    for (const char* name : {"ASAN_OPTIONS", "UBSAN_OPTIONS", "TSAN_OPTIONS"}) {
      const char* value = getenv(name);  // NOLINT(concurrency-mt-unsafe): nobody sets variables
      if (value != nullptr) {
        set.push_back(std::string(name) + "=" + value);
      }
    }
  }
  return set;
}

std::vector<char*> Pointers(std::vector<std::string>& texts) {
  std::vector<char*> pointers;
  pointers.reserve(texts.size() + 1);
  for (std::string& text : texts) {
    pointers.push_back(text.data());
  }
  pointers.push_back(nullptr);
  return pointers;
}

}  // namespace

bool SpawnChild(const std::string& program, std::vector<std::string> arguments,
                const ChildFiles& files, pid_t& pid, std::string& error) {
  const auto fail = [&](int number) {
    error = program + ": " + ErrorText(number);
    return false;
  };

  SpawnPlan plan;
  plan.Signals();
  plan.Files(files);
  if (plan.failure != 0) {
    return fail(plan.failure);
  }

  arguments.insert(arguments.begin(), program);
  arguments.push_back(std::to_string(getpid()));
  std::vector<std::string> environment = Environment();
  pid_t spawned = -1;
  const int failure = posix_spawn(&spawned, program.c_str(), &plan.actions, &plan.attributes,
                                  Pointers(arguments).data(), Pointers(environment).data());
  if (failure != 0) {
    return fail(failure);
  }
  pid = spawned;
  return true;
}

bool WatchChild(pid_t pid, const std::string& program, Child& child, std::string& error) {
  ScopedFd pid_fd(static_cast<int>(syscall(SYS_pidfd_open, pid, 0)));
  if (pid_fd.fd < 0) {
    const int number = errno;
    (void)kill(pid, SIGKILL);
    (void)waitpid(pid, nullptr, 0);
    error = program + ": " + ErrorText(number);
    return false;
  }
  child.pid = pid;
  child.pid_fd.Swap(pid_fd);
  return true;
}

std::optional<int> Reap(Child& child) {
  int status = 0;
  const pid_t ended = waitpid(child.pid, &status, WNOHANG);
  if (ended == 0) {
    return std::nullopt;
  }

  child.pid = -1;
  child.pid_fd.Close();
  return ended > 0 ? status : 0;
}

void Kill(const Child& child) {
  if (child.IsThere()) {
    (void)kill(child.pid, SIGKILL);  // not reaped yet, so the number is its own
  }
}

std::chrono::nanoseconds ProcessorTime(const Child& child) {
  clockid_t clock = 0;
  timespec time = {};
  if (clock_getcpuclockid(child.pid, &clock) != 0 || clock_gettime(clock, &time) != 0) {
    return std::chrono::nanoseconds(0);
  }
  return std::chrono::seconds(time.tv_sec) + std::chrono::nanoseconds(time.tv_nsec);
}

std::string StatusText(int status) {
  if (!WIFSIGNALED(status)) {
    return "code " + std::to_string(WEXITSTATUS(status));
  }
  const char* name = sigabbrev_np(WTERMSIG(status));
  return name != nullptr ? std::string("SIG") + name : "signal " + std::to_string(WTERMSIG(status));
}

bool IsKilledFromOutside(int status) {
  if (!WIFSIGNALED(status)) {
    return false;
  }
  const int number = WTERMSIG(status);
  return number == SIGKILL || number == SIGTERM || number == SIGINT || number == SIGHUP ||
         number == SIGQUIT;
}

}  // namespace fileindexd
