// SPDX-License-Identifier: GPL-2.0-or-later
// Programs run on the platform that is shipped.
#include <dlfcn.h>
#include <sqlite3.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <ctime>
#include <filesystem>

#include "platform/share.h"
#include "platform/standalone/environment.h"
#include "platform/system.h"
#include "state/filesystem.h"
#include "state/layout.h"
#include "tests/scripted/few_descriptors.h"
#include "tests/unit/state/mounts.h"

namespace {

std::atomic<useconds_t> slept = 0;
std::atomic<int> fork_failure = 0;  // errno of the next one; 0: it does not fail

}  // namespace

// Both in front of the C library's.
extern "C" pid_t fork() noexcept {
  static auto* const own = reinterpret_cast<pid_t (*)()>(dlsym(RTLD_NEXT, "fork"));
  const int error = fork_failure.exchange(0);
  if (error != 0) {
    errno = error;
    return -1;
  }
  return own();
}

extern "C" int usleep(useconds_t time) {
  slept += time;
  const timespec duration = {static_cast<time_t>(time / 1000000),
                             static_cast<long>(time % 1000000) * 1000};
  return nanosleep(&duration, nullptr);
}

namespace fileindexd {
namespace {

class ServicesTest : public MountTest {
 protected:
  void SetUp() override {
    MountTest::SetUp();
    if (IsSkipped()) {
      return;
    }
    MakeFolder(root);
    const auto store = OpenStore();
    ASSERT_NE(store, nullptr);
    ASSERT_TRUE(store->AddShare({"s", root, FilesystemIdentity(root)})) << store->Error();
    std::string error;
    ASSERT_TRUE(MakeShareFolder("s", error)) << error;
    ASSERT_EQ(CurrentSettings()->shares.size(), 1U);
    drained_path = DrainedPath("s");
    WriteFile(drained_path, "");
    slept = 0;
  }

  int RemoveDrained() {
    return QLIBCExec("/bin/rm", "-rf", drained_path.c_str(), nullptr, nullptr);
  }

  std::string drained_path;
};

TEST_F(ServicesTest, ADrainedCopyIsRemovedWithoutAPause) {
  EXPECT_EQ(RemoveDrained(), 0);
  EXPECT_FALSE(std::filesystem::exists(drained_path));
  EXPECT_EQ(slept, 0U);
}

TEST_F(ServicesTest, ARemovalThatLacksADescriptorIsFollowedByAPause) {
  const std::string path = drained_path;
  int result = 0;
  {
    const scripted::FewDescriptors none(0);
    // The sanitizers look at the object of a member's call by way of a descriptor.
    result = QLIBCExec("/bin/rm", "-rf", path.c_str(), nullptr, nullptr);
  }

  EXPECT_EQ(result, -1);
  EXPECT_TRUE(std::filesystem::exists(drained_path));
  EXPECT_GT(slept, 0U);  // the Worker tries again at once, as long as there is a queue
}

TEST_F(ServicesTest, ARemovalThatLacksAProcessIsFollowedByAPause) {
  fork_failure = EAGAIN;

  EXPECT_EQ(RemoveDrained(), -1);

  EXPECT_TRUE(std::filesystem::exists(drained_path));
  EXPECT_GT(slept, 0U);
  EXPECT_EQ(RemoveDrained(), 0);
}

TEST_F(ServicesTest, ACopyWhoseChangesAreLostGoesOnceTheReindexIsOnRecord) {
  TALO::FILEINDEX::NoteLostChanges(root, EIO);
  sqlite3* db = nullptr;
  ASSERT_EQ(sqlite3_open((state_root + "/state.db").c_str(), &db), SQLITE_OK);
  ASSERT_EQ(sqlite3_exec(db, "BEGIN IMMEDIATE", nullptr, nullptr, nullptr), SQLITE_OK);

  EXPECT_EQ(RemoveDrained(), -1);
  EXPECT_TRUE(std::filesystem::exists(drained_path));

  sqlite3_close(db);
  EXPECT_EQ(RemoveDrained(), 0);
  EXPECT_FALSE(std::filesystem::exists(drained_path));
  EXPECT_TRUE(StatusOf("s").needs_reindex);
  EXPECT_TRUE(std::filesystem::exists(QueuePath("s")));  // which wakes the Worker
}

TEST_F(ServicesTest, ChangesThatNoShareHasAreNotMissed) {
  TALO::FILEINDEX::NoteLostChanges(folder + "/elsewhere", EIO);

  EXPECT_EQ(RemoveDrained(), 0);
  EXPECT_FALSE(StatusOf("s").needs_reindex);
}

}  // namespace
}  // namespace fileindexd
