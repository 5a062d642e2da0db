// SPDX-License-Identifier: GPL-2.0-or-later
#include "search/opener.h"

#include <sys/eventfd.h>
#include <unistd.h>

#include <condition_variable>
#include <cstdint>
#include <deque>
#include <mutex>
#include <system_error>
#include <thread>
#include <utility>

#include "base/scoped_fd.h"

namespace fileindexd {

namespace {

constexpr std::chrono::seconds PATIENCE(10);

}  // namespace

// All but `told` under the mutex.
struct Opener::Shared {
  std::mutex mutex;
  std::condition_variable asked;
  std::deque<Question> questions;
  std::deque<Answer> answers;
  uint64_t dropped = 0;  // how often: an answer to what was asked before does not count
  bool is_busy = false;
  bool is_ended = false;
  ScopedFd told;  // readable when there are answers; constant
};

Opener::Opener() = default;

Opener::~Opener() {
  Drop();
  if (shared != nullptr) {
    const std::lock_guard lock(shared->mutex);
    shared->is_ended = true;  // when it comes back
  }
}

void Opener::Run(const std::shared_ptr<Shared>& shared) {
  std::unique_lock lock(shared->mutex);
  while (true) {
    shared->asked.wait(lock, [&] { return shared->is_ended || !shared->questions.empty(); });
    if (shared->is_ended) {
      return;
    }
    Question question = std::move(shared->questions.front());
    shared->questions.pop_front();
    const uint64_t dropped = shared->dropped;
    shared->is_busy = true;
    lock.unlock();

    Answer answer = question();
    question = nullptr;

    lock.lock();
    if (dropped == shared->dropped) {
      shared->answers.push_back(std::move(answer));
      (void)eventfd_write(shared->told.fd, 1);  // cannot fail: it is read long before it is full
    } else {
      lock.unlock();
      answer = nullptr;  // it may hold files, and closing them is asking, too
      lock.lock();
    }
    shared->is_busy = false;
  }
}

bool Opener::Start() {
  if (shared != nullptr) {
    return true;
  }
  const auto made = std::make_shared<Shared>();
  ScopedFd told(eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK));
  if (told.fd < 0) {
    return false;
  }
  made->told.Swap(told);
  try {
    std::thread(Run, made).detach();
  } catch (const std::system_error&) {
    return false;
  }
  shared = made;
  return true;
}

bool Opener::Ask(Question question, Time now) {
  if (!Start()) {
    return false;
  }
  heard = waiting == 0 ? now : heard;
  ++waiting;
  const std::lock_guard lock(shared->mutex);
  shared->questions.push_back(std::move(question));
  shared->asked.notify_one();
  return true;
}

void Opener::Take(Time now) {
  while (waiting > 0) {
    Answer answer;
    {
      const std::lock_guard lock(shared->mutex);
      if (shared->answers.empty()) {
        eventfd_t count = 0;
        (void)eventfd_read(shared->told.fd, &count);  // there may have been nothing to tell
        return;
      }
      answer = std::move(shared->answers.front());
      shared->answers.pop_front();
    }
    --waiting;
    heard = now;
    answer();
  }
}

void Opener::Drop() {
  waiting = 0;
  if (shared == nullptr) {
    return;
  }
  std::deque<Question> questions;
  std::deque<Answer> answers;
  bool is_ended = false;
  {
    const std::lock_guard lock(shared->mutex);
    ++shared->dropped;
    questions.swap(shared->questions);
    answers.swap(shared->answers);
    is_ended = shared->is_ended = !shared->is_busy;
    shared->asked.notify_one();
  }
  if (is_ended) {
    shared.reset();
  }
}

Opener::Time Opener::Deadline() const {
  return waiting > 0 ? heard + PATIENCE : Time::max();
}

void Opener::AddPolled(std::vector<pollfd>& polled) const {
  if (waiting > 0) {
    polled.push_back({shared->told.fd, POLLIN, 0});
  }
}

}  // namespace fileindexd
