// SPDX-License-Identifier: GPL-2.0-or-later
// A Worker in real work, on the platform that is shipped, cancelled at random moments: the process
// lives, nothing hangs or leaks, and a new Worker brings the index up to date.
#include <malloc.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <random>

#include "base/event_codes.h"
#include "daemon/daemon.h"
#include "index/compare.h"
#include "platform/log.h"
#include "state/filesystem.h"
#include "state/layout.h"
#include "state/queue_writer.h"
#include "tests/unit/standalone/read_log.h"
#include "tests/unit/state/mounts.h"
#include "worker/worker.h"

namespace fileindexd {
namespace {

namespace fs = std::filesystem;
using Microseconds = std::chrono::microseconds;

constexpr int JOIN_LIMIT = 1200;  // seconds; far beyond what a pass takes
constexpr int FOLDERS = 12;
constexpr int FILES = 20;   // in each folder
constexpr int EVENTS = 60;  // of a round
// Rounds. Between them, Workers find what cancelled ones left: to drain after each would leave them
// nothing to find.
constexpr int DRAIN_EVERY = 4;
constexpr int REINDEX_EVERY = 5;  // rounds
constexpr Microseconds SHORTEST_LIMIT{100};
// The allocator's own lists grow for some hundred rounds. Bytes.
constexpr size_t HEAP_SLACK = 96 << 10;

// So many Workers are cancelled while they work; a round whose Worker is done before its moment
// comes does not count.
int Wanted() {
  const char* scale = getenv("FILEINDEXD_TEST_SCALE");  // NOLINT(concurrency-mt-unsafe)
  return scale != nullptr && std::string_view(scale) == "long" ? 1000 : 60;
}
constexpr int ROUNDS_FOR_EACH = 30;  // at most: on a machine under load, most come too late

unsigned Seed() {
  const char* seed = getenv("FILEINDEXD_TEST_SEED");  // NOLINT(concurrency-mt-unsafe)
  return seed != nullptr ? static_cast<unsigned>(strtoul(seed, nullptr, 10))
                         : std::random_device()();
}

int CountIn(const char* folder) {
  int count = 0;
  for (const auto& entry : fs::directory_iterator(folder)) {
    (void)entry;
    ++count;
  }
  return count;
}

std::string OpenFiles() {
  std::string names;
  for (const auto& entry : fs::directory_iterator("/proc/self/fd")) {
    std::error_code closed;  // that of this look
    names += fs::read_symlink(entry, closed).string() + "\n";
  }
  return names;
}

class CancelledWorkerTest : public MountTest {
 protected:
  void SetUp() override {
#ifdef __SANITIZE_ADDRESS__
    GTEST_SKIP() << "the frames of a forced unwind stay poisoned, and what it calls runs into them";
#endif
    MountTest::SetUp();
    if (IsSkipped()) {
      return;
    }
    MountTmpfs(folder);
    MakeFolder(root);
    log = std::make_unique<ReadLog>();
    ASSERT_TRUE(log->socket.ready);
    store = OpenStore();
    ASSERT_NE(store, nullptr);
    ASSERT_TRUE(store->AddShare({"s", root, FilesystemIdentity(root)})) << store->Error();
    ASSERT_TRUE(store->AddFolder(root, {})) << store->Error();
    MakeTree();

    ASSERT_TRUE(daemon.SetupInotify());
    ASSERT_TRUE(daemon.SetupWorkers());
    ASSERT_TRUE(daemon.workers.contains("s"));
  }

  ~CancelledWorkerTest() override {
    TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_ERROR;
    daemon.DeleteWorker("s");
    if (daemon.inotify_fd >= 0) {
      close(daemon.inotify_fd);
    }
  }

  void MakeTree() {
    for (int at = 0; at < FOLDERS * FILES; ++at) {
      MakeFile(root + "/d" + std::to_string(at % FOLDERS) + "/f" + std::to_string(at));
    }
  }

  int Pick(int below) {
    return static_cast<int>(random() % static_cast<unsigned>(below));
  }

  // Takes away, or makes, a file or a whole folder.
  std::string ChangeDisk() {
    const std::string folder_path = root + "/d" + std::to_string(Pick(FOLDERS));
    const std::string name = "/f" + std::to_string(Pick(FOLDERS * FILES));
    const bool is_folder = Pick(8) == 0;
    std::error_code failure;
    if (Pick(2) == 0) {
      fs::remove_all(is_folder ? folder_path : folder_path + name, failure);
    } else {
      fs::create_directories(folder_path, failure);
      WriteFile(folder_path + name, "x");
    }
    return is_folder ? folder_path : folder_path + name;
  }

  // Changes the disk, with a line for each change.
  void MakeWork(int round) {
    std::vector<std::string> lines;
    for (int i = 0; i < EVENTS; ++i) {
      const std::string path = ChangeDisk();
      for (const std::string& changed : {fs::path(path).parent_path().string(), path}) {
        lines.push_back(
            EventLine(fs::exists(changed) ? CUSTOM_EVENT_REINDEX : QLIB_NOTIFY_DELETE, changed));
      }
    }
    if (round % REINDEX_EVERY == 0) {
      lines.push_back(EventLine(CUSTOM_EVENT_UPDATE, root));
    }
    std::string error;
    ASSERT_TRUE(AppendToQueue("s", lines, error)) << error;
  }

  // The thread's result, once it has ended by itself or was cancelled.
  void* Join() {
    void* result = nullptr;
    timespec until = {};
    clock_gettime(CLOCK_MONOTONIC, &until);
    until.tv_sec += JOIN_LIMIT;
    if (pthread_clockjoin_np(TheWorker().thread, &result, CLOCK_MONOTONIC, &until) != 0) {
      abort();  // a hang: nothing that the thread uses may be taken down
    }
    TheWorker().state = WORKER_IDLE;
    return result;
  }

  // At a moment of the time that a pass seems to take: on a machine that others use too, that
  // changes. The limit comes down where Workers are done before, and goes up where none is.
  void CancelWithin(Microseconds& limit) {
    ASSERT_TRUE(TheWorker().Run());
    usleep(static_cast<useconds_t>(Pick(static_cast<int>(limit.count()))));
    pthread_cancel(TheWorker().thread);
    if (Join() == PTHREAD_CANCELED) {
      ++cancelled;
      limit += limit / 32;
    } else {
      limit = std::max(limit - limit / 8, SHORTEST_LIMIT);
    }
    for (pthread_mutex_t* mutex :
         {&daemon.platform_mutex, &daemon.pause_mutex, &TheWorker().mutex}) {
      ASSERT_EQ(pthread_mutex_trylock(mutex), 0);
      pthread_mutex_unlock(mutex);
    }
  }

  void Revive() {
    daemon.DeleteWorker("s");
    ASSERT_EQ(CountIn("/proc/self/fd"), descriptors) << OpenFiles();
    ASSERT_NO_FATAL_FAILURE(AwaitThreads());
    ASSERT_EQ(waitpid(-1, nullptr, WNOHANG), -1);
    ASSERT_EQ(errno, ECHILD);
    ASSERT_TRUE(daemon.CreateWorker("s", false));
  }

  // One that was joined is listed a moment longer, and nothing tells of the end of that.
  void AwaitThreads() const {
    const auto end = std::chrono::steady_clock::now() + std::chrono::seconds(JOIN_LIMIT);
    while (CountIn("/proc/self/task") != threads) {
      ASSERT_LT(std::chrono::steady_clock::now(), end);
      sched_yield();
    }
  }

  bool HasWork() {
    ShareStatus status;
    EXPECT_TRUE(store->GetStatus("s", status)) << store->Error();
    return Exists(QueuePath("s")) || Exists(DrainedPath("s")) || status.needs_reindex ||
           status.reindex_begun;
  }

  // How long the passes took.
  Microseconds Drain() {
    const auto before = std::chrono::steady_clock::now();
    while (HasWork()) {
      EXPECT_TRUE(TheWorker().Run());
      EXPECT_EQ(Join(), nullptr);
    }
    return std::chrono::duration_cast<Microseconds>(std::chrono::steady_clock::now() - before);
  }

  std::vector<std::string> Differences() {
    std::vector<std::string> found;
    Comparison result;
    std::string error;
    EXPECT_TRUE(CompareShare(
        *store, "s",
        [&found](Difference difference, const std::string& path) {
          found.push_back(std::string(DifferenceText(difference)) + " " + path);
          return true;
        },
        result, error))
        << error;
    EXPECT_GT(result.entries, 1U);
    return found;
  }

  // What is amiss though no Worker has anything left to do.
  std::vector<std::string> Lost() {
    return HasWork() ? std::vector<std::string>() : Differences();
  }

  Worker& TheWorker() {
    return *daemon.workers.at("s");
  }

  // The process's first of all: what everybody leaves behind once.
  Microseconds WarmUp() {
    threads = CountIn("/proc/self/task");
    MakeWork(0);
    Drain();
    MakeWork(0);
    const Microseconds taken = Drain();
    daemon.DeleteWorker("s");
    descriptors = CountIn("/proc/self/fd");
    EXPECT_TRUE(daemon.CreateWorker("s", false));
    return taken;
  }

  const unsigned seed = Seed();
  std::mt19937 random{seed};
  std::unique_ptr<ReadLog> log;
  std::unique_ptr<StateStore> store;
  Daemon daemon;
  int descriptors = 0;  // without a Worker
  int threads = 0;
  int cancelled = 0;
};

TEST_F(CancelledWorkerTest, AtRandomMomentsLosesAndLeaksNothing) {
  printf("seed %u\n", seed);
  TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_DEBUG;  // every line is a moment of its own
  Microseconds limit = WarmUp();
  const int wanted = Wanted();
  int round = 0;
  int left_work = 0;  // rounds that did
  size_t heap = 0;

  while (cancelled < wanted) {
    ++round;
    SCOPED_TRACE("seed " + std::to_string(seed) + ", round " + std::to_string(round));
    ASSERT_LE(round, wanted * ROUNDS_FOR_EACH) << cancelled << " were cancelled";
    ASSERT_NO_FATAL_FAILURE(MakeWork(round));
    ASSERT_NO_FATAL_FAILURE(CancelWithin(limit));
    ASSERT_NO_FATAL_FAILURE(Revive());
    left_work += HasWork() ? 1 : 0;
    ASSERT_EQ(Lost(), std::vector<std::string>());
    if (round % DRAIN_EVERY == 0 || cancelled == wanted) {
      Drain();
      ASSERT_EQ(Differences(), std::vector<std::string>());
    }
    if (heap == 0 && cancelled >= wanted / 4) {
      heap = mallinfo2().uordblks;
    }
  }

  printf("%d cancelled in %d rounds, %d of which left work\n", cancelled, round, left_work);
  EXPECT_GT(left_work, 0);
  EXPECT_GT(log->lines, round);
  EXPECT_LT(mallinfo2().uordblks, heap + HEAP_SLACK);
}

}  // namespace
}  // namespace fileindexd
