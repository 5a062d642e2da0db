// SPDX-License-Identifier: GPL-2.0-or-later
// What a process is started with when there is too little for it.
#include "extract/starter.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/resource.h>
#include <unistd.h>

#include <atomic>
#include <cstdlib>
#include <new>

#include "pool_fixture.h"

namespace {

std::atomic<bool> only_first_has_memory{false};
thread_local bool is_first = false;  // the thread of the tests

}  // namespace

void* operator new(size_t size) {
  void* memory = only_first_has_memory && !is_first ? nullptr : malloc(size);
  if (memory == nullptr) {
    throw std::bad_alloc();
  }
  return memory;
}

void operator delete(void* memory) noexcept {
  free(memory);
}

void operator delete(void* memory, size_t /*size*/) noexcept {
  free(memory);
}

namespace fileindexd {

namespace {

TEST_F(PoolFixture, AHelperThatThereIsNoMemoryToStartLosesItsJobAlone) {
  PoolOptions options;
  options.program = SCRIPTED_HELPER;
  OpenPool(options);
  is_first = true;
  only_first_has_memory = true;
  EXPECT_EQ(Told(Run("text a")), "lost: no memory");
  only_first_has_memory = false;
  EXPECT_EQ(Told(Run("text a")), "done");
}

// With three standard files, the starter's ends and nothing else open.
class StarterTest : public ::testing::Test {
 public:
  // The asker's end of the socket is 3, the starter's own is 4, and 4 is free again for the asker.
  static constexpr rlim_t ROOM_FOR_ONE = 5;

  void SetUp() override {
    ASSERT_EQ(close_range(STDERR_FILENO + 1, ~0U, 0), 0);
    std::string error;
    ASSERT_TRUE(starter.Open(error)) << error;
    ASSERT_EQ(getrlimit(RLIMIT_NOFILE, &before), 0);
  }
  void TearDown() override { Limit(before.rlim_cur); }

  void Limit(rlim_t files) const {
    const rlimit limit = {files, before.rlim_max};
    ASSERT_EQ(setrlimit(RLIMIT_NOFILE, &limit), 0);
  }

  // Empty, or why not.
  std::string Started(const ChildFiles& files) {
    Child child;
    std::string error;
    if (!starter.Start("/bin/true", {}, files, child, error)) {
      return error;
    }
    pollfd ended = {child.pid_fd.fd, POLLIN, 0};
    EXPECT_EQ(poll(&ended, 1, -1), 1);
    EXPECT_TRUE(Reap(child).has_value());
    return "";
  }

  static ScopedFd FarAway() { return ScopedFd(fcntl(STDIN_FILENO, F_DUPFD_CLOEXEC, 64)); }

  Starter starter;
  rlimit before = {};
};

TEST_F(StarterTest, WhatDoesNotGetAllItsFilesIsNotStarted) {
  const ScopedFd input = FarAway();
  const ScopedFd output = FarAway();
  Limit(ROOM_FOR_ONE);
  EXPECT_EQ(Started({input.fd, output.fd, -1}), "/bin/true: Too many open files");
  Limit(before.rlim_cur);
  EXPECT_EQ(Started({input.fd, output.fd, -1}), "");
}

TEST_F(StarterTest, AFileThatCannotBeMovedOutOfTheWayIsNotLeftOut) {
  const ScopedFd input = FarAway();
  Limit(ROOM_FOR_ONE);
  EXPECT_EQ(Started({input.fd, -1, -1}), "/bin/true: Too many open files");
  Limit(before.rlim_cur);
  EXPECT_EQ(Started({input.fd, -1, -1}), "");
}

}  // namespace

}  // namespace fileindexd
