// SPDX-License-Identifier: GPL-2.0-or-later
#include "notify/mount_table.h"

#include <sys/stat.h>
#include <sys/sysmacros.h>

#include "tests/unit/state/mounts.h"

namespace fileindexd {
namespace {

class MountTableTest : public MountTest {
 protected:
  const Mount* Of(const std::string& path) {
    EXPECT_TRUE(table.Read());
    return table.MountOf(path);
  }
  std::string PointOf(const std::string& path) {
    const Mount* mount = Of(path);
    return mount == nullptr ? "none" : mount->point;
  }

  MountTable table;
};

// By hand: what no namespace of a test can be brought into.
MountTable Table(std::vector<Mount> mounts) {
  MountTable table;
  table.mounts = std::move(mounts);
  return table;
}

TEST_F(MountTableTest, FieldsAreThoseOfTheKernel) {
  MountTmpfs(root);

  const Mount* mount = Of(root + "/a");

  struct stat st {};
  ASSERT_EQ(stat(root.c_str(), &st), 0);
  ASSERT_NE(mount, nullptr);
  EXPECT_EQ(mount->point, root);
  EXPECT_EQ(mount->root, "/");
  EXPECT_EQ(mount->type, "tmpfs");
  EXPECT_EQ(mount->source, "none");
  EXPECT_EQ(mount->device,
            std::to_string(major(st.st_dev)) + ":" + std::to_string(minor(st.st_dev)));
}

TEST_F(MountTableTest, StrangeBytesInNamesSurvive) {
  const std::string strange = root + "/a b\tc\nd\\040e\xff";
  MountTmpfs(strange);

  EXPECT_EQ(PointOf(strange + "/x"), strange);
}

TEST_F(MountTableTest, AnEmptySourceDoesNotShiftTheFields) {
  ASSERT_EQ(system(("mount -t tmpfs '' " + root + " 2>/dev/null").c_str()), 0);
  mounted.push_back(root);

  const Mount* mount = Of(root);

  ASSERT_NE(mount, nullptr);
  EXPECT_EQ(mount->point, root);
  EXPECT_EQ(mount->type, "tmpfs");
}

TEST_F(MountTableTest, OfMountsAtOnePointTheLastIsOnTop) {
  MountTmpfs(root);
  const uint64_t first = Of(root)->id;
  MountTmpfs(root);

  EXPECT_NE(Of(root)->id, first);
  EXPECT_EQ(Of(root)->parent, first);
}

TEST_F(MountTableTest, AMountBelowAHiddenPlaceIsNotMet) {
  MountTmpfs(root + "/a/b");
  EXPECT_EQ(PointOf(root + "/a/b/c"), root + "/a/b");

  MountTmpfs(root + "/a");

  EXPECT_EQ(PointOf(root + "/a/b/c"), root + "/a");
  EXPECT_EQ(PointOf(root + "/ab"), PointOf(root));
}

TEST_F(MountTableTest, ABindMountShowsAPart) {
  MountTmpfs(root);
  MakeFolder(root + "/deep/er");
  MakeFolder(root + "/at");
  Bind(root + "/deep", root + "/at");

  const Mount* part = Of(root + "/at/er");

  ASSERT_NE(part, nullptr);
  EXPECT_EQ(part->root, "/deep");
  EXPECT_EQ(MountTable::PathWithin(*part, root + "/at/er"), "/deep/er");
  EXPECT_EQ(MountTable::PathWithin(*part, root + "/at"), "/deep");
}

TEST_F(MountTableTest, PointsBelowAreSortedAndOnce) {
  MountTmpfs(root + "/z");
  MountTmpfs(root + "/a");
  MountTmpfs(root + "/a");
  MountTmpfs(root + "/z/b");
  ASSERT_TRUE(table.Read());

  EXPECT_EQ(table.PointsBelow(root),
            (std::vector<std::string>{root + "/a", root + "/z", root + "/z/b"}));
  EXPECT_EQ(table.PointsBelow(root + "/a"), std::vector<std::string>{root + "/a"});
  EXPECT_TRUE(table.PointsBelow(root + "/b").empty());
}

TEST(MountTableByHand, PathsWithin) {
  const Mount top{1, 0, "8:1", "/", "/", "ext4", "/dev/sda1"};
  EXPECT_EQ(MountTable::PathWithin(top, "/"), "/");
  EXPECT_EQ(MountTable::PathWithin(top, "/a"), "/a");
  const Mount whole{2, 1, "8:2", "/", "/m", "ext4", "/dev/sda2"};
  EXPECT_EQ(MountTable::PathWithin(whole, "/m"), "/");
  EXPECT_EQ(MountTable::PathWithin(whole, "/m/a/b"), "/a/b");
  const Mount over_all{3, 1, "8:3", "/sub", "/", "btrfs", "/dev/sda3"};
  EXPECT_EQ(MountTable::PathWithin(over_all, "/"), "/sub");
  EXPECT_EQ(MountTable::PathWithin(over_all, "/a"), "/sub/a");
}

TEST(MountTableByHand, InAChangedRootTheTopHasNoParent) {
  const MountTable table =
      Table({{20, 7, "8:1", "/", "/a", "ext4", "x"}, {21, 8, "8:2", "/", "/a/b", "ext4", "y"}});

  EXPECT_EQ(table.MountOf("/"), nullptr);
  ASSERT_NE(table.MountOf("/a/c"), nullptr);
  EXPECT_EQ(table.MountOf("/a/c")->id, 20U);
}

TEST(MountTableByHand, ATableThatIsNoTreeEnds) {
  const MountTable table = Table({{1, 1, "8:1", "/", "/", "ext4", "x"},
                                  {2, 3, "8:1", "/", "/a", "ext4", "x"},
                                  {3, 2, "8:1", "/", "/a", "ext4", "x"}});

  ASSERT_NE(table.MountOf("/a"), nullptr);
  EXPECT_EQ(table.MountOf("/a")->id, 1U);
}

}  // namespace
}  // namespace fileindexd
