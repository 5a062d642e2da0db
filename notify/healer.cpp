// SPDX-License-Identifier: GPL-2.0-or-later
// DESIGN
//
//   Request --> waiting --> the thread of its urgency: piece, turn, piece, turn ... --> ended -->
//   Take
//
// A thread for each urgency, because one that has stepped back to idle priority has no way forward,
// and one that waits for a server that is gone does not come back at all. The idle comparison
// stands still between two pieces while there is an urgent one, and goes on where it was. An urgent
// request for the very share that is compared at idle takes its place, since it looks at everything
// again.
#include "notify/healer.h"

#include <sys/eventfd.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <chrono>
#include <condition_variable>
#include <ctime>
#include <mutex>
#include <utility>

#include "base/scoped_fd.h"
#include "notify/log.h"
#include "notify/pressure.h"
#include "notify/share_comparison.h"
#include "notify/thread.h"
#include "state/pause.h"

namespace fileindexd {

namespace {

using std::chrono::milliseconds;
using Clock = std::chrono::steady_clock;

constexpr milliseconds PAUSE_LOOK(1000);  // between two looks at the stored pause
constexpr milliseconds END_PATIENCE(500);
// With what writes, which may be stopped, before the share is compared all the same.
constexpr milliseconds WRITER_PATIENCE(10000);

// Percent. A comparison raises the pressure itself, above all on a disk that has to seek; one at
// idle priority thereby keeps to about this share of it.
constexpr double IDLE_PRESSURE = 40;
constexpr double NOW_PRESSURE = 70;
constexpr milliseconds IDLE_BACK_OFF(5000);  // after each piece, at most
constexpr milliseconds NOW_BACK_OFF(100);    // the same
constexpr milliseconds PRESSURE_LOOK(500);

constexpr size_t URGENCIES = 3;

struct Asked {
  std::string share;
  Urgency urgency = Urgency::NOW;
};

// What runs on one of the threads.
struct Running {
  std::string share;     // empty: nothing
  bool dropped = false;  // its outcome is not wanted any more
};

bool IsIndexingPaused(StateStore& store) {
  int64_t resume_time = -1;
  return store.GetPause(resume_time) && IsPaused(resume_time, std::time(nullptr));
}

// The healer's and its threads'. The descriptor and `pressure_folder` never change; the mutex
// guards the rest.
struct Shared {
  Running& Of(Urgency urgency) { return running[static_cast<size_t>(urgency)]; }
  bool IsRunning(const std::string& share) const {
    return std::any_of(running.begin(), running.end(),
                       [&](const Running& one) { return one.share == share; });
  }
  bool IsOver(Urgency urgency) { return stopping || Of(urgency).dropped; }
  bool IsUrgentAsked() {
    return !Of(Urgency::NOW).share.empty() ||
           std::any_of(waiting.begin(), waiting.end(),
                       [](const Asked& asked) { return asked.urgency == Urgency::NOW; });
  }
  // The first request that a thread may begin with now.
  std::vector<Asked>::iterator Next(Urgency urgency);

  void Loop(Urgency urgency);
  Healing Compare(Urgency urgency, const std::string& share);
  bool AwaitTurn(Urgency urgency, StateStore& store);
  void BackOff(Urgency urgency, Clock::duration worked);

  std::mutex mutex;
  std::condition_variable changed;
  bool stopping = false;
  std::vector<Asked> waiting;              // each share at most once
  std::array<Running, URGENCIES> running;  // by Urgency
  std::vector<Healing> ended;
  std::string pressure_folder;
  ScopedFd ready;  // an event counter; not 0 while there is something in `ended`
};

std::vector<Asked>::iterator Shared::Next(Urgency urgency) {
  if (urgency == Urgency::IDLE && IsUrgentAsked()) {
    return waiting.end();
  }
  return std::find_if(waiting.begin(), waiting.end(), [&](const Asked& asked) {
    return asked.urgency == urgency && !IsRunning(asked.share);
  });
}

void Shared::Loop(Urgency urgency) {
  if (urgency == Urgency::IDLE) {
    WorkAtIdle();
  }
  std::unique_lock lock(mutex);
  for (;;) {
    changed.wait(lock, [&] { return stopping || Next(urgency) != waiting.end(); });
    if (stopping) {
      return;
    }
    const auto next = Next(urgency);
    const std::string share = next->share;
    Of(urgency) = {share, false};
    waiting.erase(next);

    lock.unlock();
    Healing healing = Compare(urgency, share);
    lock.lock();
    if (!IsOver(urgency)) {
      ended.push_back(std::move(healing));
      (void)eventfd_write(ready.fd, 1);  // fails only beyond 2^64 - 2
    }
    Of(urgency) = {};
    changed.notify_all();
  }
}

// What it returns means nothing once IsOver.
Healing Shared::Compare(Urgency urgency, const std::string& share) {
  std::string error;
  const std::unique_ptr<StateStore> store = StateStore::Open(error);
  if (store == nullptr) {
    Healing failed;
    failed.share = share;
    failed.error = error;
    failed.began = failed.ended = std::time(nullptr);
    return failed;
  }

  ShareComparison comparison(*store, share, WRITER_PATIENCE);
  while (AwaitTurn(urgency, *store)) {
    const Clock::time_point began = Clock::now();
    if (!comparison.GoOn()) {
      break;
    }
    BackOff(urgency, Clock::now() - began);
  }
  return std::move(comparison.healing);
}

// Waits until the comparison may go on; false when it is to end.
bool Shared::AwaitTurn(Urgency urgency, StateStore& store) {
  std::unique_lock lock(mutex);
  while (!IsOver(urgency)) {
    if (urgency == Urgency::IDLE && IsUrgentAsked()) {
      changed.wait(lock);
      continue;
    }

    lock.unlock();
    const bool paused = IsIndexingPaused(store);
    lock.lock();
    if (paused) {
      changed.wait_for(lock, PAUSE_LOOK, [&] { return IsOver(urgency); });
    } else if (urgency != Urgency::IDLE || !IsUrgentAsked()) {
      return !IsOver(urgency);
    }
  }
  return false;
}

void Shared::BackOff(Urgency urgency, Clock::duration worked) {
  const bool is_idle = urgency == Urgency::IDLE;
  const Clock::duration most =
      is_idle ? Clock::duration(IDLE_BACK_OFF) : std::min<Clock::duration>(worked, NOW_BACK_OFF);
  const Clock::time_point deadline = Clock::now() + most;
  while (Clock::now() < deadline &&
         ReadPressure(pressure_folder) > (is_idle ? IDLE_PRESSURE : NOW_PRESSURE)) {
    std::unique_lock lock(mutex);
    const auto until = std::min(deadline, Clock::now() + PRESSURE_LOOK);
    // An idle one that has to give way has backed off enough.
    if (changed.wait_until(lock, until,
                           [&] { return IsOver(urgency) || (is_idle && IsUrgentAsked()); })) {
      return;
    }
  }
}

}  // namespace

struct Healer::Impl {
  std::shared_ptr<Shared> shared = std::make_shared<Shared>();
  std::array<LooseThread, URGENCIES> threads;  // by Urgency
};

Healer::Healer(std::string pressure_folder) : impl(std::make_unique<Impl>()) {
  impl->shared->pressure_folder = std::move(pressure_folder);
  impl->shared->ready.fd = eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK);
}

Healer::~Healer() {
  Stop();
}

bool Healer::Start() {
  const std::shared_ptr<Shared> shared = impl->shared;
  if (shared->ready.fd < 0) {
    return false;
  }
  bool started = true;
  for (const Urgency urgency : {Urgency::NOW, Urgency::IDLE, Urgency::APART}) {
    started = started && impl->threads[static_cast<size_t>(urgency)].Start(
                             [shared, urgency] { shared->Loop(urgency); });
  }
  if (started) {
    return true;
  }

  const int reason = errno;
  Stop();
  errno = reason;
  return false;
}

void Healer::Stop() {
  const Clock::time_point deadline = Clock::now() + END_PATIENCE;
  {
    const std::lock_guard guard(impl->shared->mutex);
    impl->shared->stopping = true;
  }
  impl->shared->changed.notify_all();
  for (LooseThread& thread : impl->threads) {
    thread.End(std::chrono::duration_cast<milliseconds>(deadline - Clock::now()));
  }
}

void Healer::Request(const std::string& share, Urgency urgency) {
  Shared& shared = *impl->shared;
  {
    const std::lock_guard guard(shared.mutex);
    const auto asked = std::find_if(shared.waiting.begin(), shared.waiting.end(),
                                    [&](const Asked& known) { return known.share == share; });
    if (asked == shared.waiting.end()) {
      shared.waiting.push_back({share, urgency});
    } else if (urgency != Urgency::IDLE) {
      asked->urgency = urgency;
    }
    Running& idle = shared.Of(Urgency::IDLE);
    idle.dropped = idle.dropped || (urgency != Urgency::IDLE && idle.share == share);
  }
  shared.changed.notify_all();
}

void Healer::Forget(const std::string& share) {
  Shared& shared = *impl->shared;
  {
    const std::lock_guard guard(shared.mutex);
    std::erase_if(shared.waiting, [&](const Asked& asked) { return asked.share == share; });
    std::erase_if(shared.ended, [&](const Healing& healing) { return healing.share == share; });
    for (Running& running : shared.running) {
      running.dropped = running.dropped || running.share == share;
    }
    if (shared.ended.empty()) {
      eventfd_t count = 0;
      (void)eventfd_read(shared.ready.fd, &count);  // it may be 0 already
    }
  }
  shared.changed.notify_all();
}

bool Healer::IsPending(const std::string& share) const {
  Shared& shared = *impl->shared;
  const std::lock_guard guard(shared.mutex);
  return std::any_of(
             shared.running.begin(), shared.running.end(),
             [&](const Running& running) { return running.share == share && !running.dropped; }) ||
         std::any_of(shared.waiting.begin(), shared.waiting.end(),
                     [&](const Asked& asked) { return asked.share == share; }) ||
         std::any_of(shared.ended.begin(), shared.ended.end(),
                     [&](const Healing& healing) { return healing.share == share; });
}

std::vector<Healing> Healer::Take() {
  Shared& shared = *impl->shared;
  const std::lock_guard guard(shared.mutex);
  eventfd_t count = 0;
  (void)eventfd_read(shared.ready.fd, &count);  // 0: nothing has ended
  return std::exchange(shared.ended, {});
}

int Healer::Descriptor() const {
  return impl->shared->ready.fd;
}

}  // namespace fileindexd
