// SPDX-License-Identifier: GPL-2.0-or-later
// Jobs side by side, on threads that are kept from one time to the next.
#pragma once

#include <condition_variable>
#include <cstddef>
#include <functional>
#include <mutex>
#include <thread>
#include <vector>

namespace fileindexd {

// DESIGN: the caller works along. Whoever takes a job first wakes a thread for the one behind it,
// and makes one where none is free. So a job that hangs holds up no other, while short ones are
// done before anybody else is awake: only jobs that were begun are waited for, not threads.
class SideBySide {
 public:
  SideBySide() = default;
  ~SideBySide();
  SideBySide(const SideBySide&) = delete;
  SideBySide& operator=(const SideBySide&) = delete;

  // Calls `job`, which throws nothing, with each number below `count`; returns once all are done.
  // Where no thread can be made, one after the other. One caller at a time.
  void Run(size_t count, const std::function<void(size_t)>& job);

 private:
  using Lock = std::unique_lock<std::mutex>;
  void Work(Lock& lock);
  void WakeAnother();
  void ThreadMain();

  std::mutex mutex;  // of all below
  std::condition_variable has_work;
  std::condition_variable is_done;
  const std::function<void(size_t)>* current = nullptr;
  size_t next = 0;     // job that nobody has taken
  size_t end = 0;      // number of jobs
  size_t running = 0;  // jobs
  size_t waiting = 0;  // threads
  bool is_ending = false;
  std::vector<std::thread> threads;
};

}  // namespace fileindexd
