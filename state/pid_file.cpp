// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/pid_file.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <charconv>
#include <climits>
#include <string_view>

#include "base/scoped_fd.h"

namespace fileindexd {

namespace {

constexpr std::string_view DELETED = " (deleted)";  // the kernel's mark on a replaced executable
constexpr size_t COMM_SIZE = 15;                    // the kernel keeps so much of a process's name

// The recorded number; 0 when the text is none: an interrupted write records nobody.
pid_t ParsePid(std::string_view text) {
  if (text.ends_with('\n')) {
    text.remove_suffix(1);
  }
  pid_t pid = 0;
  const auto result = std::from_chars(text.data(), text.data() + text.size(), pid);
  const bool whole = result.ec == std::errc() && result.ptr == text.data() + text.size();
  return whole && pid > 0 ? pid : 0;
}

ssize_t ReadSmall(const std::string& path, char* buffer, size_t size) {
  ScopedFd file(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK));
  if (file.fd < 0) {
    return -1;
  }
  const ssize_t length = read(file.fd, buffer, size);
  const int reason = errno;
  file.Close();
  errno = reason;
  return length;
}

// Without the right to look at the executable, the process's name must do: a service with fewer
// capabilities than the process may not follow its exe link.
bool HasCommandName(const std::string& process, const std::string& program) {
  char buffer[64];
  const ssize_t length = ReadSmall(process + "/comm", buffer, sizeof buffer);
  if (length <= 0) {
    return false;
  }
  std::string_view name(buffer, static_cast<size_t>(length));
  if (name.ends_with('\n')) {
    name.remove_suffix(1);
  }
  return name == std::string_view(program).substr(0, COMM_SIZE);
}

bool RunsProgram(pid_t pid, const std::string& program) {
  const std::string process = "/proc/" + std::to_string(pid);
  char buffer[PATH_MAX];
  const ssize_t length = readlink((process + "/exe").c_str(), buffer, sizeof buffer);
  if (length < 0) {
    // ENOENT: no such process, or one that has ended and is not collected yet.
    return (errno == EACCES || errno == EPERM) && HasCommandName(process, program);
  }

  std::string_view executable(buffer, static_cast<size_t>(length));
  if (executable.ends_with(DELETED)) {
    executable.remove_suffix(DELETED.size());
  }
  const size_t slash = executable.rfind('/');
  return slash != std::string_view::npos && executable.substr(slash + 1) == program;
}

}  // namespace

pid_t AliveByPidFile(const std::string& pid_file, const std::string& program) {
  char buffer[32];
  const ssize_t length = ReadSmall(pid_file, buffer, sizeof buffer);
  if (length < 0) {
    return errno == ENOENT ? 0 : -1;
  }

  const pid_t pid = ParsePid(std::string_view(buffer, static_cast<size_t>(length)));
  return pid > 0 && RunsProgram(pid, program) ? pid : 0;
}

bool WritePidFile(const std::string& pid_file) {
  const std::string text = std::to_string(getpid()) + "\n";
  const std::string temporary = pid_file + "." + std::to_string(getpid());
  (void)unlink(temporary.c_str());  // of a killed process that had this number
  ScopedFd file(open(temporary.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0644));
  if (file.fd < 0) {
    return false;
  }

  ssize_t written = -1;
  bool good = fchmod(file.fd, 0644) == 0;
  if (good) {
    written = write(file.fd, text.data(), text.size());
    good = written == static_cast<ssize_t>(text.size());
    if (written >= 0 && !good) {
      errno = ENOSPC;
    }
  }
  good = good && rename(temporary.c_str(), pid_file.c_str()) == 0;
  if (!good) {
    const int reason = errno;
    (void)unlink(temporary.c_str());
    errno = reason;
  }
  return good;
}

}  // namespace fileindexd
