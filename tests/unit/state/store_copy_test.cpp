// SPDX-License-Identifier: GPL-2.0-or-later
// The copy beside the state database holds what was acknowledged, whatever fails or comes in
// between.
#include <dlfcn.h>
#include <fcntl.h>
#include <sqlite3.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <sys/types.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <functional>
#include <string>
#include <utility>
#include <vector>

#include "base/scoped_fd.h"
#include "state/store.h"
#include "tests/scripted/few_descriptors.h"
#include "tests/unit/state/store_fixture.h"

namespace {
std::function<void()> before_lock;  // run once, by the next call of flock
int locks_asked = 0;
int lock_failure = 0;  // errno of each call; 0: none fails
}  // namespace

extern "C" int flock(int fd, int operation) noexcept {
  using Function = int(int, int);
  static auto* const own = reinterpret_cast<Function*>(dlsym(RTLD_NEXT, "flock"));
  ++locks_asked;
  if (before_lock != nullptr) {
    std::exchange(before_lock, nullptr)();
  }
  if (lock_failure != 0) {
    errno = lock_failure;
    return -1;
  }
  return own(fd, operation);
}

namespace fileindexd {
namespace {

class StoreCopyTest : public StoreDamageTest {};

// One of SQLite's reads of files in this process fails, once.
class FailingRead {
 public:
  explicit FailingRead(int nth) {
    left = nth;
    for (const char* name : {"pread64", "pread"}) {
      auto* call = reinterpret_cast<Read*>(Vfs()->xGetSystemCall(Vfs(), name));
      if (call != nullptr && own == nullptr) {
        own = call;
        replaced = name;
        Vfs()->xSetSystemCall(Vfs(), name, reinterpret_cast<sqlite3_syscall_ptr>(Fail));
      }
    }
    EXPECT_NE(own, nullptr);
  }
  ~FailingRead() {
    Vfs()->xSetSystemCall(Vfs(), replaced, reinterpret_cast<sqlite3_syscall_ptr>(own));
    own = nullptr;
  }
  FailingRead(const FailingRead&) = delete;
  FailingRead& operator=(const FailingRead&) = delete;

  static bool HasFailed() { return left <= 0; }

 private:
  using Read = ssize_t(int, void*, size_t, off_t);

  static sqlite3_vfs* Vfs() { return sqlite3_vfs_find("unix"); }
  static ssize_t Fail(int fd, void* buffer, size_t size, off_t offset) {
    if (--left != 0) {
      return own(fd, buffer, size, offset);
    }
    errno = EIO;
    return -1;
  }

  static inline int left = 0;
  static inline Read* own = nullptr;
  const char* replaced = nullptr;
};

// SQLite's check of a database does not look into what is too long for one page.
TEST_F(StoreCopyTest, AReadThatFailsLeavesNoGapInALongPattern) {
  const std::vector<std::string> patterns = {std::string(4000, 'p')};
  ASSERT_TRUE(OpenStore()->AddFolder("/v/a/f", {}, patterns));
  bool has_failed = true;
  int nth = 0;
  while (has_failed) {
    const auto store = OpenStore();
    ASSERT_TRUE(OpenStore()->SetPause(nth));  // the other one has to read all anew
    {
      const FailingRead failing(++nth);
      (void)store->SetMarker("m" + std::to_string(nth));
      has_failed = FailingRead::HasFailed();
    }

    std::shared_ptr<const Settings> settings;
    ASSERT_TRUE(OpenStore()->GetSettings(settings));
    ASSERT_TRUE(settings->FolderAt("/v/a/f")->excludes.patterns == patterns) << nth;
    ASSERT_FALSE(Exists(database + ".damaged")) << nth;
  }
  EXPECT_GT(nth, 5);
}

// The log went between the commit and the lock under which the copy is left.
TEST_F(StoreCopyTest, AChangeThatWentWithTheLogMeanwhileIsMadeAgain) {
  OtherProgram other("/v/a/b");
  const auto store = OpenStore();
  before_lock = [&] {
    std::filesystem::remove(database + "-wal");
    std::filesystem::remove(database + "-shm");
    other.Act();
  };

  ASSERT_TRUE(store->AddFolder("/v/a/c", {})) << store->Error();

  EXPECT_EQ(before_lock, nullptr);
  std::shared_ptr<const Settings> settings;
  ASSERT_TRUE(OpenStore()->GetSettings(settings));
  EXPECT_NE(settings->FolderAt("/v/a/b"), nullptr);
  EXPECT_NE(settings->FolderAt("/v/a/c"), nullptr);
  EXPECT_FALSE(Exists(database + ".damaged"));
}

// The change is in the log, and would be refused a second time: the folder is there.
TEST_F(StoreCopyTest, AChangeThatIsStillThereWithoutItsSharedMemoryIsMadeOnce) {
  const auto store = OpenStore();
  before_lock = [&] { std::filesystem::remove(database + "-shm"); };

  ASSERT_TRUE(store->AddFolder("/v/a/c", {})) << store->Error();

  EXPECT_EQ(before_lock, nullptr);
  WriteFile(database, std::string(10'000, 'x'));
  std::shared_ptr<const Settings> settings;
  ASSERT_TRUE(OpenStore()->GetSettings(settings));
  EXPECT_NE(settings->FolderAt("/v/a/c"), nullptr);
}

// Whoever has it may stand still.
TEST_F(StoreCopyTest, AnotherProgramsLockOnTheRootKeepsOutWhoChangesAndNotWhoReads) {
  ScopedFd root(open(state_root.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  ASSERT_EQ(flock(root.fd, LOCK_EX), 0);

  const auto store = OpenStore();
  ASSERT_NE(store, nullptr);
  ExpectAllThere(*store);
  locks_asked = 0;
  EXPECT_FALSE(store->SetPause(5));
  EXPECT_EQ(locks_asked, 1);  // the opening has waited
  EXPECT_NE(store->Error().find("cannot lock " + state_root), std::string::npos) << store->Error();
  ExpectAllThere(*store);
  EXPECT_FALSE(store->Touch());

  root.Close();
  EXPECT_TRUE(store->Touch()) << store->Error();
  EXPECT_TRUE(store->SetPause(5)) << store->Error();
}

TEST_F(StoreCopyTest, WithoutTheRootsLockWhatWouldHaveToBePutRightIsLeftAsItIs) {
  auto killed = OpenStore();
  ASSERT_TRUE(killed->SetPause(5));
  const std::string log = ReadFile(database + "-wal");
  killed.reset();
  const std::string good = ReadFile(database);
  std::string older = good;
  older[63] = static_cast<char>(older[63] - 1);  // the version's last byte
  std::string scribbled = good;
  scribbled.replace(4096, 4096, 4096, '\x5a');
  const std::vector<std::pair<std::string, std::string>> kinds = {
      {older, ""}, {scribbled, ""}, {"", log}, {good, "FIFO"}};
  for (const auto& [tables, log_beside] : kinds) {
    WriteFile(database, tables);
    if (log_beside == "FIFO") {
      std::filesystem::remove(database + "-wal");
      ASSERT_EQ(mkfifo((database + "-wal").c_str(), 0600), 0);
    } else if (!log_beside.empty()) {
      WriteFile(database + "-wal", log_beside);
    }
    lock_failure = ENOLCK;
    std::string error;
    EXPECT_EQ(StateStore::Open(error), nullptr) << tables.size();
    lock_failure = 0;

    EXPECT_NE(error.find("cannot lock " + state_root), std::string::npos) << error;
    EXPECT_TRUE(ReadFile(database) == tables) << tables.size();
    EXPECT_TRUE(log_beside != log || ReadFile(database + "-wal") == log);
    EXPECT_FALSE(Exists(database + ".damaged"));
  }
}

TEST_F(StoreCopyTest, ACopyThatCannotBeOpenedIsNotSaidToBeUnsound) {
  std::filesystem::remove(database);
  std::string error;
  {
    const scripted::FewDescriptors few(1);  // for the lock
    EXPECT_EQ(StateStore::Open(error), nullptr);
  }
  EXPECT_NE(error.find(copy + ": Too many open files"), std::string::npos) << error;
  EXPECT_EQ(error.find("no sound copy"), std::string::npos) << error;

  ExpectAllThere(*OpenStore());
}

}  // namespace
}  // namespace fileindexd
