// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/side_by_side.h"

#include <gtest/gtest.h>

#include <atomic>
#include <filesystem>
#include <iterator>

namespace fileindexd {

namespace {

std::ptrdiff_t Threads() {
  const std::filesystem::directory_iterator threads("/proc/self/task");
  return std::distance(begin(threads), end(threads));
}

TEST(SideBySideTest, EachJobIsDoneOnce) {
  SideBySide side_by_side;
  for (const size_t count : {0, 1, 5, 2, 40}) {
    std::vector<std::atomic<int>> done(count);

    side_by_side.Run(count, [&](size_t job) { ++done[job]; });

    for (const std::atomic<int>& times : done) {
      EXPECT_EQ(times, 1) << count;
    }
  }
}

// Would wait for ever if anybody waited for it.
TEST(SideBySideTest, JobThatHangsHoldsUpNoOther) {
  constexpr size_t COUNT = 5;
  SideBySide side_by_side;
  for (size_t hanging = 0; hanging < COUNT; ++hanging) {
    std::mutex mutex;
    std::condition_variable changed;
    size_t done = 0;

    side_by_side.Run(COUNT, [&](size_t job) {
      std::unique_lock<std::mutex> lock(mutex);
      if (job == hanging) {
        changed.wait(lock, [&] { return done == COUNT - 1; });
      }
      ++done;
      changed.notify_all();
    });

    EXPECT_EQ(done, COUNT);
  }
}

TEST(SideBySideTest, AllButOneHangAndTheLastIsDone) {
  constexpr size_t COUNT = 5;
  SideBySide side_by_side;
  for (size_t last = 0; last < COUNT; ++last) {
    std::mutex mutex;
    std::condition_variable changed;
    bool is_done = false;

    side_by_side.Run(COUNT, [&](size_t job) {
      std::unique_lock<std::mutex> lock(mutex);
      is_done = is_done || job == last;
      changed.notify_all();
      changed.wait(lock, [&] { return is_done; });
    });

    EXPECT_TRUE(is_done);
  }
}

TEST(SideBySideTest, ASingleJobNeedsNoThread) {
  const std::ptrdiff_t before = Threads();
  SideBySide side_by_side;
  side_by_side.Run(1, [](size_t) {});
  EXPECT_LE(Threads(), before);
}

// Also those that have not begun when the next jobs come.
TEST(SideBySideTest, ThreadsAreKept) {
  constexpr std::ptrdiff_t COUNT = 4;
  const std::ptrdiff_t before = Threads();
  SideBySide side_by_side;
  for (int time = 0; time < 1000; ++time) {
    side_by_side.Run(COUNT, [](size_t) {});
  }
  EXPECT_LE(Threads(), before + COUNT - 1);
}

}  // namespace

}  // namespace fileindexd
