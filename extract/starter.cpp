// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/starter.h"

#include <pthread.h>
#include <sched.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <chrono>
#include <condition_variable>
#include <csignal>
#include <mutex>
#include <new>
#include <span>
#include <system_error>
#include <thread>
#include <utility>

#include "extract/error_text.h"
#include "extract/passed_files.h"

namespace fileindexd {

namespace {

constexpr std::chrono::seconds PATIENCE(10);

std::vector<int> Given(const ChildFiles& files) {
  std::vector<int> there;
  for (const int file : {files.input, files.output, files.socket}) {
    if (file >= 0) {
      there.push_back(file);
    }
  }
  return there;
}

// In the place of those that are there, others, in the same order.
ChildFiles InPlace(const ChildFiles& files, std::span<const ScopedFd> others) {
  ChildFiles placed = files;
  size_t next = 0;
  for (int* file : {&placed.input, &placed.output, &placed.socket}) {
    if (*file >= 0) {
      *file = others[next++].fd;
    }
  }
  return placed;
}

// But for the standard ones. The asker's end among them: or its closing would never be seen. Files
// that are closed by others later would not be closed, and locks are none of this table's.
void CloseOthers(int kept) {
  const auto first = static_cast<unsigned>(STDERR_FILENO) + 1;
  const auto number = static_cast<unsigned>(kept);
  if (number > first) {
    (void)close_range(first, number - 1, 0);
  }
  (void)close_range(std::max(number + 1, first), ~0U, 0);
}

}  // namespace

struct Starter::Asked {
  std::string program;
  std::vector<std::string> arguments;
  ChildFiles files;  // as the asker calls them
};

// All under the mutex.
struct Starter::Shared {
  enum class Stage { OPENING, FREE, STARTING, STARTED };
  std::mutex mutex;
  std::condition_variable ended;
  Stage stage = Stage::OPENING;
  Asked asked;
  pid_t pid = -1;     // STARTED: -1 where it could not be
  std::string error;  // then; and of an opening that failed

  Asked TakeAsked() {
    const std::lock_guard lock(mutex);
    return std::exchange(asked, {});
  }
  void End(Stage next, pid_t started, std::string why) {
    const std::lock_guard lock(mutex);
    stage = next;
    pid = started;
    error = std::move(why);
    ended.notify_one();
  }
};

void Starter::Run(const std::shared_ptr<Shared>& shared, int end) {
  sigset_t all;
  sigfillset(&all);
  (void)pthread_sigmask(SIG_BLOCK, &all, nullptr);
  if (unshare(CLONE_FILES) != 0) {
    shared->End(Shared::Stage::FREE, -1, "unshare: " + ErrorText(errno));
    return;
  }
  const ScopedFd socket(end);
  CloseOthers(end);
  shared->End(Shared::Stage::FREE, -1, "");

  while (true) {
    std::array<ScopedFd, MOST_PASSED_FILES> files;  // closed when that is told: it is asking, too
    char byte = 0;
    const ssize_t length = ReceiveWithFiles(socket.fd, {&byte, 1}, files);
    const int failure = length < 0 ? errno : 0;  // of the files: all signals are blocked
    if (length == 0) {
      return;
    }
    Asked asked = shared->TakeAsked();
    pid_t pid = -1;
    std::string error;
    try {
      if (failure == 0) {
        (void)SpawnChild(asked.program, std::move(asked.arguments), InPlace(asked.files, files),
                         pid, error);
      } else {
        error = asked.program + ": " + ErrorText(failure);
      }
    } catch (const std::bad_alloc&) {
      error = "no memory";
    }
    shared->End(Shared::Stage::STARTED, pid, std::move(error));
  }
}

Starter::~Starter() {
  asking.Close();  // the thread ends, now or when it comes back
}

bool Starter::Open(std::string& error) {
  int ends[2] = {-1, -1};
  if (socketpair(AF_UNIX, SOCK_SEQPACKET | SOCK_CLOEXEC, 0, ends) != 0) {
    error = "socket: " + ErrorText(errno);
    return false;
  }
  ScopedFd ours(ends[0]);
  const ScopedFd theirs(ends[1]);  // here; the thread has its own
  const auto made = std::make_shared<Shared>();
  try {
    std::thread(Run, made, theirs.fd).detach();
  } catch (const std::system_error&) {
    error = "no thread can be had";
    return false;
  }
  std::unique_lock lock(made->mutex);
  made->ended.wait(lock, [&] { return made->stage != Shared::Stage::OPENING; });
  if (!made->error.empty()) {
    error = made->error;
    return false;
  }
  shared = made;
  asking.Swap(ours);
  return true;
}

bool Starter::Start(const std::string& program, std::vector<std::string> arguments,
                    const ChildFiles& files, Child& child, std::string& error) {
  std::unique_lock lock(shared->mutex);
  if (shared->stage == Shared::Stage::STARTED && shared->pid > 0) {  // it came too late
    (void)kill(shared->pid, SIGKILL);
    (void)waitpid(shared->pid, nullptr, 0);
    shared->pid = -1;
  }
  if (shared->stage != Shared::Stage::STARTING) {
    shared->stage = Shared::Stage::STARTING;
    shared->asked = {program, std::move(arguments), files};
    if (!SendWithFiles(asking.fd, {"", 1}, Given(files))) {
      shared->stage = Shared::Stage::FREE;
      error = program + ": " + ErrorText(errno);
      return false;
    }
    shared->ended.wait_for(lock, PATIENCE,
                           [this] { return shared->stage == Shared::Stage::STARTED; });
  }
  if (shared->stage == Shared::Stage::STARTING) {
    error = program + ": does not start";
    return false;
  }

  shared->stage = Shared::Stage::FREE;
  error = shared->error;
  const pid_t pid = std::exchange(shared->pid, -1);
  return pid > 0 && WatchChild(pid, program, child, error);
}

}  // namespace fileindexd
