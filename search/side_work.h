// SPDX-License-Identifier: GPL-2.0-or-later
// One piece of work at a time, in a thread of its own: for what takes long, and always ends. What
// it throws ends the process.
#pragma once

#include <poll.h>

#include <functional>
#include <memory>
#include <vector>

namespace fileindexd {

class SideWork {
 public:
  SideWork();
  ~SideWork();  // as Await
  SideWork(const SideWork&) = delete;
  SideWork& operator=(const SideWork&) = delete;

  // None may be running. False when no thread can be had: the work is not done then.
  bool Begin(std::function<void()> work);
  // Begun, and not awaited yet; its maker keeps off what it works on.
  bool IsRunning() const;
  // Whether Await would not wait.
  bool HasEnded() const;
  void Await();
  // Readable once it has ended.
  void AddPolled(std::vector<pollfd>& polled) const;

 private:
  struct Running;
  std::unique_ptr<Running> running;
};

}  // namespace fileindexd
