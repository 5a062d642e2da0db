// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/side_by_side.h"

#include <exception>

namespace fileindexd {

SideBySide::~SideBySide() {
  {
    const Lock lock(mutex);
    is_ending = true;
  }
  has_work.notify_all();
  for (std::thread& thread : threads) {
    thread.join();
  }
}

void SideBySide::Run(size_t count, const std::function<void(size_t)>& job) {
  Lock lock(mutex);
  current = &job;
  next = 0;
  end = count;
  Work(lock);
  is_done.wait(lock, [this] { return running == 0; });
}

void SideBySide::Work(Lock& lock) {
  while (next < end) {
    const size_t mine = next++;
    ++running;
    if (next < end) {
      WakeAnother();
    }
    lock.unlock();
    (*current)(mine);
    lock.lock();
    --running;
  }
  if (running == 0) {
    is_done.notify_one();
  }
}

// Who was woken or made but has not come yet counts as waiting: he wakes the next one himself.
void SideBySide::WakeAnother() {
  if (waiting > 0) {
    has_work.notify_one();
    return;
  }
  try {
    threads.emplace_back([this] { ThreadMain(); });
    ++waiting;
  } catch (const std::exception&) {
    // No more threads, or no memory: those that are there go on.
  }
}

void SideBySide::ThreadMain() {
  Lock lock(mutex);
  for (;;) {
    has_work.wait(lock, [this] { return is_ending || next < end; });
    if (is_ending) {
      return;
    }
    --waiting;
    Work(lock);
    ++waiting;
  }
}

}  // namespace fileindexd
