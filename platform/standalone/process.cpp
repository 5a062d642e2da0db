// SPDX-License-Identifier: GPL-2.0-or-later
#include "platform/standalone/process.h"

#include <fcntl.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <climits>
#include <csignal>

#include "base/scoped_fd.h"
#include "platform/standalone/environment.h"

namespace fileindexd {

namespace {

constexpr unsigned FIRST_OWN_DESCRIPTOR = 3;
constexpr int LAST_SIGNAL = 64;

// In the child, between fork and exec: system calls only.
void BecomeNeutral(const rlimit& descriptors, int keep) {
  for (int number = 1; number <= LAST_SIGNAL; ++number) {
    signal(number, SIG_DFL);  // NOLINT(concurrency-mt-unsafe): one thread
  }
  sigset_t none;
  sigemptyset(&none);
  pthread_sigmask(SIG_SETMASK, &none, nullptr);

  umask(022);  // NOLINT(concurrency-mt-unsafe): one thread
  setsid();
  if (descriptors.rlim_max != RLIM_INFINITY) {
    setrlimit(RLIMIT_NOFILE, &descriptors);
  }

  // `keep` is close-on-exec: it tells of a failed exec.
  const auto kept = static_cast<unsigned>(keep);
  if (kept > FIRST_OWN_DESCRIPTOR) {
    close_range(FIRST_OWN_DESCRIPTOR, kept - 1, 0);
  }
  close_range(kept + 1, UINT_MAX, 0);
}

// What a child says before it becomes the program: its process, and errno if that failed.
struct Report {
  pid_t process;
  int error;
};

[[noreturn]] void Exec(const char* const* arguments, const rlimit& descriptors, int report_fd) {
  BecomeNeutral(descriptors, report_fd);
  Report report = {getpid(), 0};
  (void)!write(report_fd, &report, sizeof(report));
  execv(arguments[0], const_cast<char* const*>(arguments));
  report.error = errno;
  (void)!write(report_fd, &report, sizeof(report));
  _exit(127);
}

// The process that reported itself, or -1 with errno.
pid_t AwaitReport(int fd) {
  Report report = {-1, ECHILD};
  Report next = {};
  ssize_t size = 0;
  do {
    size = read(fd, &next, sizeof(next));
    if (size == static_cast<ssize_t>(sizeof(next))) {
      report = next;
    }
  } while (size > 0 || (size < 0 && errno == EINTR));

  errno = report.error;
  return report.error == 0 ? report.process : -1;
}

int AwaitEnd(pid_t child) {
  int status = 0;
  while (waitpid(child, &status, 0) < 0) {
    if (errno != EINTR) {
      return -1;
    }
  }
  return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

// `detached`: by way of a child of ours that ends at once. -1 with errno on failure.
pid_t Start(const char* const* arguments, bool detached) {
  std::array<int, 2> ends = {-1, -1};
  if (pipe2(ends.data(), O_CLOEXEC) != 0) {
    return -1;
  }
  ScopedFd reading(ends[0]);
  ScopedFd writing(ends[1]);
  const rlimit descriptors = InheritedDescriptorLimit();

  // Where whoever started us had it ignored, a child's end could not be waited for.
  signal(SIGCHLD, SIG_DFL);  // NOLINT(concurrency-mt-unsafe): the C library's is safe
  const pid_t child = fork();
  if (child < 0) {
    return -1;
  }
  if (child == 0) {
    if (detached && fork() != 0) {
      _exit(0);
    }
    Exec(arguments, descriptors, writing.fd);
  }

  writing.Close();
  if (detached) {
    AwaitEnd(child);
  }
  const pid_t process = AwaitReport(reading.fd);
  if (process < 0 && !detached) {
    const int error = errno;
    AwaitEnd(child);
    errno = error;
  }
  return process < 0 || detached ? process : child;
}

std::string OwnPath() {
  std::array<char, PATH_MAX> path = {};
  const ssize_t size = readlink("/proc/self/exe", path.data(), path.size());
  return size > 0 ? std::string(path.data(), static_cast<size_t>(size)) : std::string();
}

}  // namespace

int RunProgram(const char* const* arguments) {
  const pid_t child = Start(arguments, false);
  return child < 0 ? -1 : AwaitEnd(child);
}

pid_t StartDetached(const std::string& program) {
  const std::array<const char*, 2> arguments = {program.c_str(), nullptr};
  return Start(arguments.data(), true);
}

std::string OwnProgram() {
  const std::string path = OwnPath();
  return path.substr(path.rfind('/') + 1);
}

std::string OwnFolder() {
  const std::string path = OwnPath();
  return path.substr(0, path.rfind('/'));
}

}  // namespace fileindexd
