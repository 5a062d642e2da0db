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
#include <condition_variable>
#include <csignal>
#include <list>
#include <mutex>
#include <new>
#include <span>
#include <string_view>
#include <system_error>
#include <thread>
#include <utility>

#include "extract/error_text.h"
#include "extract/passed_files.h"

namespace fileindexd {

namespace {

// While the thread hangs: what is asked for keeps its files open.
constexpr int MOST_DROPPED = 4;
constexpr std::string_view BYTE = ".";  // of a message that says nothing else

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

// All under the mutex, but for what of a start only the thread or nobody changes.
struct Starter::Shared {
  enum class Stage { ASKED, ENDED, DROPPED };
  struct Start {
    uint64_t id = 0;
    std::string program;
    std::vector<std::string> arguments;
    ChildFiles files;  // as the asker calls them
    Stage stage = Stage::ASKED;
    pid_t pid = -1;     // ENDED: -1 where it could not be
    std::string error;  // then
  };
  std::mutex mutex;
  std::condition_variable opened;
  bool is_open = false;
  std::string error;  // of an opening that failed
  // In the order of their messages in the socket. One byte comes back for each that has ended.
  std::list<Start> starts;

  std::list<Start>::iterator Find(uint64_t id) {
    return std::find_if(starts.begin(), starts.end(),
                        [id](const Start& start) { return start.id == id; });
  }
  void EndOpening(std::string why) {
    const std::lock_guard lock(mutex);
    is_open = true;
    error = std::move(why);
    opened.notify_one();
  }
  // The one that the message asks for. It stays where it is; the asker changes its stage alone.
  Start& Next(bool& is_wanted) {
    const std::lock_guard lock(mutex);
    Start& next = *std::find_if(starts.begin(), starts.end(),
                                [](const Start& start) { return start.stage != Stage::ENDED; });
    is_wanted = next.stage == Stage::ASKED;
    return next;
  }
  void End(Start& start, int socket) {
    std::unique_lock lock(mutex);
    if (start.stage == Stage::ASKED) {
      start.stage = Stage::ENDED;
      (void)SendWithFiles(socket, BYTE, {}, MSG_DONTWAIT);  // fails when the asker is gone
      return;
    }
    lock.unlock();
    if (start.pid > 0) {
      (void)kill(start.pid, SIGKILL);
      (void)waitpid(start.pid, nullptr, 0);
    }
    lock.lock();
    starts.remove_if([&](const Start& one) { return &one == &start; });
  }
};

void Starter::Run(const std::shared_ptr<Shared>& shared, int end) {
  sigset_t all;
  sigfillset(&all);
  (void)pthread_sigmask(SIG_BLOCK, &all, nullptr);
  if (unshare(CLONE_FILES) != 0) {
    shared->EndOpening("unshare: " + ErrorText(errno));
    return;
  }
  const ScopedFd socket(end);
  CloseOthers(end);
  shared->EndOpening("");

  while (true) {
    std::array<ScopedFd, MOST_PASSED_FILES> files;  // closed when that is told: it is asking, too
    char byte = 0;
    const ssize_t length = ReceiveWithFiles(socket.fd, {&byte, 1}, files);
    const int failure = length < 0 ? errno : 0;  // of the files: all signals are blocked
    if (length == 0 || (failure != 0 && failure != EMFILE)) {
      return;
    }
    bool is_wanted = false;
    Shared::Start& start = shared->Next(is_wanted);
    try {
      if (failure != 0) {
        start.error = start.program + ": " + ErrorText(failure);
      } else if (is_wanted) {
        (void)SpawnChild(start.program, std::move(start.arguments), InPlace(start.files, files),
                         start.pid, start.error);
      }
    } catch (const std::bad_alloc&) {
      start.error = "no memory";
    }
    shared->End(start, socket.fd);
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
  made->opened.wait(lock, [&] { return made->is_open; });
  if (!made->error.empty()) {
    error = made->error;
    return false;
  }
  shared = made;
  asking.Swap(ours);
  return true;
}

uint64_t Starter::Ask(const std::string& program, std::vector<std::string> arguments,
                      const ChildFiles& files, std::string& error) {
  const std::vector<int> given = Given(files);
  const std::lock_guard lock(shared->mutex);
  const auto dropped = std::count_if(
      shared->starts.begin(), shared->starts.end(),
      [](const Shared::Start& start) { return start.stage == Shared::Stage::DROPPED; });
  if (dropped >= MOST_DROPPED) {
    error = program + ": does not start";
    return 0;
  }

  Shared::Start& start = shared->starts.emplace_back();
  start.id = ++last_id;
  start.program = program;
  start.arguments = std::move(arguments);
  start.files = files;
  if (!SendWithFiles(asking.fd, BYTE, given, MSG_DONTWAIT)) {
    error = program + ": " + ErrorText(errno);
    shared->starts.pop_back();
    return 0;
  }
  return last_id;
}

std::optional<bool> Starter::Take(uint64_t id, Child& child, std::string& error) {
  Shared::Start taken;
  {
    const std::lock_guard lock(shared->mutex);
    const auto start = shared->Find(id);
    if (start->stage != Shared::Stage::ENDED) {
      return std::nullopt;
    }
    taken = std::move(*start);
    shared->starts.erase(start);
    char byte = 0;
    (void)recv(asking.fd, &byte, 1, MSG_DONTWAIT);
  }
  error = taken.error;
  return taken.pid > 0 && WatchChild(taken.pid, taken.program, child, error);
}

void Starter::Drop(uint64_t id, Child& child) {
  {
    const std::lock_guard lock(shared->mutex);
    const auto start = shared->Find(id);
    if (start->stage == Shared::Stage::ASKED) {
      start->stage = Shared::Stage::DROPPED;
      return;
    }
  }
  std::string error;
  (void)Take(id, child, error);
}

}  // namespace fileindexd
