// SPDX-License-Identifier: GPL-2.0-or-later
// Processes that there is too little for, or that take their time to start.
#include "extract/starter.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/fanotify.h>
#include <sys/resource.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <new>
#include <thread>

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

// A program of which no process starts until it is let go on.
class HeldProgram {
 public:
  HeldProgram() : events(fanotify_init(FAN_CLASS_CONTENT | FAN_CLOEXEC, O_RDONLY | O_CLOEXEC)) {
    std::filesystem::copy_file(SCRIPTED_HELPER, path,
                               std::filesystem::copy_options::overwrite_existing);
  }
  HeldProgram(const HeldProgram&) = delete;
  HeldProgram& operator=(const HeldProgram&) = delete;
  ~HeldProgram() { std::filesystem::remove(path); }

  void Hold() const {
    ASSERT_EQ(fanotify_mark(events.fd, FAN_MARK_ADD, FAN_OPEN_EXEC_PERM, AT_FDCWD, path.c_str()), 0)
        << strerror(errno);
  }
  // The process that begins to be started.
  pid_t AwaitStart() {
    fanotify_event_metadata event = {};
    EXPECT_EQ(read(events.fd, &event, sizeof(event)), static_cast<ssize_t>(sizeof(event)));
    ScopedFd file(event.fd);
    held.Swap(file);
    return event.pid;
  }
  int Descriptor() const { return events.fd; }
  // And from now on.
  void LetGo() {
    events.Close();
    held.Close();
  }

  const std::string path = testing::TempDir() + "/held_helper_" + std::to_string(getpid());

 private:
  ScopedFd events;
  ScopedFd held;
};

class HeldStartTest : public PoolFixture {
 public:
  void SetUp() override {
    PoolOptions options;
    options.program = program.path;
    OpenPool(options);
  }
  // Works until a process begins to be started.
  void WorkUntilStart() {
    pollfd start = {program.Descriptor(), POLLIN, 0};
    while (poll(&start, 1, 0) == 0) {
      std::vector<pollfd> polled = {start};
      pool->AddPolled(polled);
      ASSERT_GT(poll(polled.data(), polled.size(), -1), 0);
      ASSERT_TRUE(pool->Work().empty());
    }
    (void)program.AwaitStart();
  }
  // At the job's deadline.
  std::string ToldInTheEnd() {
    std::vector<ExtractOutcome> ended = pool->Work();
    if (ended.empty()) {
      ended = pool->Work(pool->Due());
    }
    return ended.size() == 1 ? Told(ended.front()) : std::to_string(ended.size()) + " outcomes";
  }

  HeldProgram program;
};

TEST_F(HeldStartTest, AHelperThatStartsSlowlyHoldsNobodyUp) {
  program.Hold();
  Submit(1, "text late");
  (void)program.AwaitStart();
  EXPECT_TRUE(pool->Work().empty());
  program.LetGo();
  EXPECT_EQ(Told(Await(1)[1]), "done");
}

TEST_F(HeldStartTest, AConverterThatStartsSlowlyHoldsNobodyUp) {
  EXPECT_EQ(Told(Run("text a")), "done");
  program.Hold();
  Submit(1, "convert catdoc", "say text late");
  WorkUntilStart();
  EXPECT_TRUE(pool->Work().empty());
  program.LetGo();
  EXPECT_EQ(Told(Await(1)[1]), "done");
}

TEST_F(HeldStartTest, WhatIsAbortedWhileItStartsIsKilledThen) {
  program.Hold();
  Submit(1, "text never");
  const pid_t started = program.AwaitStart();
  pool->Abort();
  EXPECT_EQ(pool->Running(), 0U);
  program.LetGo();
  EXPECT_EQ(Told(Run("text on")), "done");
  EXPECT_NE(kill(started, 0), 0);
}

TEST_F(HeldStartTest, WhatDoesNotStartLosesItsJobsUntilItDoes) {
  program.Hold();
  Submit(1, "text a");
  (void)program.AwaitStart();
  EXPECT_EQ(ToldInTheEnd(), "lost: " + program.path + ": does not start in time");
  std::string told;
  for (int job = 0; job < 10; ++job) {  // what hangs keeps files open: there is an end to it
    Submit(1, "text a");
    told = ToldInTheEnd();
  }
  EXPECT_EQ(told, "lost: " + program.path + ": does not start");
  program.LetGo();
  while (Told(Run("text on")) != "done") {
    std::this_thread::yield();
  }
}

TEST_F(HeldStartTest, AConverterThatDoesNotStartIsNotTheFilesFault) {
  EXPECT_EQ(Told(Run("text a")), "done");
  program.Hold();
  Submit(1, "convert catdoc", "say text late");
  WorkUntilStart();
  EXPECT_EQ(ToldInTheEnd(), "lost: catdoc: does not start in time");
  program.LetGo();
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
    const uint64_t asked = starter.Ask("/bin/true", {}, files, error);
    pollfd told = {starter.Descriptor(), POLLIN, 0};
    if (asked == 0 || poll(&told, 1, -1) != 1 ||
        !starter.Take(asked, child, error).value_or(false)) {
      return error;
    }
    EXPECT_EQ(poll(&told, 1, 0), 0) << "there is nothing more to take";
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
