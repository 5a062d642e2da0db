// SPDX-License-Identifier: GPL-2.0-or-later
#include "notify/keeper.h"

#include <sys/eventfd.h>

#include <algorithm>
#include <cerrno>
#include <condition_variable>
#include <ctime>
#include <mutex>
#include <utility>
#include <vector>

#include "base/scoped_fd.h"
#include "notify/keeper_round.h"
#include "notify/log.h"
#include "notify/thread.h"
#include "state/pid_file.h"

namespace fileindexd {

namespace {

using std::chrono::milliseconds;
using Clock = std::chrono::steady_clock;

constexpr milliseconds END_PATIENCE(500);

// The keeper's and its thread's. `stop_fd` and `interval` never change.
struct Shared {
  void Loop();
  std::unique_ptr<StateStore> OpenStore();
  bool Wait(milliseconds time);

  std::mutex mutex;  // guards the rest
  std::condition_variable changed;
  bool stopping = false;
  std::vector<std::string> appeared;
  ScopedFd stop_fd;  // readable from Stop on
  milliseconds interval{};
};

// False once the keeper is to end.
bool Shared::Wait(milliseconds time) {
  std::unique_lock lock(mutex);
  return !changed.wait_for(lock, time, [this] { return stopping; });
}

// None when the keeper was ended before it could be opened.
std::unique_ptr<StateStore> Shared::OpenStore() {
  std::string told;
  for (;;) {
    std::string error;
    std::unique_ptr<StateStore> store = StateStore::Open(error);
    if (store != nullptr) {
      return store;
    }
    if (error != told) {
      LogError("%s", error.c_str());
      told = error;
    }
    if (!Wait(interval)) {
      return nullptr;
    }
  }
}

void Shared::Loop() {
  const std::unique_ptr<StateStore> store = OpenStore();
  if (store == nullptr) {
    return;
  }
  KeeperRound round(
      *store, {[] { return AliveByPidFile(DAEMON_PID_FILE, DAEMON_PROGRAM) > 0; },
               [this](const std::string& command) { return SendToDaemon(command, stop_fd.fd); },
               [this](milliseconds time) { return Wait(time); }});

  Clock::time_point next = Clock::now();
  std::unique_lock lock(mutex);
  for (;;) {
    changed.wait_until(lock, next, [this] { return stopping || !appeared.empty(); });
    if (stopping) {
      return;
    }
    const std::vector<std::string> shares = std::exchange(appeared, {});
    lock.unlock();
    for (const std::string& share : shares) {
      round.Appear(share, std::time(nullptr));
    }
    if (Clock::now() >= next) {
      round.Run(std::time(nullptr));
      next = Clock::now() + interval;
    }
    lock.lock();
  }
}

}  // namespace

struct Keeper::Impl {
  std::shared_ptr<Shared> shared = std::make_shared<Shared>();
  LooseThread thread;
};

Keeper::Keeper(milliseconds interval) : impl(std::make_unique<Impl>()) {
  impl->shared->stop_fd.fd = eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK);
  impl->shared->interval = interval;
}

Keeper::~Keeper() {
  Stop();
}

bool Keeper::Start() {
  const std::shared_ptr<Shared> shared = impl->shared;
  return shared->stop_fd.fd >= 0 && impl->thread.Start([shared] { shared->Loop(); });
}

void Keeper::Stop() {
  Shared& shared = *impl->shared;
  {
    const std::lock_guard guard(shared.mutex);
    shared.stopping = true;
  }
  (void)eventfd_write(shared.stop_fd.fd, 1);  // fails only beyond 2^64 - 2
  shared.changed.notify_all();
  impl->thread.End(END_PATIENCE);
}

void Keeper::Appeared(const std::string& share) {
  Shared& shared = *impl->shared;
  {
    const std::lock_guard guard(shared.mutex);
    if (std::find(shared.appeared.begin(), shared.appeared.end(), share) == shared.appeared.end()) {
      shared.appeared.push_back(share);
    }
  }
  shared.changed.notify_all();
}

}  // namespace fileindexd
