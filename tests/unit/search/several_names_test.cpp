// SPDX-License-Identifier: GPL-2.0-or-later
// A file of which no name can be opened, each for a reason of its own.
#include <fcntl.h>
#include <gmock/gmock.h>
#include <sys/mount.h>

#include <cerrno>
#include <cstring>

#include "search/share_contents.h"
#include "tests/unit/search/scripted.h"
#include "tests/unit/state/mounts.h"

namespace fileindexd {
namespace {

constexpr int64_t WALL = 1'900'000'000;

class SeveralNamesTest : public MountTest {
 protected:
  // A file system whose server is gone, and which asks it for that user alone.
  void MountServerless(const std::string& at, int user) {
    const ScopedFd server(open("/dev/fuse", O_RDWR | O_CLOEXEC));
    if (server.fd < 0) {
      GTEST_SKIP() << "needs /dev/fuse";
    }
    MakeFolder(at);
    const std::string id = std::to_string(user);
    const std::string options =
        "fd=" + std::to_string(server.fd) + ",rootmode=40000,user_id=" + id + ",group_id=" + id;
    ASSERT_EQ(mount("none", at.c_str(), "fuse", 0, options.c_str()), 0) << strerror(errno);
    mounted.push_back(at);
  }
  static int ErrorOf(const std::string& path) {
    const ScopedFd file(open(path.c_str(), O_PATH | O_CLOEXEC));
    return file.fd < 0 ? errno : 0;
  }
  void Settle() {
    for (int slices = 0; slices < 100 && contents.Due() <= now; ++slices) {
      contents.Work(now, WALL);
    }
  }

  ShareContents contents{{"s", root, ""}};
  Time now = Time(std::chrono::hours(1));
};

TEST_F(SeveralNamesTest, TheReasonIsThatOfTheNameThatPromisesMost) {
  ForgetScripted();
  MakeFolder(state_root);
  for (const auto& [name, user] : {std::pair("/gone", 0), std::pair("/closed", 1)}) {
    MountServerless(root + name, user);
    if (IsSkipped()) {
      return;
    }
  }
  const std::string gone = root + "/gone/a";
  const std::string closed = root + "/closed/a";
  const int error = ErrorOf(gone);
  ASSERT_EQ(ErrorOf(closed), EACCES);
  WriteFile(root + "/a", "text");
  Scripted("s").entries[1].job.identity = IdentityOf(root + "/a");
  Scripted("s").entries[1].job.paths = {gone, closed};
  Settle();

  ExtractJob job;
  EXPECT_FALSE(contents.Next(ShareContents::Turn::NEW, now, 1, job));
  Settle();
  now += std::chrono::seconds(1);
  Settle();

  EXPECT_EQ(Scripted("s").kept[1].state, ScriptedFile::State::UNREAD);
  EXPECT_THAT(Scripted("s").kept[1].text, testing::HasSubstr(strerror(error)));
}

}  // namespace
}  // namespace fileindexd
