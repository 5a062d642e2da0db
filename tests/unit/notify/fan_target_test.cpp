// SPDX-License-Identifier: GPL-2.0-or-later
// Handles of what was changed.
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>

#include "tests/unit/notify/fan_fixture.h"

namespace fileindexd {
namespace {

class TargetOnEach : public OnEach {};
class TargetTest : public FanGroupTest {};

TEST_P(TargetOnEach, ATargetIsWhatWasChangedWhateverBecameOfItsNames) {
  ASSERT_EQ(link((root + "/d/old").c_str(), (root + "/e/other").c_str()), 0);
  struct stat st {};
  ASSERT_EQ(stat((root + "/d/old").c_str(), &st), 0);
  (void)Told();
  Put("/d/old");
  const std::string target = ToldTarget("/d/old");

  FanGroup::Target thing;
  ASSERT_TRUE(group->LookAtTarget(target, thing));
  EXPECT_EQ(thing.inode, st.st_ino);
  EXPECT_EQ(thing.links, 2U);
  EXPECT_TRUE(group->IsAt("/d/old", thing));
  EXPECT_TRUE(group->IsAt("/e/other", thing));
  EXPECT_FALSE(group->IsAt("/d", thing));
  EXPECT_FALSE(group->IsAt("", thing));

  Rename("/d/old", "/d/new");
  EXPECT_FALSE(group->IsAt("/d/old", thing));
  ASSERT_EQ(unlink((root + "/d/new").c_str()), 0);
  ASSERT_TRUE(group->LookAtTarget(target, thing));
  EXPECT_EQ(thing.inode, st.st_ino);
  EXPECT_EQ(thing.links, 1U);

  ASSERT_EQ(unlink((root + "/e/other").c_str()), 0);
  ASSERT_TRUE(group->LookAtTarget(target, thing));
  EXPECT_EQ(thing.links, 0U);
}

TEST_P(TargetOnEach, WhatHasOtherNamesIsToldWithoutAPathWhenItsFolderIsGone) {
  MakeFolder(root + "/d/sub");
  ASSERT_EQ(link((root + "/d/old").c_str(), (root + "/d/sub/f").c_str()), 0);
  (void)Told();
  const ScopedFd held(open((root + "/d/sub").c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  Put("/d/sub/f");
  std::filesystem::remove_all(root + "/d/sub");

  EXPECT_NE(ToldTarget(""), "");
}

TEST_P(TargetOnEach, OnlyChangesOfThingsThemselvesHaveATarget) {
  ASSERT_EQ(symlink("old", (root + "/d/soft").c_str()), 0);
  MakeFolder(root + "/d/sub");
  Rename("/d/old", "/e/new");
  ASSERT_EQ(chmod((root + "/d").c_str(), 0750), 0);
  ASSERT_EQ(unlink((root + "/e/new").c_str()), 0);

  int targets = 0;
  const auto count = [&](const Change& change) { targets += change.target.empty() ? 0 : 1; };
  ASSERT_TRUE(WaitFor(*group));
  while (group->Read(count) == FanGroup::Result::MORE) {
  }
  EXPECT_EQ(targets, 0);
}

TEST_F(TargetTest, TargetsOfAnyBytesAreRefused) {
  MountTmpfs(root);
  OpenSound(root);
  Put("/f");
  const std::string target = ToldTarget("/f");
  ASSERT_GT(target.size(), sizeof(file_handle));

  FanGroup::Target thing;
  for (const std::string& bytes :
       {std::string(), target.substr(0, 4), target.substr(0, target.size() - 1), target + 'x',
        std::string(sizeof(file_handle) + MAX_HANDLE_SZ + 1, '\xff'), std::string(4000, '\0')}) {
    EXPECT_FALSE(group->LookAtTarget(bytes, thing)) << bytes.size();
  }
}

INSTANTIATE_TEST_SUITE_P(Filesystems, TargetOnEach,
                         testing::Values("ext4", "xfs", "btrfs", "tmpfs"),
                         [](const auto& one) { return std::string(one.param); });

}  // namespace
}  // namespace fileindexd
