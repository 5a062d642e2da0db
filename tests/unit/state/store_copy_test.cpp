// SPDX-License-Identifier: GPL-2.0-or-later
// The copy beside the state database holds what was acknowledged, whatever fails or comes in
// between.
#include <sqlite3.h>
#include <sys/types.h>

#include <cerrno>
#include <string>
#include <vector>

#include "state/store.h"
#include "tests/unit/state/store_fixture.h"

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

}  // namespace
}  // namespace fileindexd
