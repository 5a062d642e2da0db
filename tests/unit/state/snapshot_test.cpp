// SPDX-License-Identifier: GPL-2.0-or-later
#include <filesystem>

#include "state/belonging.h"
#include "state/filesystem.h"
#include "tests/unit/state/mounts.h"

namespace fileindexd {
namespace {

// A btrfs at the share's root: "live" is a subvolume, "frozen" a read-only copy of it, "copy" a
// writable one, "sealed" read-only and no copy.
class SnapshotTest : public MountTest {
 protected:
  void SetUp() override {
    MountTest::SetUp();
    if (IsSkipped() || HasFatalFailure()) {
      return;
    }
    MountImage("btrfs", root);
    Run("btrfs subvolume create " + root + "/live");
    MakeFile(root + "/live/dir/file");
    Run("btrfs subvolume snapshot -r " + root + "/live " + root + "/frozen");
    Run("btrfs subvolume snapshot " + root + "/live " + root + "/copy");
    Run("btrfs subvolume create " + root + "/sealed");
    MakeFile(root + "/sealed/file");
    Run("btrfs property set " + root + "/sealed ro true");
  }

  Verdict At(const std::string& below) { return LookAt(settings, root + below).verdict; }
};

TEST_F(SnapshotTest, ReadOnlyCopiesDoNotBelong) {
  EXPECT_EQ(At("/frozen"), Verdict::IN_SNAPSHOT);
  EXPECT_EQ(At("/frozen/dir"), Verdict::IN_SNAPSHOT);
  EXPECT_EQ(At("/frozen/dir/file"), Verdict::IN_SNAPSHOT);
  EXPECT_EQ(At("/frozen/none"), Verdict::GONE);
  EXPECT_TRUE(IsInSnapshot(root, root + "/frozen"));
  EXPECT_TRUE(IsInSnapshot(root, root + "/frozen/dir/file"));
  EXPECT_TRUE(IsInSnapshot(root, root + "/frozen/none/none"));
}

TEST_F(SnapshotTest, OtherSubvolumesBelong) {
  for (const char* path :
       {"/live", "/live/dir/file", "/copy", "/copy/dir/file", "/sealed", "/sealed/file"}) {
    EXPECT_EQ(At(path), Verdict::BELONGS) << path;
    EXPECT_FALSE(IsInSnapshot(root, root + path)) << path;
  }
  EXPECT_FALSE(IsInSnapshot(root, root));
  EXPECT_FALSE(IsInSnapshot(root, root + "/none"));
}

TEST_F(SnapshotTest, ASubvolumeBelowASnapshotIsInIt) {
  Run("btrfs property set -f " + root + "/frozen ro false");
  Run("btrfs subvolume create " + root + "/frozen/dir/inner");
  MakeFile(root + "/frozen/dir/inner/file");
  ASSERT_EQ(At("/frozen/dir/inner/file"), Verdict::BELONGS);

  Run("btrfs property set " + root + "/frozen ro true");

  EXPECT_EQ(At("/frozen/dir/inner"), Verdict::IN_SNAPSHOT);
  EXPECT_EQ(At("/frozen/dir/inner/file"), Verdict::IN_SNAPSHOT);
}

TEST_F(SnapshotTest, AShareMayItselfBeASnapshot) {
  settings.shares[0].path = root + "/frozen";
  settings.folders[0].path = root + "/frozen";
  EXPECT_EQ(At("/frozen"), Verdict::BELONGS);
  EXPECT_EQ(At("/frozen/dir/file"), Verdict::BELONGS);
  EXPECT_FALSE(IsInSnapshot(root + "/frozen", root + "/frozen/dir/file"));
}

TEST_F(SnapshotTest, SnapshotsThatAreMountedCountAsMounts) {
  MakeFolder(root + "/mnt");
  Bind(root + "/frozen", root + "/mnt");
  EXPECT_EQ(At("/mnt"), Verdict::BELONGS);
  EXPECT_EQ(At("/mnt/dir/file"), Verdict::BELOW_MOUNT);
  Bind(root + "/live/dir", root + "/frozen/dir");
  EXPECT_EQ(At("/frozen/dir"), Verdict::IN_SNAPSHOT);
}

TEST_F(SnapshotTest, TheIdentityTellsSubvolumesApart) {
  const std::string identity = FilesystemIdentity(root);
  EXPECT_EQ(FilesystemIdentity(root + "/live/dir"), FilesystemIdentity(root + "/live"));
  EXPECT_NE(FilesystemIdentity(root + "/live"), identity);
  EXPECT_NE(FilesystemIdentity(root + "/copy"), FilesystemIdentity(root + "/live"));
}

TEST(SnapshotNameTest, TheNameCountsBelowTheRootOnly) {
  EXPECT_TRUE(IsInSnapshot("/s", "/s/#snapshot"));
  EXPECT_TRUE(IsInSnapshot("/s", "/s/a/#snapshot/b"));
  EXPECT_TRUE(IsInSnapshot("/", "/#snapshot/b"));
  EXPECT_FALSE(IsInSnapshot("/s/#snapshot/t", "/s/#snapshot/t/a"));
  EXPECT_FALSE(IsInSnapshot("/s", "/s/#snapshots/b"));
  EXPECT_FALSE(IsInSnapshot("/s", "/s/a#snapshot"));
  EXPECT_FALSE(IsInSnapshot("/s", "/s"));
}

}  // namespace
}  // namespace fileindexd
