// SPDX-License-Identifier: GPL-2.0-or-later
// Renames, in whatever row they come.
#include <unistd.h>

#include "tests/unit/notify/gatherer_fixture.h"

namespace fileindexd {
namespace {

using std::chrono::milliseconds;

TEST_F(GathererTest, RenameInsideIsOneLine) {
  Make("new");
  Add(File(CREATED, "old"));
  Add(Rename("old", "new"));
  Add(File(ATTRIBUTES, "new"));

  EXPECT_EQ(Due(), Texts({"RENAME old new"}));
}

TEST_F(GathererTest, RenameInIsACreateAndOutADelete) {
  Exclude("*.tmp");
  Make("file");
  MakeDirectory("dir");
  Add({MOVED_TO, false, Path("file"), folder + "/other/file"});
  Add({MOVED_TO, true, Path("dir"), Path("dir.tmp")});
  Add({MOVED_TO, false, folder + "/other/out", Path("out")});
  Add({MOVED_TO, false, Path("a.tmp"), Path("a")});

  EXPECT_EQ(Due(), Texts({"DELETE a", "REINDEX dir", "CREATE file", "DELETE out"}));
}

TEST_F(GathererTest, RenamesGoOnFromEachOther) {
  Make("c");
  Add(Rename("a", "b"));
  Add(Rename("b", "c"));

  EXPECT_EQ(Due(), Texts({"DELETE b", "RENAME a c"}));
}

TEST_F(GathererTest, RenameThereAndBackIsALookAtBoth) {
  MakeDirectory("a");
  Add(Rename("a", "b", true));
  Add(Rename("b", "a", true));

  EXPECT_EQ(Due(), Texts({"REINDEX a", "DELETE b"}));
}

TEST_F(GathererTest, RenameBackOverAnotherRenameLosesNoPath) {
  Make("o");
  Add(Rename("o", "x"));
  Add(Rename("q", "o"));
  Add(Rename("x", "o"));

  EXPECT_EQ(Due(), Texts({"CREATE o", "DELETE q", "DELETE x"}));
}

TEST_F(GathererTest, ASwapIsTwoRenames) {
  Make("a");
  Make("b");
  Add(Rename("a", "t"));
  Add(Rename("b", "a"));
  Add(Rename("t", "b"));

  EXPECT_EQ(Due(), Texts({"RENAME b a", "RENAME a b", "DELETE t"}));
}

TEST_F(GathererTest, TwoRenamesToOnePathLoseNoFormerOne) {
  Make("p");
  Add(Rename("a", "p"));
  Add(Rename("b", "p"));

  EXPECT_EQ(Due(), Texts({"DELETE a", "RENAME b p"}));
}

TEST_F(GathererTest, ATargetThatIsGoneAgainIsALookAtBoth) {
  Make("old");
  Add(Rename("old", "new"));
  Add(File(DELETED, "new"));

  EXPECT_EQ(Due(), Texts({"DELETE new", "CREATE old"}));
}

TEST_F(GathererTest, APipeRenamedOverAFileTakesItAway) {
  ASSERT_EQ(mkfifo(Path("file").c_str(), 0600), 0);
  Add(Rename("pipe", "file"));

  EXPECT_EQ(Due(), Texts({"DELETE file", "DELETE pipe"}));
}

TEST_F(GathererTest, WhatIsGatheredBelowARenamedDirectoryIsLookedAtByItsOldName) {
  MakeDirectory("new");
  Make("new/file");
  Add(File(CREATED, "old/file"));
  Add(Rename("old", "new", true));
  Add(File(WRITTEN, "new/file"));
  now += milliseconds(50);

  EXPECT_EQ(Due(), Texts({"RENAME old new", "WRITE new/file", "DELETE old/file"}));
}

}  // namespace
}  // namespace fileindexd
