// SPDX-License-Identifier: GPL-2.0-or-later
// The state's disk runs full at every point of a batch, and gets space again later.
#include <fcntl.h>
#include <sys/statvfs.h>
#include <unistd.h>

#include <vector>

#include "tests/unit/index/fixture.h"

namespace fileindexd {

class FullDiskTest : public IndexTest {
 protected:
  void MountRoot() override {
    MakeFolder(state_root);
    Run("mount -t tmpfs -o size=16M none " + state_root);
    mounted.push_back(state_root);
    for (int i = 0; i < FILES; ++i) {
      WriteFile(At("some picture of " + std::to_string(i) + ".jpg"), "");
    }
  }

  // Leaves that many bytes, rounded to pages.
  void FillBut(size_t bytes) {
    struct statvfs space {};
    ASSERT_EQ(statvfs(state_root.c_str(), &space), 0);
    const size_t left = space.f_bavail * space.f_frsize;
    const int fd = open((state_root + "/ballast").c_str(), O_CREAT | O_WRONLY | O_CLOEXEC, 0600);
    ASSERT_GE(fd, 0);
    ASSERT_EQ(posix_fallocate(fd, 0, static_cast<off_t>(left > bytes ? left - bytes : 1)), 0);
    close(fd);
  }
  void Free() { RemoveTree(state_root + "/ballast"); }

  // Adds everything; some may fail.
  bool Batch() {
    bool all = writer->Add(root, {});
    for (int i = 0; i < FILES; ++i) {
      all = writer->Add(At("some picture of " + std::to_string(i) + ".jpg"), {}) && all;
    }
    return all;
  }

  static constexpr int FILES = 3000;
};

TEST_F(FullDiskTest, BatchIsWholeOnceThereIsSpaceAgain) {
  int failed = 0;
  for (size_t space = 0; space < 1200000; space += 40960) {
    writer->Delete(root, DeleteMode::ALL);
    Commit();
    OpenWriter();
    FillBut(space);
    const bool added = Batch();
    const bool committed = writer->Commit();
    failed += committed ? 0 : 1;
    if (!committed) {
      EXPECT_NE(writer->last_error, IndexError::NONE);
      EXPECT_FALSE(writer->Commit());
    } else {
      EXPECT_TRUE(added || committed);
    }
    Free();

    Commit();
    EXPECT_EQ(Differences(), Names()) << space;
    EXPECT_EQ(Held().size(), FILES + 1U) << space;
  }
  EXPECT_GT(failed, 2);
}

TEST_F(FullDiskTest, OperationsOfAFullDiskAreReplayedByTheNextOnes) {
  AddAll();
  writer->Delete(root, DeleteMode::ALL);
  Commit();
  FillBut(0);
  EXPECT_FALSE(Batch() && writer->Commit());
  Free();

  WriteFile(At("later"), "");
  // A long list is not replayed at each operation; the commit brings all of it.
  (void)writer->Add(At("later"), {});
  Commit();
  EXPECT_EQ(Differences(), Names());
}

// A rename's second line finds nothing left to do. What it asked for is lost with the transaction
// all the same, and by the time of the replay the first one's path is gone, which told of the
// other.
TEST_F(FullDiskTest, WhatFoundItsWorkDoneIsReplayedToo) {
  AddAll();
  ASSERT_EQ(rename(At("some picture of 0.jpg").c_str(), At("moved.jpg").c_str()), 0);
  Refresh("moved.jpg");
  Delete("some picture of 0.jpg");
  FillBut(0);
  for (int i = 1; i < FILES; ++i) {
    WriteFile(At("some picture of " + std::to_string(i) + ".jpg"), "changed");
  }
  ASSERT_FALSE(Batch() && writer->Commit());

  RemoveTree(At("moved.jpg"));
  Free();
  Delete("moved.jpg");
  Commit();
  EXPECT_EQ(Differences(), Names());
}

// A long list is replayed once a second. Until then nothing is carried out before it: an older
// delete would come behind a newer add.
TEST_F(FullDiskTest, WhatComesBetweenTwoReplaysWaitsItsTurn) {
  AddAll();
  Delete("some picture of 0.jpg");
  FillBut(0);
  for (int i = 1; i < FILES; ++i) {
    WriteFile(At("some picture of " + std::to_string(i) + ".jpg"), "changed");
    Refresh("some picture of " + std::to_string(i) + ".jpg");
  }
  ASSERT_FALSE(writer->Commit());
  Refresh("some picture of 1.jpg");
  ASSERT_FALSE(writer->Commit());

  (void)writer->Add(At("some picture of 0.jpg"), {});
  Free();
  Commit();
  EXPECT_EQ(Differences(), Names());
}

TEST_F(FullDiskTest, CreationOnAFullDiskSucceedsLater) {
  writer.reset();
  RemoveTree(state_root + "/shares/s");
  WantRebuild();
  for (size_t space = 0; space < 200000; space += 4096) {
    FillBut(space);
    OpenWriter();
    const bool open = writer->IsOpen();
    Free();
    if (!open) {
      EXPECT_NE(writer->last_error, IndexError::NONE);
      (void)writer->Add(root, {});
      Commit();
      EXPECT_TRUE(writer->IsOpen()) << space;
    }
    AddAll();
    EXPECT_EQ(Differences(), Names()) << space;
    writer.reset();
    RemoveTree(state_root + "/shares/s");
    WantRebuild();
  }
}

}  // namespace fileindexd
