// SPDX-License-Identifier: GPL-2.0-or-later
// A share whose disk is not there, or is another one.
#include <filesystem>

#include "tests/unit/index/fixture.h"

namespace fileindexd {

class RootTest : public IndexTest {
 protected:
  void MountRoot() override {
    MountImage("ext4", root);
    MakeFolder(At("d"));
    WriteFile(At("d/f"), "");
    WriteFile(At("a"), "");
  }

  void ExpectRefused(bool done) {
    EXPECT_FALSE(done);
    EXPECT_EQ(writer->last_error, IndexError::ROOT);
  }
  void ExpectAllRefused() {
    ExpectRefused(writer->Refresh(At("a"), {}, {}));
    ExpectRefused(writer->Refresh(At("d"), {}, {}));
    ExpectRefused(writer->Refresh(root, {}, {}));
    for (const DeleteMode mode : {DeleteMode::ENTRY, DeleteMode::STALE, DeleteMode::ALL}) {
      ExpectRefused(writer->Delete(At("d"), mode));
      ExpectRefused(writer->Delete(At("a"), mode));
    }
    Commit();
  }
};

TEST_F(RootTest, UnmountedDiskEmptiesNothing) {
  AddAll();
  const Names before = Held();
  Unmount(root);

  ExpectAllRefused();
  EXPECT_EQ(Held(), before);
}

TEST_F(RootTest, UnmountedDiskEmptiesNothingWithAWriterThatWasOpenedLater) {
  AddAll();
  const Names before = Held();
  Unmount(root);
  OpenWriter();

  ExpectAllRefused();
  EXPECT_EQ(Held(), before);
}

TEST_F(RootTest, WhatLiesUnderTheMountPointIsNotAdded) {
  AddAll();
  const Names before = Held();
  Unmount(root);
  WriteFile(At("under"), "");

  ExpectRefused(writer->Add(At("under"), {}));
  Commit();
  EXPECT_EQ(Held(), before);
}

TEST_F(RootTest, OtherDiskInItsPlaceChangesNothing) {
  AddAll();
  const Names before = Held();
  MountImage("ext4", root);
  WriteFile(At("a"), "other");

  ExpectAllRefused();
  ExpectRefused(writer->Add(At("a"), {}));
  EXPECT_EQ(Held(), before);
}

TEST_F(RootTest, ReindexOfAFolderThatIsEmptyWhereItWasNotRemovesNothing) {
  AddAll();
  const Names before = Held();
  for (const auto& left : std::filesystem::directory_iterator(root)) {
    std::filesystem::remove_all(left.path());
  }

  ExpectRefused(writer->Delete(root, DeleteMode::STALE));
  Commit();
  EXPECT_EQ(Held(), before);

  ASSERT_TRUE(store->UpdateStatus("s", [](ShareStatus& status) { status.accept_empty = true; }));
  EXPECT_TRUE(writer->Delete(root, DeleteMode::STALE));
  Commit();
  EXPECT_LT(Held().size(), before.size());
}

// What was mounted there from elsewhere on the same file system is gone.
TEST_F(RootTest, EmptyFolderInPlaceOfTheRootRemovesNothing) {
  AddAll();
  const Names before = Held();
  MakeFolder(At("away"));
  Run("mount --bind " + At("away") + " " + root);
  mounted.push_back(root);

  ExpectRefused(writer->Delete(root, DeleteMode::STALE));
  ExpectRefused(writer->Refresh(root, {}, {}));
  ExpectRefused(writer->Add(root, {}));
  Commit();
  EXPECT_EQ(Held(), before);
}

TEST_F(RootTest, EmptyRootThatIsAllThatTheIndexHoldsIsRefreshed) {
  for (const auto& left : std::filesystem::directory_iterator(root)) {
    std::filesystem::remove_all(left.path());
  }

  EXPECT_TRUE(writer->Add(root, {}));
  Commit();
  EXPECT_TRUE(writer->Refresh(root, {}, {}));
  Commit();
  EXPECT_EQ(Held(), Names({""}));
}

TEST_F(RootTest, ComparisonOfAnUnmountedShareIsRefused) {
  AddAll();
  Unmount(root);
  Comparison result;
  std::string error;

  EXPECT_FALSE(CompareShare(
      *store, "s", [](Difference, const std::string&) { return true; }, result, error));
  EXPECT_NE(error.find(root), std::string::npos);
}

TEST_F(RootTest, ChangesBeforeTheUnmountingAreCommitted) {
  AddAll();
  WriteFile(At("b"), "");
  Add("b");
  const std::string image = last_image;
  Unmount(root);
  ExpectRefused(writer->Delete(At("b"), DeleteMode::ENTRY));
  Commit();
  Run("mount -o loop " + image + " " + root);
  mounted.push_back(root);

  EXPECT_EQ(Differences(), Names());
}

TEST_F(RootTest, DiskThatIsBackIsIndexedOn) {
  AddAll();
  const std::string image = last_image;
  Unmount(root);
  ExpectAllRefused();
  Run("mount -o loop " + image + " " + root);
  mounted.push_back(root);
  RemoveTree(At("d"));

  Refresh("d");
  Commit();
  EXPECT_EQ(Differences(), Names());
}

}  // namespace fileindexd
