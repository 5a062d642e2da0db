// SPDX-License-Identifier: GPL-2.0-or-later
#include "unit/fault/each.h"

#include <gtest/gtest.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <climits>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <map>
#include <string_view>

namespace fileindexd::fault {

namespace {

constexpr unsigned HANG_SECONDS = 1200;
constexpr int FAILED = 1;
constexpr int DID_NOT_STRIKE = 2;
constexpr size_t AT_ONCE = 4;  // the test is not alone on the machine
constexpr int USUAL_SCALE = 8;
constexpr int USUAL_SCALE_OF_LASTING = 3;   // a Worker waits in between
constexpr int LONG_SCALE_OF_MEMORY = 2000;  // of tens of thousands: all would take hours
// Of the last quarter of the calls, some may not come: how often a Worker looks at something varies
// with the time that it is given.
constexpr int QUARTERS_THAT_COME = 3;

bool IsLong() {
  const char* scale = getenv("FILEINDEXD_TEST_SCALE");  // NOLINT(concurrency-mt-unsafe): read only
  return scale != nullptr && std::string_view(scale) == "long";
}

int MostStories(const Fault& fault) {
  if (IsLong()) {
    return fault.call == Call::MEMORY ? LONG_SCALE_OF_MEMORY : INT_MAX;
  }
  return fault.times == FOR_EVER ? USUAL_SCALE_OF_LASTING : USUAL_SCALE;
}

// In memory where there is a place for it: these stories sync a lot.
std::string MakeFolder() {
  std::string folder = access("/dev/shm", W_OK) == 0 ? "/dev/shm/" : testing::TempDir();
  folder += "fault_test_XXXXXX";
  EXPECT_NE(mkdtemp(folder.data()), nullptr) << folder;
  return folder;
}

std::string EndOf(const std::string& path) {
  constexpr size_t ENOUGH = 3000;
  std::ifstream file(path);
  std::string text{std::istreambuf_iterator<char>(file), {}};
  return text.size() > ENOUGH ? text.substr(text.size() - ENOUGH) : text;
}

class Runs {
 public:
  Runs(const Fault& planned, const std::function<void(int)>& told)
      : fault(planned), story(told), folder(MakeFolder()) {}
  Runs(const Runs&) = delete;
  Runs& operator=(const Runs&) = delete;
  ~Runs() { std::filesystem::remove_all(folder); }

  int Count();
  void Start(int nth);
  void AwaitOne();

  std::map<pid_t, int> running;  // with the number of the call
  int struck = 0;
  int first_miss = INT_MAX;
  std::string found;  // what failed

 private:
  pid_t Fork(int nth, int answer);

  const Fault& fault;
  const std::function<void(int)>& story;
  std::string folder;
};

pid_t Runs::Fork(int nth, int answer) {
  fflush(stdout);
  const pid_t child = fork();
  if (child != 0) {
    return child;
  }

  prctl(PR_SET_PDEATHSIG, SIGKILL);
  alarm(HANG_SECONDS);
  const std::string own = folder + "/" + std::to_string(nth);
  std::filesystem::create_directory(own);
  // NOLINTNEXTLINE(concurrency-mt-unsafe): the process has one thread yet
  setenv("FILEINDEXD_STATE_DIR", (own + "/state").c_str(), 1);
  std::filesystem::current_path(own);
  Install();
  story(nth);
  std::filesystem::remove_all(own);
  const bool failed = testing::Test::HasFailure();  // the parent keeps its own to the end
  if (failed) {
    printf("its log:\n%s\n", Logged().c_str());
  }
  fflush(stdout);
  const int count = Counted();
  if (answer >= 0 && write(answer, &count, sizeof count) != sizeof count) {
    _exit(FAILED);
  }
  _exit(failed ? FAILED : Failed() > 0 ? 0 : DID_NOT_STRIKE);
}

// The calls of a run without a fault.
int Runs::Count() {
  int ends[2];
  EXPECT_EQ(pipe(ends), 0);
  const pid_t child = Fork(0, ends[1]);
  close(ends[1]);
  int count = 0;
  EXPECT_EQ(read(ends[0], &count, sizeof count), static_cast<ssize_t>(sizeof count));
  close(ends[0]);
  int status = 0;
  waitpid(child, &status, 0);
  EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == DID_NOT_STRIKE)
      << "without any fault, status " << status;
  return count;
}

void Runs::Start(int nth) {
  running[Fork(nth, -1)] = nth;
}

void Runs::AwaitOne() {
  int status = 0;
  const pid_t child = waitpid(-1, &status, 0);
  const int nth = running[child];
  running.erase(child);
  if (WIFSIGNALED(status)) {
    const bool hangs = WTERMSIG(status) == SIGALRM;
    found += "call " + std::to_string(nth) + (hangs ? " hangs\n" : " dies\n") +
             EndOf(folder + "/" + std::to_string(nth) + "/log");
    return;
  }
  if (WEXITSTATUS(status) == FAILED) {
    found += "call " + std::to_string(nth) + " fails the expectations above\n";
  }
  struck += WEXITSTATUS(status) == 0 ? 1 : 0;
  first_miss = WEXITSTATUS(status) == DID_NOT_STRIKE ? std::min(first_miss, nth) : first_miss;
}

}  // namespace

void ForEachCall(const Fault& fault, const std::function<void(int)>& story) {
  Runs runs(fault, story);
  const int count = runs.Count();
  ASSERT_GT(count, 0) << "the story makes no such call";

  const int step = std::max(1, count / MostStories(fault));
  int told = 0;
  for (int nth = 1; nth <= count; nth += step) {
    runs.Start(nth);
    ++told;
    if (runs.running.size() >= AT_ONCE) {
      runs.AwaitOne();
    }
  }
  while (!runs.running.empty()) {
    runs.AwaitOne();
  }
  EXPECT_EQ(runs.found, "");
  if (runs.found.empty()) {
    EXPECT_GT(runs.struck, 0);
    EXPECT_GT(runs.first_miss, count * QUARTERS_THAT_COME / 4) << "of " << count << " calls";
  }
  testing::Test::RecordProperty("calls", count);
  testing::Test::RecordProperty("told", told);
  testing::Test::RecordProperty("struck", runs.struck);
}

}  // namespace fileindexd::fault
