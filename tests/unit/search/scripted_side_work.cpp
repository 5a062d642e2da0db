// SPDX-License-Identifier: GPL-2.0-or-later
// Work without a thread: it is done when it is begun, and has ended unless it takes its time.
#include "search/side_work.h"
#include "tests/unit/search/scripted.h"

namespace fileindexd {

struct SideWork::Running {};

bool& SideWorkTakesTime() {
  static bool takes_time = false;
  return takes_time;
}

SideWork::SideWork() = default;
SideWork::~SideWork() = default;

bool SideWork::Begin(std::function<void()> work) {
  work();
  running = std::make_unique<Running>();
  return true;
}

bool SideWork::IsRunning() const {
  return running != nullptr;
}

bool SideWork::HasEnded() const {
  return !IsRunning() || !SideWorkTakesTime();
}

void SideWork::Await() {
  running.reset();
}

void SideWork::AddPolled(std::vector<pollfd>& /*polled*/) const {}

}  // namespace fileindexd
