// SPDX-License-Identifier: GPL-2.0-or-later
// Asks a share's file system, in a thread of its own: one whose server is gone may never answer.
// What takes no more than a processor may be done there, too, once it has answered.
//
//   Ask     question ->  thread: runs it, then the work that goes with it  -> its answer
//   Take                                     answer: run by whoever takes it
//   Keep    file         whoever has it as the last one lets it go
//                    ->  thread: closes it
//   Drop    what is not answered yet, and answers that nobody took
//                    ->  thread: frees them, with the files that they hold
//
// DESIGN: whoever asks goes on meanwhile, and gives up on what takes too long. The thread stays in
// the kernel then, perhaps for ever; what is asked, let go and dropped later waits behind it, so
// that a share never holds more than one. It ends at a Drop that finds nothing to do and no file
// kept, and with the process.
#pragma once

#include <poll.h>

#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <vector>

#include "base/scoped_fd.h"

namespace fileindexd {

class Opener {
 public:
  using Time = std::chrono::steady_clock::time_point;
  // Is run by the asker's thread, in Take.
  using Answer = std::function<void()>;
  // Is run by the other thread, one after the other, and touches nothing but what it owns. What it
  // throws ends the process.
  using Question = std::function<Answer()>;
  // Asks no file system: nobody gives up on it. As a question otherwise.
  using Work = std::function<void()>;

  Opener();
  ~Opener();  // as Drop
  Opener(const Opener&) = delete;
  Opener& operator=(const Opener&) = delete;

  // False when no thread can be had.
  bool Ask(Question question, Time now, Work work = nullptr);
  // Runs the answers that have come, or the first of them, but for those of questions that were
  // dropped. One may drop the others.
  void Take(Time now, size_t most = SIZE_MAX);
  // What was asked is not answered any more.
  void Drop();
  // The same file, which the other thread closes when nobody has it any more; may be let go by any
  // thread, and outlive this object. `file` is none then.
  std::shared_ptr<ScopedFd> Keep(ScopedFd& file);

  bool IsWaiting() const { return waiting > 0; }
  // When it is too late for the next answer; max() if none is awaited, or the file system has given
  // it, and the work that goes with it is being done. 10 s after the last one, or after the first
  // question: long enough for a disk that has to start, however many files a question is about.
  // Whoever asks too much at once for a slow file system asks for less the next time.
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
