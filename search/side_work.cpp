// SPDX-License-Identifier: GPL-2.0-or-later
#include "search/side_work.h"

#include <sys/eventfd.h>

#include <cassert>
#include <system_error>
#include <thread>
#include <utility>

#include "base/scoped_fd.h"

namespace fileindexd {

struct SideWork::Running {
  ScopedFd ended;
  std::thread thread;
};

SideWork::SideWork() = default;

SideWork::~SideWork() {
  Await();
}

bool SideWork::Begin(std::function<void()> work) {
  assert(!IsRunning());
  auto begun = std::make_unique<Running>();
  ScopedFd ended(eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK));
  if (ended.fd < 0) {
    return false;
  }
  begun->ended.Swap(ended);
  try {
    begun->thread = std::thread([work = std::move(work), told = begun->ended.fd] {
      work();
      (void)eventfd_write(told, 1);  // cannot fail: it is the only one
    });
  } catch (const std::system_error&) {
    return false;
  }
  running = std::move(begun);
  return true;
}

bool SideWork::IsRunning() const {
  return running != nullptr;
}

bool SideWork::HasEnded() const {
  pollfd ended = {running != nullptr ? running->ended.fd : -1, POLLIN, 0};
  return running == nullptr || poll(&ended, 1, 0) == 1;
}

void SideWork::Await() {
  if (running != nullptr) {
    running->thread.join();
    running.reset();
  }
}

void SideWork::AddPolled(std::vector<pollfd>& polled) const {
  if (running != nullptr) {
    polled.push_back({running->ended.fd, POLLIN, 0});
  }
}

}  // namespace fileindexd
