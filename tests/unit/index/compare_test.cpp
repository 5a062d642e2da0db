// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/compare.h"

#include <sys/stat.h>
#include <unistd.h>

#include "tests/unit/index/fixture.h"

namespace fileindexd {

class CompareTest : public IndexTest {
 protected:
  void Tree() {
    for (const char* folder_name : {"a", "a!b", "a b", "a-", "b"}) {
      MakeFolder(At(folder_name));
      WriteFile(At(std::string(folder_name) + "/f"), "");
    }
    for (const char* name : {"a.b", "a0", "a\x01", "\xff\xfe", "a/!", "a/f.g", "a~"}) {
      WriteFile(At(name), "");
    }
    MakeFolder(At("a/b/c"));
    WriteFile(At("a/b/c/d"), "");
  }
};

TEST_F(CompareTest, NamesAroundTheSlashKeepStep) {
  Tree();
  AddAll();

  EXPECT_EQ(Differences(), Names());
}

TEST_F(CompareTest, EveryMissingEntryIsTheOnlyDifference) {
  Tree();
  AddAll();
  for (const std::string& name : Held()) {
    Delete(name);
    Commit();

    EXPECT_EQ(Differences(), Names({"missing " + name}));
    Add(name);
    Commit();
  }
  EXPECT_EQ(Differences(), Names());
}

TEST_F(CompareTest, EveryFileThatIsGoneIsTheOnlyDifference) {
  Tree();
  AddAll();
  for (const std::string& name : Held()) {
    struct stat st {};
    if (lstat(At(name).c_str(), &st) != 0 || !S_ISREG(st.st_mode)) {
      continue;
    }
    ASSERT_EQ(unlink(At(name).c_str()), 0);

    EXPECT_EQ(Differences(), Names({"left-over " + name}));
    WriteFile(At(name), "");
    Refresh(name);
    Commit();
  }
  EXPECT_EQ(Differences(), Names());
}

TEST_F(CompareTest, ChangedFileIsStale) {
  Tree();
  AddAll();
  WriteFile(At("a/f"), "x");
  RemoveTree(At("b"));
  WriteFile(At("b"), "");

  EXPECT_EQ(Differences(), Names({"stale a/f", "stale b", "left-over b/f"}));
}

TEST_F(CompareTest, DirectoryCountsByItsExistenceAlone) {
  Tree();
  AddAll();
  ASSERT_EQ(chmod(At("a").c_str(), 0700), 0);
  RemoveTree(At("b"));
  MakeFolder(At("b"));
  WriteFile(At("b/g"), "");

  EXPECT_EQ(Differences(), Names({"left-over b/f", "missing b/g"}));
}

TEST_F(CompareTest, ContentThatIsWantedAnewDiffers) {
  WriteFile(At("a.txt"), "");
  WriteFile(At("a.jpg"), "");
  AddAll();
  ASSERT_TRUE(store->SetFolder(root, {.document = true}));

  EXPECT_EQ(Differences(), Names({"content a.txt"}));
  Decide("a.txt", {.document = true});
  Commit();
  EXPECT_EQ(Differences(), Names());
}

TEST_F(CompareTest, WhatDoesNotBelongIsNotMissed) {
  MakeFolder(At("lost+found/x"));
  MakeFolder(At("real"));
  WriteFile(At(".nfs123"), "");
  ASSERT_EQ(symlink("real", At("link").c_str()), 0);
  ASSERT_EQ(mkfifo(At("pipe").c_str(), 0600), 0);
  AddAll();

  EXPECT_EQ(Held(), Names({"", "link", "real"}));
  EXPECT_EQ(Differences(), Names());
}

TEST_F(CompareTest, FoldersDeeperThanTheRootAreWalkedInOrder) {
  ASSERT_TRUE(store->RemoveFolder(root));
  for (const char* name : {"a", "a!b", "a/sub", "b/c"}) {
    MakeFolder(At(name));
    WriteFile(At(std::string(name) + "/f"), "");
    ASSERT_TRUE(store->AddFolder(At(name), {}));
  }
  WriteFile(At("b/outside"), "");
  AddAll();

  EXPECT_EQ(Held(), Names({"a", "a!b", "a!b/f", "a/f", "a/sub", "a/sub/f", "b/c", "b/c/f"}));
  EXPECT_EQ(Differences(), Names());
  ASSERT_TRUE(store->RemoveFolder(At("a!b")));
  EXPECT_EQ(Differences(), Names({"left-over a!b", "left-over a!b/f"}));
}

TEST_F(CompareTest, ReporterEndsTheComparison) {
  Tree();
  int reported = 0;
  Comparison result;
  std::string error;

  EXPECT_TRUE(CompareShare(
      *store, "s", [&](Difference, const std::string&) { return ++reported < 3; }, result, error));
  EXPECT_EQ(reported, 3);
}

TEST_F(CompareTest, ComparisonThatCannotBeMadeSaysWhy) {
  Comparison result;
  result.entries = 7;
  std::string error;
  const auto report = [](Difference, const std::string&) { return true; };
  EXPECT_FALSE(CompareShare(*store, "none", report, result, error));
  EXPECT_NE(error.find("none"), std::string::npos);

  writer.reset();
  RemoveTree(state_root + "/shares/s/index");
  error.clear();
  EXPECT_FALSE(CompareShare(*store, "s", report, result, error));
  EXPECT_FALSE(error.empty());
  RemoveTree(root);
  error.clear();
  EXPECT_FALSE(CompareShare(*store, "s", report, result, error));
  EXPECT_NE(error.find(root), std::string::npos);
  EXPECT_EQ(result.entries, 7U);
}

TEST_F(CompareTest, WideDirectoryIsReadOverSeveralSlices) {
  MakeFolder(At("w"));
  for (int i = 0; i < 1300; ++i) {
    WriteFile(At("w/" + std::to_string(i)), "");
  }
  AddAll();
  RemoveTree(At("w/500"));
  WriteFile(At("w/x"), "");

  EXPECT_EQ(Differences(), Names({"left-over w/500", "missing w/x"}));
}

TEST(IsStaleTest, EachAttributeOfAFileCountsAlone) {
  Look look;
  look.thing = Thing::FILE;
  look.inode = 7;
  look.size = 100;
  look.mtime = 1000;
  look.birth_time = 500;
  Entry entry;
  entry.path = "/s/a.txt";
  entry.thing = Thing::FILE;
  entry.kind = Kind::DOCUMENT;
  entry.inode = 7;
  entry.size = 100;
  entry.mtime = 1000;
  entry.birth_time = 500;
  EXPECT_FALSE(IsStale(entry, look));

  void (*const changes[])(Entry&) = {
      [](Entry& changed) { changed.thing = Thing::LINK; },
      [](Entry& changed) { changed.kind = Kind::PHOTO; },
      [](Entry& changed) { ++changed.inode; },
      [](Entry& changed) { ++changed.size; },
      [](Entry& changed) { ++changed.mtime; },
      [](Entry& changed) { ++changed.birth_time; },
  };
  for (const auto& change : changes) {
    Entry changed = entry;
    change(changed);
    EXPECT_TRUE(IsStale(changed, look)) << &change - changes;
  }
}

}  // namespace fileindexd
