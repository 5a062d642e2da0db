// SPDX-License-Identifier: GPL-2.0-or-later
// A pool of scripted helpers, and what they and their jobs' time are awaited with.
#pragma once

#include <sys/wait.h>

#include <chrono>
#include <string>
#include <vector>

#include "pool_fixture.h"

namespace fileindexd {

class ScriptedPoolFixture : public PoolFixture {
 public:
  void SetUp() override {
    PoolOptions options;
    options.program = SCRIPTED_HELPER;
    OpenPool(options);
  }

  void OpenWith(unsigned helpers, std::chrono::milliseconds deadline) {
    PoolOptions options;
    options.program = SCRIPTED_HELPER;
    options.helpers = helpers;
    options.deadline = deadline;
    OpenPool(options);
  }

  // Until a process of the pool's has stopped itself; one that was killed is left to the pool.
  static pid_t AwaitStop() {
    siginfo_t info = {};
    EXPECT_EQ(waitid(P_ALL, 0, &info, WSTOPPED), 0);
    return info.si_pid;
  }

  // Until the process that was just asked for is there for the pool to take.
  void AwaitStart() {
    std::vector<pollfd> polled;
    pool->AddPolled(polled);
    ASSERT_EQ(poll(polled.data(), 1, -1), 1);  // who starts comes first
  }
  void Begin(const std::string& name, std::string_view bytes = "x") {
    Submit(1, name, bytes);
    AwaitStart();
  }

  // As if the time that the only job has had passed, with whatever was said before.
  std::vector<ExtractOutcome> PassDeadline() {
    EXPECT_TRUE(pool->Work(std::chrono::steady_clock::now()).empty());
    const auto due = pool->Due();
    std::vector<ExtractOutcome> ended = pool->Work(due);
    EXPECT_GT(pool->Due(), due) << "what is begun again has a deadline of its own";
    if (ended.empty()) {
      AwaitStart();
    }
    return ended;
  }

  // What stops itself as often as it is begun: twice it is begun again.
  std::string ToldAfterThreeDeadlines() {
    for (int time = 0; time < 2; ++time) {
      (void)AwaitStop();
      EXPECT_TRUE(PassDeadline().empty()) << time;
    }
    (void)AwaitStop();
    const std::vector<ExtractOutcome> ended = PassDeadline();
    return ended.size() == 1 ? Told(ended.front()) : std::to_string(ended.size()) + " outcomes";
  }
};

}  // namespace fileindexd
