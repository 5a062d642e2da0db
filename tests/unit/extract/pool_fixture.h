// SPDX-License-Identifier: GPL-2.0-or-later
// A pool, files in memory to give it, and waiting for what it says.
#pragma once

#include <gtest/gtest.h>
#include <poll.h>
#include <sys/mman.h>
#include <unistd.h>

#include <map>
#include <memory>
#include <string>
#include <utility>

#include "extract/pool.h"

namespace fileindexd {

class PoolFixture : public ::testing::Test {
 public:
  // Far beyond what any test takes: reached only by a fault.
  static constexpr std::chrono::seconds LIMIT{1200};

  void OpenPool(const PoolOptions& options) {
    std::string error;
    pool = ExtractPool::Open(options, error);
    ASSERT_TRUE(pool) << error;
  }

  static ScopedFd FileOf(std::string_view bytes) {
    const int file = memfd_create("test", MFD_CLOEXEC);
    EXPECT_EQ(write(file, bytes.data(), bytes.size()), static_cast<ssize_t>(bytes.size()));
    EXPECT_EQ(lseek(file, 0, SEEK_SET), 0);
    return ScopedFd(file);
  }

  void Submit(uint64_t id, const std::string& name, std::string_view bytes = "x") {
    ExtractJob job;
    job.id = id;
    job.name = name;
    job.file = std::make_shared<ScopedFd>(FileOf(bytes).Release());
    pool->Submit(std::move(job));
  }

  // Until that many jobs ended.
  std::map<uint64_t, ExtractOutcome> Await(size_t count) {
    std::map<uint64_t, ExtractOutcome> ended;
    const auto end = std::chrono::steady_clock::now() + LIMIT;
    while (ended.size() < count && std::chrono::steady_clock::now() < end) {
      for (ExtractOutcome& outcome : pool->Work()) {
        ended[outcome.id] = std::move(outcome);
      }
      if (ended.size() < count) {
        Wait(std::min(end, pool->Due()));
      }
    }
    EXPECT_EQ(ended.size(), count);
    return ended;
  }

  ExtractOutcome Run(const std::string& name, std::string_view bytes = "x") {
    constexpr int MOST_TRIES = 3;
    for (int tries = 1;; ++tries) {  // a machine that stood still has started nothing
      Submit(1, name, bytes);
      ExtractOutcome outcome = std::move(Await(1)[1]);
      if (tries == MOST_TRIES || !outcome.reason.ends_with("does not start in time")) {
        return outcome;
      }
    }
  }

  void Wait(std::chrono::steady_clock::time_point until) const {
    std::vector<pollfd> polled;
    pool->AddPolled(polled);
    const auto left =
        std::chrono::ceil<std::chrono::milliseconds>(until - std::chrono::steady_clock::now());
    (void)poll(polled.data(), polled.size(), static_cast<int>(std::max<int64_t>(left.count(), 0)));
  }

  std::unique_ptr<ExtractPool> pool;
};

// "killed: reason", to be compared in one go.
inline std::string Told(const ExtractOutcome& outcome) {
  constexpr const char* RESULTS[] = {"done", "failed", "killed", "lost", "unread"};
  const std::string result = RESULTS[static_cast<int>(outcome.result)];
  return outcome.reason.empty() ? result : result + ": " + outcome.reason;
}

}  // namespace fileindexd
