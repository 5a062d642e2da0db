// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/filesystem.h"

#include <sys/mount.h>
#include <sys/statvfs.h>

#include <cerrno>
#include <filesystem>

#include "tests/unit/state/mounts.h"

namespace fileindexd {
namespace {

using FilesystemTest = MountTest;

TEST_F(FilesystemTest, IdentityStaysOverRemountsAndDiffersBetweenDisks) {
  for (const char* type : {"ext4", "btrfs", "xfs"}) {
    const std::string place = folder + "/" + type;
    MountImage(type, place);
    const std::string image = last_image;
    MakeFile(place + "/dir/file");
    const std::string identity = FilesystemIdentity(place);
    EXPECT_EQ(identity.substr(0, 3), std::string(type).substr(0, 3));
    EXPECT_EQ(FilesystemIdentity(place + "/dir"), identity);
    EXPECT_EQ(FilesystemIdentity(place + "/dir/file"), identity);

    Unmount(place);
    const std::string other = folder + "/other";
    MakeFolder(other);
    Run("mount -o loop " + image + " " + other);
    mounted.push_back(other);
    EXPECT_EQ(FilesystemIdentity(other), identity) << type;
    Unmount(other);

    MountImage(type, place);
    EXPECT_NE(FilesystemIdentity(place), identity) << type;
    Unmount(place);
  }
}

TEST_F(FilesystemTest, OtherKindsAreToldByTheirTypeAndTheMountsRoot) {
  const std::string outside = FilesystemIdentity(folder);
  MountTmpfs(root);
  MakeFile(root + "/a/b/file");

  const std::string identity = FilesystemIdentity(root);

  EXPECT_EQ(identity.substr(0, 13), "type:1021994:") << identity;
  EXPECT_EQ(FilesystemIdentity(root + "/a/b"), identity);
  EXPECT_NE(identity, outside);
  EXPECT_FALSE(FilesystemIdentity("/proc").empty());
}

TEST_F(FilesystemTest, OneTmpfsIsNotAnother) {
  MountTmpfs(root);
  const std::string first = FilesystemIdentity(root);
  const std::string recorded_before = first.substr(0, first.rfind(':'));
  EXPECT_TRUE(IsFilesystem(first, first));
  EXPECT_TRUE(IsFilesystem(recorded_before, first));

  MountTmpfs(root);

  EXPECT_FALSE(IsFilesystem(first, FilesystemIdentity(root)));
  EXPECT_FALSE(IsFilesystem("type:1", "type:12:1"));
  EXPECT_FALSE(IsFilesystem("btrfs:1", "btrfs:1:5"));
}

TEST_F(FilesystemTest, WhatCannotBeToldIsEmpty) {
  EXPECT_EQ(FilesystemIdentity(root + "/none"), "");
  EXPECT_EQ(errno, ENOENT);
}

TEST_F(FilesystemTest, ProcAndItsLikeAreNotReal) {
  MountTmpfs(root);
  EXPECT_TRUE(IsRealFilesystem(root));
  EXPECT_TRUE(IsRealFilesystem(folder));
  EXPECT_FALSE(IsRealFilesystem("/proc"));
  EXPECT_FALSE(IsRealFilesystem("/sys"));
  EXPECT_FALSE(IsRealFilesystem("/dev/pts"));
  EXPECT_FALSE(IsRealFilesystem(root + "/none"));
}

TEST_F(FilesystemTest, MountPointsAreWhatTheMountTableSays) {
  MountImage("btrfs", root);
  Run("btrfs subvolume create " + root + "/nested");
  Run("btrfs subvolume create " + root + "/mounted");
  MakeFolder(root + "/dir");
  MakeFolder(root + "/bound");
  MakeFolder(root + "/target");
  Bind(root + "/dir", root + "/bound");
  Run("mount -o loop,subvol=mounted " + last_image + " " + root + "/target");
  mounted.push_back(root + "/target");
  std::filesystem::create_symlink("bound", root + "/link");

  EXPECT_EQ(IsMountPoint("/"), 1);
  EXPECT_EQ(IsMountPoint(root), 1);
  EXPECT_EQ(IsMountPoint(root + "/bound"), 1);
  EXPECT_EQ(IsMountPoint(root + "/target"), 1);
  EXPECT_EQ(IsMountPoint(root + "/nested"), 0);
  EXPECT_EQ(IsMountPoint(root + "/dir"), 0);
  EXPECT_EQ(IsMountPoint(root + "/link"), 0);
  EXPECT_LT(IsMountPoint(root + "/none"), 0);
}

// Leaves `bytes` free on a file system of `total` bytes at the share's root.
class SpaceTest : public MountTest {
 protected:
  void Mount(uint64_t total, uint64_t bytes) {
    const std::string options = "size=" + std::to_string(total);
    ASSERT_EQ(mount("none", root.c_str(), "tmpfs", 0, options.c_str()), 0);
    mounted.push_back(root);
    Run("fallocate -l " + std::to_string(total - bytes) + " " + root + "/filler");
    struct statvfs fs {};
    ASSERT_EQ(statvfs(root.c_str(), &fs), 0);
    ASSERT_EQ(fs.f_bavail * fs.f_frsize, bytes);
  }
};

TEST_F(SpaceTest, OnePerCentCountsAsAtLeastOneMiBAndAtMostSixtyFour) {
  constexpr uint64_t PAGE = 4096;
  constexpr uint64_t MIB = 1024 * 1024;
  const struct {
    uint64_t total;
    uint64_t needed;
  } rows[] = {{8 * MIB, MIB}, {400 * MIB, 4 * MIB}};
  for (const auto& row : rows) {
    for (const bool lenient : {false, true}) {
      Mount(row.total, row.needed);
      EXPECT_TRUE(HasSpace(root, lenient)) << row.total;
      Unmount(root);
      Mount(row.total, row.needed - PAGE);
      EXPECT_FALSE(HasSpace(root, lenient)) << row.total;
      Unmount(root);
    }
  }
}

TEST_F(SpaceTest, AReadOnlyOrUnaskableShareHasSpaceForTheLenient) {
  Mount(8 * 1024 * 1024, 0);
  EXPECT_FALSE(HasSpace(root, true));
  Run("mount -o remount,ro " + root);
  EXPECT_TRUE(HasSpace(root, true));
  EXPECT_FALSE(HasSpace(root, false));
  EXPECT_TRUE(HasSpace(root + "/none", true));
  EXPECT_FALSE(HasSpace(root + "/none", false));
  EXPECT_TRUE(HasSpace("/proc", true));  // reports no size
}

}  // namespace
}  // namespace fileindexd
