// SPDX-License-Identifier: GPL-2.0-or-later
// The disk of the contents runs full at every point of the work, and gets space again later.
#include <fcntl.h>
#include <sys/statvfs.h>
#include <unistd.h>

#include "base/scoped_fd.h"
#include "state/layout.h"
#include "tests/unit/index/contents_fixture.h"

namespace fileindexd {

class ContentsDiskTest : public ContentsTest {
 protected:
  void MountRoot() override {
    MakeFolder(state_root);
    Run("mount -t tmpfs -o size=24M none " + state_root);
    mounted.push_back(state_root);
  }

  // Leaves that many bytes, rounded to pages.
  void FillBut(size_t bytes) {
    struct statvfs space {};
    ASSERT_EQ(statvfs(state_root.c_str(), &space), 0);
    const size_t left = space.f_bavail * space.f_frsize;
    const ScopedFd file(
        open((state_root + "/ballast").c_str(), O_CREAT | O_WRONLY | O_CLOEXEC, 0600));
    ASSERT_EQ(posix_fallocate(file.fd, 0, static_cast<off_t>(left > bytes ? left - bytes : 1)), 0);
  }
  void Free() { RemoveTree(state_root + "/ballast"); }

  // All that is to be done, until it is done or fails.
  bool WorkThrough() {
    bool more = true;
    while (more) {
      if (!contents->TakeIn(100, more)) {
        return false;
      }
    }
    std::vector<ContentJob> jobs;
    do {
      if (!contents->NextJobs(8, jobs, more)) {
        return false;
      }
      std::vector<int64_t> files;
      for (const ContentJob& job : jobs) {
        files.push_back(job.file);
      }
      if (!files.empty() && !contents->BeginTries(files)) {
        return false;
      }
      for (const ContentJob& job : jobs) {
        if (!contents->Finish(job.file, TextContent(Text(job.file)))) {
          return false;
        }
      }
    } while (more);
    return contents->Commit();
  }
  // Words that are nowhere else.
  static std::string Text(int64_t file) {
    std::string text = "common";
    for (int word = 0; word < 300; ++word) {
      text += " w" + std::to_string(file) + "x" + std::to_string(word);
    }
    return text;
  }

  static constexpr int FILES = 60;
};

TEST_F(ContentsDiskTest, WorkThatFailsIsDoneOnceThereIsSpaceAgain) {
  int failed = 0;
  for (int round = 0; round < 16; ++round) {
    for (int i = 0; i < FILES; ++i) {
      const std::string name = "f" + std::to_string(i) + ".txt";
      WriteFile(At(name), "bytes of " + std::to_string(round));
      Add(name);
    }
    Commit();
    FillBut(static_cast<size_t>(round) * 81920);
    if (!WorkThrough()) {
      ++failed;
      EXPECT_NE(contents->Error(), IndexError::DAMAGED) << round;
    }
    Free();

    contents->Close();
    ASSERT_EQ(contents->Open(TheShare(), 1), IndexError::NONE) << round;
    contents->LookAtAll();
    ASSERT_TRUE(WorkThrough()) << round << ": " << IndexErrorText(contents->Error());
    EXPECT_EQ(Number("SELECT count(*) FROM files WHERE state = 1"), FILES) << round;
    EXPECT_EQ(Number("SELECT count(*) FROM texts"), FILES) << round;
    EXPECT_EQ(Number("SELECT sum(done) * 1000 + sum(waiting) FROM counts"), FILES * 1000) << round;
    EXPECT_EQ(Holding("common"), FILES) << round;
  }
  EXPECT_GT(failed, 2);
  EXPECT_NE(access((ContentsPath("s") + ".damaged").c_str(), F_OK), 0);
}

}  // namespace fileindexd
