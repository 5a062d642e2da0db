// SPDX-License-Identifier: GPL-2.0-or-later
// Work without a thread: it is done when it is begun, and has ended unless it takes its time.
#include <gtest/gtest.h>

#include "search/side_work.h"
#include "tests/unit/search/scripted.h"

namespace fileindexd {

struct SideWork::Running {};

bool& SideWorkTakesTime() {
  static bool takes_time = false;
  return takes_time;
}

bool& SideWorkFails() {
  static bool fails = false;
  return fails;
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
  EXPECT_FALSE(IsRunning());
  if (SideWorkFails()) {
    return false;
  }
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

void SideWork::AddPolled(std::vector<pollfd>& polled) const {
  polled.push_back({SIDE_WORK_POLLED, POLLIN, 0});
}

}  // namespace fileindexd
