// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/pool.h"

#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <list>

#include "extract/error_text.h"
#include "extract/slot.h"

namespace fileindexd {

namespace {

// Killed processes that do not end (their disk is dead) hold no more than that many places for
// each helper; then no further one is started.
constexpr size_t DYING_OF_A_HELPER = 4;
// How long the last ones are waited for.
constexpr int END_TIMEOUT_MS = 1000;

}  // namespace

struct ExtractPool::Impl {
  PoolOptions options;
  Starter starter;
  std::string left_out;
  std::list<Child> dying;
  std::vector<std::unique_ptr<Slot>> slots;
  std::list<ExtractJob> waiting;
  std::vector<ExtractOutcome> outcomes;  // since the last Work

  void Assign(std::chrono::steady_clock::time_point now) {
    for (const std::unique_ptr<Slot>& slot : slots) {
      // Giving may end a job at once.
      while (!waiting.empty() && slot->IsFree() &&
             dying.size() < DYING_OF_A_HELPER * slots.size()) {
        if (auto outcome = slot->Give(std::move(waiting.front()), now)) {
          outcomes.push_back(std::move(*outcome));
        }
        waiting.pop_front();
      }
    }
  }

  void Bury() {
    dying.remove_if([](Child& child) { return Reap(child).has_value(); });
  }
};

std::unique_ptr<ExtractPool> ExtractPool::Open(const PoolOptions& options, std::string& error) {
  if (access(options.program.c_str(), X_OK) != 0) {
    (void)Failed(options.program, error);
    return nullptr;
  }

  auto opened = std::make_unique<Impl>();
  opened->options = options;
  if (!opened->starter.Open(error)) {
    return nullptr;
  }
  for (unsigned made = 0; made < std::max(options.helpers, 1U); ++made) {
    opened->slots.push_back(
        std::make_unique<Slot>(opened->options, opened->starter, opened->left_out, opened->dying));
  }
  return std::unique_ptr<ExtractPool>(new ExtractPool(std::move(opened)));
}

ExtractPool::ExtractPool(std::unique_ptr<Impl> opened) : impl(std::move(opened)) {}

ExtractPool::~ExtractPool() {
  Abort();
  for (Child& child : impl->dying) {
    pollfd ended = {child.pid_fd.fd, POLLIN, 0};
    (void)poll(&ended, 1, END_TIMEOUT_MS);  // one that hangs is left to its next parent
  }
  impl->Bury();
}

size_t ExtractPool::Room() const {
  const size_t most = 2 * impl->slots.size();
  return most - std::min(most, Running());
}

size_t ExtractPool::Running() const {
  const auto busy = std::count_if(impl->slots.begin(), impl->slots.end(),
                                  [](const std::unique_ptr<Slot>& slot) { return slot->HasJob(); });
  return static_cast<size_t>(busy) + impl->waiting.size() + impl->outcomes.size();
}

void ExtractPool::Submit(ExtractJob&& job) {
  impl->waiting.push_back(std::move(job));
  impl->Assign(std::chrono::steady_clock::now());
}

void ExtractPool::AddPolled(std::vector<pollfd>& polled) const {
  polled.push_back({impl->starter.Descriptor(), POLLIN, 0});
  for (const std::unique_ptr<Slot>& slot : impl->slots) {
    slot->AddPolled(polled);
  }
  for (const Child& child : impl->dying) {
    polled.push_back({child.pid_fd.fd, POLLIN, 0});
  }
}

std::chrono::steady_clock::time_point ExtractPool::Due() const {
  if (!impl->outcomes.empty()) {
    return std::chrono::steady_clock::now();
  }
  auto due = std::chrono::steady_clock::time_point::max();
  for (const std::unique_ptr<Slot>& slot : impl->slots) {
    due = std::min(due, slot->Due());
  }
  return due;
}

std::vector<ExtractOutcome> ExtractPool::Work(std::chrono::steady_clock::time_point now) {
  for (const std::unique_ptr<Slot>& slot : impl->slots) {
    if (auto outcome = slot->Work(now)) {
      impl->outcomes.push_back(std::move(*outcome));
    }
  }
  impl->Bury();
  impl->Assign(now);
  return std::exchange(impl->outcomes, {});
}

void ExtractPool::Abort() {
  impl->waiting.clear();
  impl->outcomes.clear();
  for (const std::unique_ptr<Slot>& slot : impl->slots) {
    slot->Clear();
  }
}

std::string ExtractPool::LeftOut() const {
  return impl->left_out;
}

}  // namespace fileindexd
