// SPDX-License-Identifier: GPL-2.0-or-later
// Asks a share's file system, in a thread of its own: one whose server is gone may never answer.
//
//   Ask     question ->  thread: runs it  -> its answer
//   Take                                     answer: run by whoever takes it
//
// DESIGN: whoever asks goes on meanwhile, and gives up on what takes too long. The thread stays in
// the kernel then, perhaps for ever; what is asked later waits behind it, so that a share never
// holds more than one. It ends when it has nothing to do, and with the process.
#pragma once

#include <poll.h>

#include <chrono>
#include <functional>
#include <memory>
#include <vector>

namespace fileindexd {

class Opener {
 public:
  using Time = std::chrono::steady_clock::time_point;
  // Is run by the asker's thread, in Take.
  using Answer = std::function<void()>;
  // Is run by the other thread, one after the other, and touches nothing but what it owns. What it
  // throws ends the process.
  using Question = std::function<Answer()>;

  Opener();
  ~Opener();  // as Drop
  Opener(const Opener&) = delete;
  Opener& operator=(const Opener&) = delete;

  // False when no thread can be had.
  bool Ask(Question question, Time now);
  // Runs the answers that have come, but for those of questions that were dropped. One may drop the
  // others.
  void Take(Time now);
  // What was asked is not answered any more.
  void Drop();

  bool IsWaiting() const { return waiting > 0; }
  // When it is too late for the next answer; max() if none is awaited.
  Time Deadline() const;
  void AddPolled(std::vector<pollfd>& polled) const;

 private:
  struct Shared;
  static void Run(const std::shared_ptr<Shared>& shared);
  bool Start();

  std::shared_ptr<Shared> shared;  // with the thread; none: there is no thread
  size_t waiting = 0;              // answers
  Time heard;                      // the last one, or the first question
};

}  // namespace fileindexd
