// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/layout.h"

#include <sys/stat.h>
#include <unistd.h>

#include <cstdlib>

#include "tests/unit/state/fixture.h"

namespace fileindexd {
namespace {

using LayoutTest = StateTest;

TEST(NormalPathTest, DropsRepeatedAndTrailingSlashes) {
  EXPECT_EQ(NormalPath("/"), "/");
  EXPECT_EQ(NormalPath("///"), "/");
  EXPECT_EQ(NormalPath("/a/b"), "/a/b");
  EXPECT_EQ(NormalPath("//a///b//"), "/a/b");
  EXPECT_EQ(NormalPath("/.a/..b/c./..."), "/.a/..b/c./...");
  EXPECT_EQ(NormalPath("/\xff\n"), "/\xff\n");
}

TEST(NormalPathTest, RefusesWhatIsNotPlain) {
  for (const std::string& bad :
       {std::string(), std::string("a"), std::string("./a"), std::string("../a"), std::string("/."),
        std::string("/.."), std::string("/a/./b"), std::string("/a/../b"), std::string("/a/.."),
        std::string("/a//./"), std::string("/a\0b", 4), std::string(" /a")}) {
    EXPECT_EQ(NormalPath(bad), std::nullopt) << bad;
  }
}

TEST(CoversTest, OnlyWholeComponentsCount) {
  EXPECT_TRUE(Covers("/a", "/a"));
  EXPECT_TRUE(Covers("/a", "/a/b"));
  EXPECT_TRUE(Covers("/", "/a"));
  EXPECT_TRUE(Covers("/", "/"));
  EXPECT_FALSE(Covers("/a", "/ab"));
  EXPECT_FALSE(Covers("/a/b", "/a"));
  EXPECT_FALSE(Covers("/a", "/"));
  EXPECT_FALSE(Covers("/a", "/b/a"));
}

TEST(ShareNameTest, GoodOnes) {
  for (const std::string& good :
       {std::string("a"), std::string("my share"), std::string("a.b"), std::string("\xc3\xa4"),
        std::string("\xc2\xa0\xe2\x82\x80\x80\x9f"), std::string(64, 'x')}) {
    EXPECT_TRUE(CanNameNewShare(good)) << good;
    EXPECT_TRUE(IsValidShareName(good)) << good;
  }
}

TEST(ShareNameTest, BadOnes) {
  for (const std::string& bad :
       {std::string(), std::string("."), std::string(".."), std::string(".a"), std::string("a/b"),
        std::string("/"), std::string("a\0b", 3), std::string("a\n"), std::string("\t"),
        std::string("a\x7f"), std::string(65, 'x')}) {
    EXPECT_FALSE(IsValidShareName(bad)) << bad;
    EXPECT_FALSE(CanNameNewShare(bad)) << bad;
  }
}

TEST(ShareNameTest, ThoseThatWereTakenOnceStayUsable) {
  for (const std::string& old : {std::string("\xc2\x80"), std::string("a\xc2\x9f"
                                                                      "b")}) {
    EXPECT_FALSE(CanNameNewShare(old)) << old;
    EXPECT_TRUE(IsValidShareName(old)) << old;
  }
}

TEST_F(LayoutTest, RootComesFromTheEnvironmentIfItIsAbsolute) {
  setenv("FILEINDEXD_STATE_DIR", "/x//y/", 1);
  EXPECT_EQ(StateRoot(), "/x/y");
  EXPECT_EQ(QueuePath("s"), "/x/y/shares/s/TALO@file_index_queue");
  EXPECT_EQ(DrainedPath("s"), "/x/y/shares/s/TALO@file_index_queue.tmp");
  EXPECT_EQ(IndexPath("s"), "/x/y/shares/s/index");
  setenv("FILEINDEXD_STATE_DIR", "", 1);
  EXPECT_EQ(StateRoot(), "/var/lib/fileindexd");
  unsetenv("FILEINDEXD_STATE_DIR");
  EXPECT_EQ(StateRoot(), "/var/lib/fileindexd");
}

TEST_F(LayoutTest, RelativeRootIsNoRoot) {
  for (const std::string bad : {"relative", "./x", "~/x"}) {
    setenv("FILEINDEXD_STATE_DIR", bad.c_str(), 1);
    std::string error;
    EXPECT_FALSE(MakeStateRoot(error));
    EXPECT_EQ(error, "FILEINDEXD_STATE_DIR is not an absolute path: " + bad);
    EXPECT_NE(StateRoot(), "/var/lib/fileindexd");
    EXPECT_NE(access(StateRoot().c_str(), F_OK | X_OK), 0);
  }
}

TEST_F(LayoutTest, FoldersArePrivateWhateverTheUmask) {
  for (const mode_t mask : {mode_t{0}, mode_t{0777}}) {
    const std::string name = "share" + std::to_string(mask);
    const mode_t before = umask(mask);
    std::string error;

    const bool made = MakeShareFolder(name, error);

    umask(before);
    ASSERT_TRUE(made) << error;
    EXPECT_EQ(ModeOf(state_root), 0700U);
    EXPECT_EQ(ModeOf(state_root + "/shares"), 0700U);
    EXPECT_EQ(ModeOf(ShareFolder(name)), 0700U);
  }
}

TEST_F(LayoutTest, WhatCannotBeMadeIsNamed) {
  WriteFile(state_root, "a file in its place");
  std::string error;

  EXPECT_FALSE(MakeStateRoot(error));
  EXPECT_NE(error.find(state_root), std::string::npos) << error;
}

TEST_F(LayoutTest, NoFolderForANameThatLeadsElsewhere) {
  std::string error;
  EXPECT_FALSE(MakeShareFolder("../../x", error));
  EXPECT_FALSE(Exists(state_root));
}

}  // namespace
}  // namespace fileindexd
