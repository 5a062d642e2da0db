// SPDX-License-Identifier: GPL-2.0-or-later
// What was renamed is found under its new path alone, whatever order the events come in.
#include <sys/stat.h>
#include <unistd.h>

#include <cstdio>

#include "state/layout.h"
#include "tests/unit/index/fixture.h"

namespace fileindexd {

class MovedTest : public IndexTest, public testing::WithParamInterface<const char*> {
 protected:
  void MountRoot() override { MountRootAs(GetParam()); }

  void Rename(const std::string& from, const std::string& to) {
    ASSERT_EQ(rename(At(from).c_str(), At(to).c_str()), 0) << from;
  }
  void Link(const std::string& from, const std::string& to) {
    ASSERT_EQ(link(At(from).c_str(), At(to).c_str()), 0) << from;
  }
  void Folder(const std::string& name, const Names& files) {
    MakeFolder(At(name));
    for (const std::string& file : files) {
      WriteFile(At(name + "/" + file), "");
    }
  }
};

INSTANTIATE_TEST_SUITE_P(Filesystems, MovedTest,
                         testing::Values("tmpfs", "no_birth_times", "ext4"));

TEST_P(MovedTest, FileThatIsAddedLeavesItsFormerPath) {
  WriteFile(At("old"), "");
  AddAll();
  Rename("old", "new");
  Add("new");
  Commit();
  EXPECT_EQ(Held(), Names({"", "new"}));
}

TEST_P(MovedTest, FolderThatIsAddedTakesAllFromItsFormerPath) {
  Folder("old/in", {"f", "g"});
  WriteFile(At("old!"), "");
  AddAll();
  Rename("old", "new");
  Add("new");
  Commit();
  EXPECT_EQ(Held(), Names({"", "new", "old!"}));
}

TEST_P(MovedTest, FormerPathThatIsAnotherFolderNowIsLookedThrough) {
  Folder("old", {"f", "g"});
  AddAll();
  Rename("old", "new");
  Folder("old", {"g"});
  Add("new");
  Add("new/f");
  Add("new/g");
  Commit();
  EXPECT_EQ(Held(), Names({"", "new", "new/f", "new/g", "old", "old/g"}));
  EXPECT_EQ(Differences(), Names());
}

TEST_P(MovedTest, RenamingOntoAnotherLeavesOneOfThem) {
  WriteFile(At("a"), "a");
  WriteFile(At("b"), "bb");
  AddAll();
  Rename("b", "a");
  Refresh("a");
  Commit();
  EXPECT_EQ(Held(), Names({"", "a"}));
  EXPECT_EQ(Differences(), Names());
}

// A file may get the inode number of a folder that is gone.
TEST_P(MovedTest, LinkInThePlaceOfAFolderWithTheSameNumberLeavesNothingOfIt) {
  Folder("d/in", {"f"});
  AddAll();
  RemoveTree(At("d"));
  WriteFile(At("new"), "x");
  Link("new", "d");
  struct stat status {};
  ASSERT_EQ(stat(At("new").c_str(), &status), 0);
  writer.reset();
  Run("sqlite3 " + IndexPath("s") + "/entries.db 'UPDATE entries SET inode = " +
      std::to_string(status.st_ino) + " WHERE path = CAST(\"" + At("d") + "\" AS BLOB)'");
  OpenWriter();
  Add("new");
  Commit();
  EXPECT_EQ(Held(), Names({"", "d", "new"}));
  EXPECT_EQ(Differences(), Names());
}

TEST_P(MovedTest, ExchangedFilesAreBothRefreshed) {
  WriteFile(At("a"), "a");
  WriteFile(At("b"), "bb");
  AddAll();
  Rename("a", "c");
  Rename("b", "a");
  Rename("c", "b");
  Refresh("a");
  Commit();
  EXPECT_EQ(Differences(), Names());
}

TEST_P(MovedTest, RowOfRenamesIsFollowedToItsEnd) {
  constexpr int LENGTH = 600;
  const auto name = [](int n) { return "f" + std::to_string(n); };
  for (int i = 0; i < LENGTH; ++i) {
    WriteFile(At(name(i)), std::string(static_cast<size_t>(i % 100), 'x'));
  }
  AddAll();
  for (int i = LENGTH; i > 0; --i) {
    Rename(name(i - 1), name(i));
  }
  Refresh(name(LENGTH));
  Commit();
  EXPECT_EQ(Differences(), Names());
}

TEST_P(MovedTest, LinksThatAreThereStay) {
  WriteFile(At("a"), "");
  Link("a", "b");
  AddAll();
  Link("a", "c");
  Add("c");
  Commit();
  EXPECT_EQ(Held(), Names({"", "a", "b", "c"}));
  EXPECT_EQ(Differences(), Names());
}

TEST_P(MovedTest, RenamedLinkLeavesItsFormerPathAndNoOther) {
  WriteFile(At("a"), "");
  Link("a", "b");
  AddAll();
  Rename("b", "c");
  Add("c");
  Commit();
  EXPECT_EQ(Held(), Names({"", "a", "c"}));
}

}  // namespace fileindexd
