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

namespace fileindexd {

namespace {

constexpr std::chrono::seconds PATIENCE(10);

}  // namespace

// All but `told` under the mutex.
struct Opener::Shared {
  std::mutex mutex;
  std::condition_variable asked;
  struct Asked {
    Question question;
    Work work;  // may be none
  };
  std::deque<Asked> questions;
  std::deque<Answer> answers;
  std::vector<std::shared_ptr<void>> waste;  // what is nobody's any more: the thread frees it
  uint64_t dropped = 0;  // how often: an answer to what was asked before does not count
  size_t kept = 0;       // files that the thread will have to close
  bool is_busy = false;
  bool is_working = false;  // busy, but not with a question
  bool is_ended = false;    // once nothing is kept
  ScopedFd told;            // readable when there are answers; constant

  bool MayEnd() const { return is_ended && kept == 0; }
  void LetGo(ScopedFd* file) {
    const std::lock_guard lock(mutex);
    --kept;
    waste.push_back(std::shared_ptr<ScopedFd>(file));
    asked.notify_one();
  }
};

Opener::Opener() = default;

Opener::~Opener() {
  Drop();
  if (shared != nullptr) {
    const std::lock_guard lock(shared->mutex);
    shared->is_ended = true;  // when it comes back, and has freed what is left
    shared->asked.notify_one();
  }
}

void Opener::Run(const std::shared_ptr<Shared>& shared) {
  std::unique_lock lock(shared->mutex);
  while (true) {
    shared->asked.wait(lock, [&] {
      return shared->MayEnd() || !shared->questions.empty() || !shared->waste.empty();
    });
    if (!shared->waste.empty()) {
      std::vector<std::shared_ptr<void>> waste = std::exchange(shared->waste, {});
      shared->is_busy = true;
      lock.unlock();
      waste.clear();
      lock.lock();
      shared->is_busy = false;
      continue;
    }
    if (shared->MayEnd()) {
      return;
    }
    Shared::Asked asked = std::move(shared->questions.front());
    shared->questions.pop_front();
    const uint64_t dropped = shared->dropped;
    shared->is_busy = true;
    lock.unlock();

    Answer answer = asked.question();
    if (asked.work != nullptr) {
      lock.lock();
      shared->is_working = true;
      lock.unlock();
      asked.work();
    }
    asked = {};

    lock.lock();
    shared->is_working = false;
    if (dropped == shared->dropped) {
      shared->answers.push_back(std::move(answer));
      (void)eventfd_write(shared->told.fd, 1);  // cannot fail: it is read long before it is full
    } else {
      shared->waste.push_back(std::make_shared<Answer>(std::move(answer)));
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

bool Opener::Ask(Question question, Time now, Work work) {
  if (!Start()) {
    return false;
  }
  heard = waiting == 0 ? now : heard;
  ++waiting;
  const std::lock_guard lock(shared->mutex);
  shared->questions.push_back({std::move(question), std::move(work)});
  shared->asked.notify_one();
  return true;
}

void Opener::Take(Time now, size_t most) {
  for (size_t taken = 0; waiting > 0 && taken < most; ++taken) {
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
  // Questions and answers may hold files, and closing them is asking, too.
  auto questions = std::make_shared<std::deque<Shared::Asked>>();
  auto answers = std::make_shared<std::deque<Answer>>();
  bool is_ended = false;
  {
    const std::lock_guard lock(shared->mutex);
    ++shared->dropped;
    questions->swap(shared->questions);
    answers->swap(shared->answers);
    if (!questions->empty() || !answers->empty()) {
      shared->waste.push_back(std::move(questions));
      shared->waste.push_back(std::move(answers));
    }
    is_ended = !shared->is_busy && shared->waste.empty() && shared->kept == 0;
    shared->is_ended = is_ended;
    shared->asked.notify_one();
  }
  if (is_ended) {
    shared.reset();
  }
}

std::shared_ptr<ScopedFd> Opener::Keep(ScopedFd& file) {
  auto kept = std::make_unique<ScopedFd>(file.Release());
  if (!Start()) {
    return kept;  // nobody can close it but whoever has it
  }
  {
    const std::lock_guard lock(shared->mutex);
    ++shared->kept;
  }
  return {kept.release(), [owner = shared](ScopedFd* last) { owner->LetGo(last); }};
}

Opener::Time Opener::Deadline() const {
  if (waiting == 0) {
    return Time::max();
  }
  const std::lock_guard lock(shared->mutex);
  return shared->is_working ? Time::max() : heard + PATIENCE;
}

void Opener::AddPolled(std::vector<pollfd>& polled) const {
  if (waiting > 0) {
    polled.push_back({shared->told.fd, POLLIN, 0});
  }
}

}  // namespace fileindexd
