// SPDX-License-Identifier: GPL-2.0-or-later
// A thread that can be left behind: one that hangs in a dead file system ends for nobody.
#pragma once

#include <chrono>
#include <functional>
#include <future>
#include <thread>

namespace fileindexd {

// Used by one thread. End is called before the destructor.
class LooseThread {
 public:
  // What `body` uses must live as long as it does: it holds it by shared ownership. All signals
  // are blocked in it. False, with errno, when there is no thread to be had.
  bool Start(std::function<void()> body);
  // Waits so long for the body's end. Nothing where none was started.
  void End(std::chrono::milliseconds patience);

 private:
  std::thread thread;
  std::future<void> ended;
};

}  // namespace fileindexd
