// SPDX-License-Identifier: GPL-2.0-or-later
#include "notify/fan_group.h"

#include <fcntl.h>
#include <linux/filter.h>
#include <linux/seccomp.h>
#include <sys/fanotify.h>
#include <sys/mount.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>
#include <cstddef>
#include <filesystem>

#include "base/scoped_fd.h"
#include "tests/unit/notify/fan_fixture.h"

namespace fileindexd {
namespace {

TEST_P(OnEach, ANewFileAndItsClose) {
  Put("/d/new");
  EXPECT_EQ(Told(), Texts{"create+modify+write /d/new"});
}

TEST_P(OnEach, AFileThatIsHeldOpenIsOnlyModified) {
  const ScopedFd file(open((root + "/d/old").c_str(), O_WRONLY | O_APPEND | O_CLOEXEC));
  ASSERT_EQ(write(file.fd, "y", 1), 1);
  EXPECT_EQ(Told(), Texts{"modify /d/old"});
}

TEST_P(OnEach, ATruncationIsAModify) {
  ASSERT_EQ(truncate((root + "/d/old").c_str(), 0), 0);
  EXPECT_EQ(Told(), Texts{"modify /d/old"});
}

TEST_P(OnEach, AttributesOfFilesDirectoriesAndTheRoot) {
  ASSERT_EQ(chmod((root + "/d/old").c_str(), 0640), 0);
  ASSERT_EQ(chmod((root + "/d").c_str(), 0750), 0);
  ASSERT_EQ(chmod(root.c_str(), 0751), 0);
  EXPECT_EQ(Told(), (Texts{"attrib /d/old", "attrib /d/", "attrib //"}));
}

TEST_P(OnEach, DirectoriesComeAndGo) {
  MakeFolder(root + "/d/sub");
  EXPECT_EQ(Told(), Texts{"create /d/sub/"});
  ASSERT_EQ(rmdir((root + "/d/sub").c_str()), 0);
  EXPECT_EQ(Told(), Texts{"delete /d/sub/"});
}

TEST_P(OnEach, RenamesTellBothNames) {
  Rename("/d/old", "/d/new");
  EXPECT_EQ(Told(), Texts{"to /d/old -> /d/new"});
  Rename("/d/new", "/e/new");
  EXPECT_EQ(Told(), Texts{"to /d/new -> /e/new"});
  Rename("/d", "/e/d");
  EXPECT_EQ(Told(), Texts{"to /d/ -> /e/d/"});
  Put("/e/d/x");
  EXPECT_EQ(Told(), Texts{"create+modify+write /e/d/x"});
}

TEST_P(OnEach, ARenameOverAFile) {
  Put("/e/new");
  (void)Told();
  Rename("/e/new", "/d/old");
  EXPECT_EQ(Told(), Texts{"to /e/new -> /d/old"});
}

TEST_P(OnEach, LinksOfBothKinds) {
  ASSERT_EQ(link((root + "/d/old").c_str(), (root + "/e/hard").c_str()), 0);
  const Texts hard = Told();
  EXPECT_NE(std::find(hard.begin(), hard.end(), "create /e/hard"), hard.end());
  ASSERT_EQ(symlink("old", (root + "/d/soft").c_str()), 0);
  EXPECT_EQ(Told(), Texts{"create /d/soft"});
}

TEST_P(OnEach, ADeleteIsToldByItsName) {
  ASSERT_EQ(unlink((root + "/d/old").c_str()), 0);
  EXPECT_EQ(Told(), Texts{"delete /d/old"});
}

TEST_P(OnEach, NamesOfAnyBytes) {
  const std::string longest(255, 'n');
  for (const std::string& name :
       {std::string("\xff\xfe"), std::string("a\nb\\c\"d"), std::string(" "), std::string("..."),
        std::string("x (deleted)"), longest}) {
    Put("/d/" + name);
    EXPECT_EQ(Told(), Texts{"create+modify+write /d/" + name});
  }
}

TEST_P(OnEach, ADirectoryWhoseNameLooksLikeADeletedOne) {
  MakeFolder(root + "/d/x (deleted)");
  (void)Told();
  Put("/d/x (deleted)/f");
  EXPECT_EQ(Told(), Texts{"create+modify+write /d/x (deleted)/f"});
}

TEST_P(OnEach, WhatHappenedInADirectoryThatIsGoneIsNotTold) {
  MakeFolder(root + "/d/sub");
  (void)Told();
  Put("/d/sub/f");
  const ScopedFd held(open((root + "/d/sub").c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  std::filesystem::remove_all(root + "/d/sub");
  EXPECT_EQ(Told(), Texts{"delete /d/sub/"});
}

TEST_P(OnEach, UnmountingIsNotHindered) {
  Put("/d/new");
  ASSERT_EQ(umount2(root.c_str(), 0), 0);
  mounted.pop_back();
  EXPECT_EQ(Told(), Texts{"create+modify+write /d/new"});
}

INSTANTIATE_TEST_SUITE_P(Filesystems, OnEach, testing::Values("ext4", "xfs", "btrfs", "tmpfs"),
                         [](const auto& one) { return std::string(one.param); });

TEST_F(FanGroupTest, TheDeviceIsFreeOnceTheObjectIsGone) {
  MountImage("ext4", root);
  OpenSound(root);
  MountTable table;
  ASSERT_TRUE(table.Read());
  const std::string device = table.MountOf(root)->source;
  // Holds the loop device itself, which would vanish with its last user.
  const ScopedFd kept(open(device.c_str(), O_RDONLY | O_CLOEXEC));
  ASSERT_GE(kept.fd, 0);
  ASSERT_EQ(umount2(root.c_str(), 0), 0);
  mounted.pop_back();

  EXPECT_LT(open(device.c_str(), O_RDWR | O_EXCL | O_CLOEXEC), 0);
  EXPECT_EQ(errno, EBUSY);
  group.reset();

  const ScopedFd alone(open(device.c_str(), O_RDWR | O_EXCL | O_CLOEXEC));
  EXPECT_GE(alone.fd, 0);
}

TEST_F(FanGroupTest, ASubvolumeMountIsWatchedThroughTheWhole) {
  MountImage("btrfs", root + "/all");
  Run("btrfs subvolume create " + root + "/all/sv");
  Run("btrfs subvolume create " + root + "/all/sv/nested");
  Unmount(root + "/all");
  MakeFolder(root + "/part");
  Run("mount -o loop,subvol=sv " + last_image + " " + root + "/part");
  mounted.push_back(root + "/part");

  OpenSound(root + "/part");
  Put("/part/f");
  Put("/part/nested/g");
  ASSERT_EQ(chmod((root + "/part/nested").c_str(), 0711), 0);

  EXPECT_EQ(Told(), (Texts{"create+modify+write /sv/f", "create+modify+write /sv/nested/g",
                           "attrib /sv/nested/"}));
}

// In turn: a file system that is read-only must not be made writable by being watched.
TEST_F(FanGroupTest, AReadOnlySubvolumeMountStaysReadOnly) {
  MountImage("btrfs", root);
  Run("btrfs subvolume create " + root + "/sv");
  Unmount(root);
  Run("mount -o loop,ro,subvol=sv " + last_image + " " + root);
  mounted.push_back(root);

  OpenSound(root);

  std::string mounts = ReadFile("/proc/self/mountinfo");
  const size_t line = mounts.find(" " + root + " ");
  const std::string rest = mounts.substr(line, mounts.find('\n', line) - line);
  EXPECT_NE(rest.find("/dev/loop"), std::string::npos);
  EXPECT_EQ(rest.substr(rest.find("/dev/loop")).find(" rw"), std::string::npos) << rest;
}

TEST_F(FanGroupTest, ABindMountOfAPartIsWatchedThroughTheWhole) {
  for (const char* type : {"ext4", "xfs"}) {
    MountImage(type, root + "/all");
    MakeFolder(root + "/all/deep/er");
    MakeFolder(root + "/part");
    Bind(root + "/all/deep", root + "/part");
    OpenSound(root + "/part");
    Put("/part/f");
    EXPECT_EQ(Told(), Texts{"create+modify+write /deep/f"}) << type;

    Unmount(root + "/all");
    OpenSound(root + "/part");
    Put("/part/er/g");
    Put("/part/f");
    EXPECT_EQ(Told(), (Texts{"create+modify+write /deep/er/g", "modify+write /deep/f"})) << type;
    group.reset();
    Unmount(root + "/part");
  }
}

TEST_F(FanGroupTest, APartOfWhatCannotBeShownWholeIsRefused) {
  MountTmpfs(root + "/all");
  MakeFolder(root + "/all/deep");
  MakeFolder(root + "/part");
  Bind(root + "/all/deep", root + "/part");
  Unmount(root + "/all");

  Open(root + "/part");

  EXPECT_EQ(group, nullptr);
  EXPECT_EQ(error, "open_tree: no mount shows the whole file system at " + root + "/part");
}

TEST_F(FanGroupTest, AMountThatIsHiddenByAnotherIsPassedOver) {
  MountImage("ext4", root + "/all");
  MakeFolder(root + "/all/deep");
  MakeFolder(root + "/part");
  Bind(root + "/all/deep", root + "/part");
  MountTmpfs(root + "/all");

  OpenSound(root + "/part");
  Put("/part/f");

  EXPECT_EQ(Told(), Texts{"create+modify+write /deep/f"});
}

TEST_F(FanGroupTest, WhatIsMountedBelowLaterIsNotHeld) {
  MountTmpfs(root);
  ASSERT_EQ(mount(nullptr, root.c_str(), nullptr, MS_SHARED, nullptr), 0);
  OpenSound(root);
  MountImage("ext4", root + "/below");
  MountTable table;
  ASSERT_TRUE(table.Read());
  const std::string device = table.MountOf(root + "/below")->source;
  const ScopedFd kept(open(device.c_str(), O_RDONLY | O_CLOEXEC));
  ASSERT_EQ(umount2((root + "/below").c_str(), 0), 0);
  mounted.pop_back();

  const ScopedFd alone(open(device.c_str(), O_RDWR | O_EXCL | O_CLOEXEC));
  EXPECT_GE(alone.fd, 0);
}

TEST_F(FanGroupTest, WhatCannotBeWatchedIsRefusedWithTheCall) {
  Open("/proc");
  EXPECT_EQ(group, nullptr);
  EXPECT_NE(error, "");

  MakeFolder(root + "/o");
  MountTmpfs(root + "/t");
  for (const char* name : {"/t/up", "/t/work", "/t/low"}) {
    MakeFolder(root + name);
  }
  Run("mount -t overlay -o lowerdir=" + root + "/t/low,upperdir=" + root + "/t/up,workdir=" + root +
      "/t/work overlay " + root + "/o");
  mounted.push_back(root + "/o");
  Open(root + "/o");
  EXPECT_EQ(group, nullptr);
  EXPECT_NE(error.find(": "), std::string::npos) << error;

  const Mount remote{1, 0, "0:99", "/", root, "nfs4", "server:/x"};
  group = FanGroup::Open(remote, error);
  EXPECT_EQ(group, nullptr);
  EXPECT_EQ(error, "fanotify_mark: nfs4 does not tell of changes made elsewhere");
}

TEST_F(FanGroupTest, LostEventsAreToldOnce) {
  MountTmpfs(root);
  OpenSound(root);
  const std::string limit = ReadFile("/proc/sys/fs/fanotify/max_queued_events");
  const int many = std::stoi(limit) + 100;
  for (int i = 0; i < many; ++i) {
    const ScopedFd file(
        open((root + "/" + std::to_string(i)).c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0600));
  }

  EXPECT_GT(group->Waiting(), 0U);
  bool failed = false;
  const Texts told = ReadAll(*group, failed);

  EXPECT_FALSE(failed);
  EXPECT_LT(told.size(), static_cast<size_t>(many));
  EXPECT_TRUE(group->TakeOverflow());
  EXPECT_FALSE(group->TakeOverflow());
  Put("/after");
  EXPECT_EQ(Told(), Texts{"create+modify+write /after"});
}

// As a kernel before 5.17 answers, for this process from now on.
bool RefuseRenameMarks() {
  sock_filter steps[] = {
      BPF_STMT(BPF_LD | BPF_W | BPF_ABS, offsetof(seccomp_data, nr)),
      BPF_JUMP(BPF_JMP | BPF_JEQ | BPF_K, SYS_fanotify_mark, 0, 3),
      BPF_STMT(BPF_LD | BPF_W | BPF_ABS, offsetof(seccomp_data, args[2])),
      BPF_JUMP(BPF_JMP | BPF_JSET | BPF_K, FAN_RENAME, 0, 1),
      BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_ERRNO | EINVAL),
      BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_ALLOW),
  };
  const sock_fprog program{static_cast<unsigned short>(std::size(steps)), steps};
  return prctl(PR_SET_SECCOMP, SECCOMP_MODE_FILTER, &program) == 0;
}

TEST_F(FanGroupTest, OldKernelsTellTheEndsOfARename) {
  MountTmpfs(root);
  const int result = WaitFor(Fork([&] {
    if (!RefuseRenameMarks()) {
      return 1;
    }
    Open(root);
    if (group == nullptr) {
      return 2;
    }
    MakeFolder(root + "/d");
    Rename("/d", "/e");
    Put("/e/f");
    return Sorted(Told()) == Sorted({"create+from /d/", "to /e/", "create+modify+write /e/f"}) ? 0
                                                                                               : 3;
  }));
  EXPECT_EQ(result, 0);
}

// Folders of 200 bytes, one in the other: the innermost of `depth` is left as working directory.
void DigFrom(const std::string& top, int depth) {
  ASSERT_EQ(chdir(top.c_str()), 0);
  const std::string name(200, 'd');
  for (int i = 0; i < depth; ++i) {
    ASSERT_EQ(mkdir(name.c_str(), 0700), 0);
    ASSERT_EQ(chdir(name.c_str()), 0);
  }
}

TEST_F(FanGroupTest, LongPathsAreToldAndTooLongOnesAsAChangeAboveThem) {
  MountTmpfs(root);
  const std::string name(200, 'd');
  std::string deepest;
  for (int i = 0; i < 20; ++i) {
    deepest += "/" + name;  // 4,020 bytes
  }
  DigFrom(root, 20);
  OpenSound(root);

  EXPECT_EQ(close(open("f", O_WRONLY | O_CREAT | O_CLOEXEC, 0600)), 0);
  EXPECT_EQ(Told(), Texts{"create+write " + deepest + "/f"});
  DigFrom(".", 2);
  EXPECT_EQ(Told(), (Texts{"create " + deepest + "/" + name + "/", "create " + deepest + "/"}));
  EXPECT_EQ(close(open("f", O_WRONLY | O_CREAT | O_CLOEXEC, 0600)), 0);
  EXPECT_EQ(Told(), (Texts{"write ", "create " + deepest + "/"}));
  ASSERT_EQ(chdir("/"), 0);
}

}  // namespace
}  // namespace fileindexd
