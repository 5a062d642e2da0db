// SPDX-License-Identifier: GPL-2.0-or-later
// Pid files, services and helper programs.
#include <poll.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstring>
#include <string>
#include <string_view>
#include <thread>
#include <utility>

#include "base/scoped_fd.h"
#include "platform/log.h"
#include "platform/standalone/environment.h"
#include "platform/standalone/pass_progress.h"
#include "platform/standalone/process.h"
#include "platform/standalone/shortage.h"
#include "platform/standalone/uncancelled.h"
#include "platform/standalone/walk.h"
#include "platform/system.h"
#include "state/belonging.h"
#include "state/instance.h"
#include "state/layout.h"
#include "state/pid_file.h"

namespace fileindexd {

namespace {

constexpr int STOP_WAIT_MS = 10000;
constexpr int KILL_WAIT_MS = 1000;
constexpr std::chrono::seconds KEPT_COPY_PAUSE(1);
constexpr useconds_t SHORTAGE_PAUSE_US = 100'000;

struct SystemError {
  int code = 0;
  const char* file = "";
  int line = 0;
};
thread_local SystemError last_error;

// The service that this process has started last, which may not have written its pid file yet.
// Never its number alone: that may be another process's by the time it is to be stopped.
int started_service = -1;

int Fail(const char* file, int line) {
  last_error = {errno, file, line};
  return -1;
}
#define FI_FAIL() Fail(__FILE__, __LINE__)

std::string LockFile(std::string_view pid_file) {
  pid_file.remove_suffix(pid_file.ends_with(".pid") ? strlen(".pid") : 0);
  return std::string(pid_file) + ".lock";
}

int CheckAlive(const char* pid_file) {
  Instance instance(OwnProgram(), pid_file, LockFile(pid_file));
  std::string error;
  switch (instance.Claim(error)) {
    case Claimed::BY_ANOTHER:
      return 1;
    case Claimed::BY_NOBODY:
      return FI_FAIL();
    case Claimed::BY_US:
      break;
  }
  // Held to the end of the process: the detached child inherits it.
  (void)instance.lock.Release();
  return 0;
}

int RecordProcess(const char* pid_file) {
  return WritePidFile(pid_file) ? 0 : FI_FAIL();
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
  const std::shared_ptr<const Settings> settings = CurrentSettings();
  for (const Share& share : settings->shares) {
    if (DrainedPath(share.name) == path) {
      return share.name;
    }
  }
  return {};
}

// The drained copy is the last that is known of its events: before it goes, what a failed commit
// or a short pass has left undone is put on record. False when it has to stay.
bool MayRemoveDrainedCopy(const std::string& share) {
  return (WasLastCommitGood(share) || RequestReindex(share)) &&
         (!IsPassShort(share) || RecordReindex(share));
}

// A pass that removes the copy was not stopped: a reindex that was begun, and not put off, has
// ended, if the share could be looked at and its changes are durable.
void EndReindex(const std::string& share_name) {
  if (!StatusOf(share_name).reindex_begun || !WasLastCommitGood(share_name)) {
    return;
  }
  const std::shared_ptr<const Settings> settings = CurrentSettings();
  const Share* share = settings->ShareByName(share_name);
  if (share != nullptr && LookAtRoot(*share) == RootState::SOUND) {
    ChangeStatus(share_name, [](ShareStatus& status) { status.reindex_begun = false; });
  }
}

// An empty root was accepted until the index holds something again; the folder may be empty by now
// for another reason. Until the reindex that the acceptance asked for has ended, it stands.
void EndAcceptance(const std::string& share) {
  if (StatusOf(share).accept_empty && WasLastCommitGood(share) && HoldsMoreThanFolders(share)) {
    ChangeStatus(share, [](ShareStatus& status) {
      status.accept_empty = status.accept_empty && (status.needs_reindex || status.reindex_begun);
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
      EndWalks();
    }
    if (!share.empty() && !MayRemoveDrainedCopy(share)) {
      FI_LOG("Kept, as its changes are not stored: %s", arg2);
      // With newer events waiting, the next pass comes at once, and reads this copy again.
      std::this_thread::sleep_for(KEPT_COPY_PAUSE);
      return -1;
    }

    const std::array<const char*, 6> arguments = {program, arg1, arg2, arg3, arg4, nullptr};
    const int status = RunProgram(arguments.data());
    if (status < 0 && (IsShortage(errno) || errno == EAGAIN)) {
      // What could not be removed, or read, is tried again at once: until others let go of what is
      // lacking, that would be all that the processor does.
      wait = SHORTAGE_PAUSE_US;
    }
    if (!share.empty()) {
      const bool was_put_off = TakeUpReindex(share);
      if (status == 0 && !was_put_off) {
        EndReindex(share);
        EndAcceptance(share);
      }
      wait = std::max(wait, EndPass(share));
    }
    return status;
  });

  if (wait > 0) {
    usleep(wait);
  }
  return result;
}

}  // namespace fileindexd
