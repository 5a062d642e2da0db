// SPDX-License-Identifier: GPL-2.0-or-later
// Questions about paths on the platform that is shipped.
#include "platform/paths.h"

#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>

#include "platform/standalone/glance.h"
#include "state/filesystem.h"
#include "state/layout.h"
#include "tests/unit/state/mounts.h"
#include "tests/unit/state/slow_looks.h"

namespace fileindexd {
namespace {

namespace fs = std::filesystem;

class PathsTest : public MountTest {
 protected:
  // The state's root is named by way of a link.
  void SetUp() override {
    MountTest::SetUp();
    if (IsSkipped()) {
      return;
    }
    MountTmpfs(folder);
    MakeFile(root + "/d/f");
    fs::create_directory(folder + "/real");
    fs::create_directory_symlink(folder + "/real", state_root);
    const auto store = OpenStore();
    ASSERT_NE(store, nullptr);
    ASSERT_TRUE(store->AddShare({"s", root, FilesystemIdentity(root)})) << store->Error();
    ASSERT_TRUE(store->AddFolder(root, {})) << store->Error();
    std::string error;
    ASSERT_TRUE(MakeShareFolder("s", error)) << error;
  }
};

TEST_F(PathsTest, AFolderSeenBeforeADrainIsNotBelievedAfterIt) {
  for (int i = 0; i < 20; ++i) {  // each time within the time that a look is kept for
    ASSERT_FALSE(TALO::FILEINDEX::IsSkipIndex(root + "/d/f"));
    fs::rename(root + "/d", root + "/away");
    fs::create_directory_symlink(root + "/away", root + "/d");
    EXPECT_FALSE(TALO::FILEINDEX::IsFileExist(QueuePath("s")));
    EXPECT_TRUE(TALO::FILEINDEX::IsSkipIndex(root + "/d/f"));

    fs::remove(root + "/d");
    fs::rename(root + "/away", root + "/d");
    EXPECT_FALSE(TALO::FILEINDEX::IsFileExist(QueuePath("s")));
  }
}

TEST_F(PathsTest, SettingsSeenBeforeADrainAreNotBelievedAfterIt) {
  const auto store = OpenStore();
  for (int i = 0; i < 20; ++i) {  // each time within the time that settings are kept for
    ASSERT_FALSE(TALO::FILEINDEX::IsSkipIndex(root + "/d/f"));
    ASSERT_TRUE(store->RemoveFolder(root)) << store->Error();
    EXPECT_FALSE(TALO::FILEINDEX::IsFileExist(QueuePath("s")));
    EXPECT_TRUE(TALO::FILEINDEX::IsSkipIndex(root + "/d/f"));

    ASSERT_TRUE(store->AddFolder(root, {})) << store->Error();
    EXPECT_FALSE(TALO::FILEINDEX::IsFileExist(QueuePath("s")));
  }
}

TEST_F(PathsTest, ARowOfQuestionsCostsOneLookHoweverLongThatTakes) {
  MakeFile(root + "/d/g");
  for (const int64_t look_ns : {1'000'000, 60'000'000}) {
    for (const char* below : {"/d/f", "/d/g", "/d"}) {
      const std::string path = root + below;
      EXPECT_FALSE(TALO::FILEINDEX::IsFileExist(QueuePath("s")));  // forgets what was seen
      const SlowLooks slow(look_ns);
      TALO::FILEINDEX::IsDirExist(path);
      const int looks = SlowLooks::Count();
      EXPECT_GT(looks, 0) << below;

      TALO::FILEINDEX::IsFileExist(path);
      TALO::FILEINDEX::CanFullPathBeIndexed(path);
      TALO::FILEINDEX::IsSkipIndex(path);
      Seen seen;
      EXPECT_TRUE(TakeGlance(path, seen)) << below;

      EXPECT_EQ(SlowLooks::Count(), looks) << below << " " << look_ns;
    }
  }
}

// Below a directory lies another file system; below a file nothing does.
TEST_F(PathsTest, OfMountPointsOnlyDirectoriesAreNoOrdinaryEntries) {
  MakeFile(root + "/d/bound");
  MakeFolder(root + "/d/mounted");
  EXPECT_TRUE(TALO::FILEINDEX::CanFullPathBeIndexed(root + "/d/mounted"));
  Bind(root + "/d/f", root + "/d/bound");
  MountTmpfs(root + "/d/mounted");

  EXPECT_TRUE(TALO::FILEINDEX::CanFullPathBeIndexed(root + "/d/bound"));
  EXPECT_TRUE(TALO::FILEINDEX::CanFullPathBeIndexed(root + "/d/f"));
  EXPECT_FALSE(TALO::FILEINDEX::IsFileExist(QueuePath("s")));  // forgets what was seen
  EXPECT_FALSE(TALO::FILEINDEX::CanFullPathBeIndexed(root + "/d/mounted"));
}

// An update takes out what the index may still have of it.
TEST_F(PathsTest, WhatIsGoneOrHasNoPlaceIsAskedAboutAllTheSame) {
  ASSERT_EQ(mkfifo((root + "/d/pipe").c_str(), 0600), 0);
  MakeFile(root + "/d/@eaDir/f");
  fs::create_directory_symlink("d", root + "/link");
  for (const char* below : {"/gone", "/d/pipe", "/d/@eaDir", "/d/@eaDir/gone", "/link/f"}) {
    EXPECT_TRUE(TALO::FILEINDEX::IsSkipIndex(root + below) ||
                !TALO::FILEINDEX::IsFileExist(root + below))
        << below;
    EXPECT_TRUE(TALO::FILEINDEX::CanFullPathBeIndexed(root + below)) << below;
  }
  EXPECT_FALSE(TALO::FILEINDEX::CanFullPathBeIndexed(folder));
}

TEST_F(PathsTest, ALinkIsNoQueueFile) {
  fs::create_symlink(root + "/d/f", QueuePath("s"));
  EXPECT_FALSE(TALO::FILEINDEX::IsFileExist(QueuePath("s")));
  fs::create_symlink("f", root + "/d/l");
  EXPECT_TRUE(TALO::FILEINDEX::IsFileExist(root + "/d/l"));
}

}  // namespace
}  // namespace fileindexd
