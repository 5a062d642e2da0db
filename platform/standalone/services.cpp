// SPDX-License-Identifier: GPL-2.0-or-later
// Pid files, services and helper programs.
#include <fcntl.h>
#include <poll.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <string>
#include <thread>
#include <utility>

#include "base/scoped_fd.h"
#include "platform/log.h"
#include "platform/standalone/environment.h"
#include "platform/standalone/pass_progress.h"
#include "platform/standalone/process.h"
#include "platform/standalone/shortage.h"
#include "platform/standalone/uncancelled.h"
#include "platform/system.h"
#include "state/belonging.h"
#include "state/layout.h"
#include "state/pid_file.h"

namespace fileindexd {

namespace {

constexpr int STOP_WAIT_MS = 10000;
constexpr int KILL_WAIT_MS = 1000;
constexpr std::chrono::seconds KEPT_COPY_PAUSE(1);
constexpr int LOCK_WAIT_MS = 2000;
constexpr int LOCK_NAP_MS = 5;

struct SystemError {
  int code = 0;
  const char* file = "";
  int line = 0;
};
thread_local SystemError last_error;

// The pid file, locked from the alive check to the end of the process: of two that start at the
// same time one gets it. Never closed; the detached child inherits it.
int pid_file_lock = -1;

// The service that this process has started last, which may not have written its pid file yet.
// Never its number alone: that may be another process's by the time it is to be stopped.
int started_service = -1;

int Fail(const char* file, int line) {
  last_error = {errno, file, line};
  return -1;
}
#define FI_FAIL() Fail(__FILE__, __LINE__)

// Opens and locks the pid file at its path: 1 done, 0 somebody else holds it, -1 with errno.
int LockPidFile(const char* pid_file, ScopedFd& locked) {
  for (;;) {
    ScopedFd opened(open(pid_file, O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW, 0644));
    if (opened.fd < 0) {
      return -1;
    }
    if (flock(opened.fd, LOCK_EX | LOCK_NB) != 0) {
      return errno == EWOULDBLOCK ? 0 : -1;
    }

    // An instance that just ended may have removed the file after we opened it.
    struct stat ours = {};
    struct stat there = {};
    if (fstat(opened.fd, &ours) == 0 && stat(pid_file, &there) == 0 &&
        ours.st_ino == there.st_ino && ours.st_dev == there.st_dev) {
      locked.Swap(opened);
      return 1;
    }
  }
}

int CheckAlive(const char* pid_file) {
  ScopedFd locked;
  int taken = LockPidFile(pid_file, locked);
  // A daemon that was killed can leave the lock, for a moment, to a helper that it was about to
  // run; and one that starts has not written its pid yet. Until then the lock alone says nothing.
  for (int waited_ms = 0; taken == 0 && waited_ms < LOCK_WAIT_MS; waited_ms += LOCK_NAP_MS) {
    if (AliveByPidFile(pid_file, OwnProgram()) > 0) {
      return 1;
    }
    (void)poll(nullptr, 0, LOCK_NAP_MS);
    taken = LockPidFile(pid_file, locked);
  }
  if (taken == 0) {
    return 1;
  }

  // Also where the file could not be locked: another user may read whom it names.
  const int reason = errno;
  const pid_t recorded = AliveByPidFile(pid_file, OwnProgram());
  if (recorded > 0 && recorded != getpid()) {
    return 1;
  }
  if (taken < 0) {
    errno = reason;
    return FI_FAIL();
  }
  pid_file_lock = locked.Release();
  return 0;
}

int RecordProcess(const char* pid_file) {
  if (pid_file_lock < 0) {
    return WritePidFile(pid_file) ? 0 : FI_FAIL();
  }

  const std::string text = std::to_string(getpid()) + "\n";
  if (fchmod(pid_file_lock, 0644) != 0 || ftruncate(pid_file_lock, 0) != 0 ||
      pwrite(pid_file_lock, text.data(), text.size(), 0) != static_cast<ssize_t>(text.size())) {
    return FI_FAIL();
  }
  return 0;
}

std::string ServicePidFile(const std::string& name) {
  return "/var/run/" + name + ".pid";
}

std::string FindProgram(const std::string& name) {
  const std::string folder = OwnFolder();
  for (const char* place : {"/", "/../libexec/", "/../libexec/fileindexd/"}) {
    std::string path = folder;
    path.append(place).append(name);
    if (access(path.c_str(), X_OK) == 0) {
      return path;
    }
  }
  return {};
}

// The C library's own header declares these two without C linkage.
int OpenPidFd(pid_t process) {
  return static_cast<int>(syscall(SYS_pidfd_open, process, 0));
}

bool SendSignal(int pid_fd, int number) {
  return syscall(SYS_pidfd_send_signal, pid_fd, number, nullptr, 0) == 0;
}

int StartService(const std::string& name) {
  if (AliveByPidFile(ServicePidFile(name), name) > 0) {
    return 0;
  }

  const std::string program = FindProgram(name);
  if (program.empty()) {
    errno = ENOENT;
    return FI_FAIL();
  }

  const pid_t process = StartDetached(program);
  if (process < 0) {
    return FI_FAIL();
  }
  ScopedFd(std::exchange(started_service, OpenPidFd(process))).Close();
  return 0;
}

// 1 when the process has ended within the time.
int AwaitExit(int pid_fd, int timeout_ms) {
  pollfd waiting = {pid_fd, POLLIN, 0};
  return poll(&waiting, 1, timeout_ms);
}

int StopService(const std::string& name) {
  ScopedFd target(std::exchange(started_service, -1));
  const pid_t process = AliveByPidFile(ServicePidFile(name), name);
  if (process > 0) {
    ScopedFd named(OpenPidFd(process));
    if (named.fd < 0 && errno != ESRCH) {
      return FI_FAIL();
    }
    // The number may have become another process's before it was opened.
    if (AliveByPidFile(ServicePidFile(name), name) == process) {
      target.Swap(named);
    }
  }
  if (target.fd < 0) {
    return 0;
  }
  if (!SendSignal(target.fd, SIGTERM)) {
    return errno == ESRCH ? 0 : FI_FAIL();
  }
  if (AwaitExit(target.fd, STOP_WAIT_MS) == 1) {
    return 0;
  }

  (void)SendSignal(target.fd, SIGKILL);
  if (AwaitExit(target.fd, KILL_WAIT_MS) != 1) {
    errno = ETIMEDOUT;
    return FI_FAIL();
  }
  return 0;
}

// Name of the share whose drained copy this is; empty for any other path.
std::string ShareOfDrainedCopy(const std::string& path) {
  for (const Share& share : CurrentSettings()->shares) {
    if (DrainedPath(share.name) == path) {
      return share.name;
    }
  }
  return {};
}

// The drained copy is the last that is known of its events: before it goes, what a failed commit
// has left undone is put on record. False when it has to stay.
bool MayRemoveDrainedCopy(const std::string& share) {
  return WasLastCommitGood(share) || RequestReindex(share);
}

// A pass that removes the copy was not stopped: a reindex that was begun has ended, if the share
// could be looked at and its changes are durable.
void EndReindex(const std::string& share_name) {
  if (!StatusOf(share_name).reindex_begun || !WasLastCommitGood(share_name)) {
    return;
  }
  const std::shared_ptr<const Settings> settings = CurrentSettings();
  const Share* share = settings->ShareByName(share_name);
  if (share != nullptr && LookAtRoot(*share) == RootState::SOUND) {
    const bool is_empty = IsRootEmpty(*share);
    ChangeStatus(share_name, [is_empty](ShareStatus& status) {
      status.reindex_begun = false;
      status.accept_empty = status.accept_empty && is_empty;
    });
  }
}

}  // namespace

int QLIBCProcAliveByPidFile(const char* pid_file) {
  return Uncancelled([pid_file] { return CheckAlive(pid_file); });
}

int QLIBCProcPidFileCreate(const char* pid_file) {
  return Uncancelled([pid_file] { return RecordProcess(pid_file); });
}

int QLIBServiceStart(const char* name, int /*wait*/) {
  return Uncancelled([name] { return StartService(name); });
}

int QLIBServiceStop(const char* name, int /*wait*/) {
  return Uncancelled([name] { return StopService(name); });
}

int QLIBCErrGet() {
  return last_error.code;
}
const char* QLIBCErrorGetFile() {
  return last_error.file;
}
int QLIBCErrorGetLine() {
  return last_error.line;
}

int QLIBCExec(const char* program, const char* arg1, const char* arg2, const char* arg3,
              const char* arg4) {
  useconds_t wait = 0;
  const int result = Uncancelled([&] {
    const std::string share = arg2 != nullptr ? ShareOfDrainedCopy(arg2) : std::string();
    if (!share.empty()) {
      ProgressOf(share).End();
    }
    if (!share.empty() && !MayRemoveDrainedCopy(share)) {
      FI_LOG("Kept, as its changes are not stored: %s", arg2);
      // With newer events waiting, the next pass comes at once, and reads this copy again.
      std::this_thread::sleep_for(KEPT_COPY_PAUSE);
      return -1;
    }

    const std::array<const char*, 6> arguments = {program, arg1, arg2, arg3, arg4, nullptr};
    const int status = RunProgram(arguments.data());
    if (!share.empty() && status == 0) {
      EndReindex(share);
    }
    if (!share.empty()) {
      wait = EndPass(share);
    }
    return status;
  });

  if (wait > 0) {
    usleep(wait);
  }
  return result;
}

}  // namespace fileindexd
