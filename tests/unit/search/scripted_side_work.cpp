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

namespace {

int& CountRunning() {
  static int running = 0;
  return running;
}

}  // namespace

bool IsSideWorkRunning() {
  return CountRunning() > 0;
}

SideWork::SideWork() = default;
SideWork::~SideWork() {
  Await();
}

bool SideWork::Begin(std::function<void()> work) {
  work();
  running = std::make_unique<Running>();
  ++CountRunning();
  return true;
}

bool SideWork::IsRunning() const {
  return running != nullptr;
}

bool SideWork::HasEnded() const {
  return !IsRunning() || !SideWorkTakesTime();
}

void SideWork::Await() {
  CountRunning() -= IsRunning() ? 1 : 0;
  running.reset();
}

void SideWork::AddPolled(std::vector<pollfd>& /*polled*/) const {}

}  // namespace fileindexd
