// SPDX-License-Identifier: GPL-2.0-or-later
#include <algorithm>
#include <string>

#include "platform/log.h"
#include "unit/worker/walks_fixture.h"

namespace fileindexd {
namespace {

using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::UnorderedElementsAre;

TEST_F(WorkerWalksTest, AnAddTakesTheDirectoryAndAllBelow) {
  const std::string d = Dir("d");
  File("d/f");
  Dir("d/e/empty");
  File("d/e/g");

  EXPECT_EQ(worker->IndexDirAdd(d), 2);

  EXPECT_EQ(Touched().front(), "Add /d");
  EXPECT_THAT(Touched(), UnorderedElementsAre("Add /d", "Add /d/f", "Add /d/e", "Add /d/e/empty",
                                              "Add /d/e/g"));
  EXPECT_EQ(worker->op_count, 5 + 3);  // entries, and once for each directory
}

TEST_F(WorkerWalksTest, AnUpdateTakesTheSameEntriesWithItsData) {
  const std::string d = Dir("d");
  File("d/e/g");

  EXPECT_EQ(worker->IndexDirUpdate(d, Flags()), 2);

  EXPECT_THAT(Touched(), UnorderedElementsAre("Upd /d", "Upd /d/e", "Upd /d/e/g"));
  for (const std::string& call : Changes()) {
    EXPECT_TRUE(call.ends_with(" {\"document\":false} {\"audio\":true}")) << call;
  }
  EXPECT_EQ(worker->op_count, 3 + 2);
}

TEST_F(WorkerWalksTest, AFileIsOneEntryAndACompleteWalk) {
  TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_DEBUG;
  const std::string f = File("f");

  EXPECT_EQ(worker->IndexDirAdd(f), 2);

  EXPECT_THAT(Touched(), ElementsAre("Add /f"));
  EXPECT_EQ(Log().back(), "IndexDirAdd: " + f);
}

TEST_F(WorkerWalksTest, AMissingPathIsCountedAndNotWalked) {
  TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_DEBUG;

  EXPECT_EQ(worker->IndexDirAdd(In("gone")), 1);

  EXPECT_THAT(Touched(), IsEmpty());
  EXPECT_EQ(worker->op_count, 1);
  EXPECT_THAT(Log(), IsEmpty());

  EXPECT_EQ(worker->IndexDirUpdate(In("gone"), Flags()), 1);

  EXPECT_THAT(Touched(), ElementsAre("Upd /gone"));  // an update has no filters
  EXPECT_EQ(worker->op_count, 1 + 2);
  EXPECT_EQ(script.CountLines("IndexDir"), 0U);
}

TEST_F(WorkerWalksTest, ARefusedMountPointIsOneEntryAndTheWalksResult) {
  const std::string d = Dir("d");
  File("d/f");
  script.Say("CanFullPathBeIndexed", d, 0);
  script.Say("TALOFSDirIsMntPoint", d, 1);

  EXPECT_EQ(worker->IndexDirAdd(d), 2);
  EXPECT_EQ(worker->IndexDirUpdate(d, Flags()), 2);
  EXPECT_THAT(Touched(), ElementsAre("Add /d", "Upd /d"));

  script.Fail("AddFSDocument");
  script.Fail("UpdateFSDocument");
  EXPECT_EQ(worker->IndexDirAdd(d), 1);
  EXPECT_EQ(worker->IndexDirUpdate(d, Flags()), 1);
  EXPECT_EQ(worker->op_count, 2);  // no count of the walk's own
}

TEST_F(WorkerWalksTest, AMountPointThatMayBeAnEntryIsWalkedAndNotAskedAbout) {
  const std::string d = Dir("d");
  File("d/f");
  script.Say("TALOFSDirIsMntPoint", d, 1);

  for (int which = 0; which < TAKING_IN; ++which) {
    script.Forget();
    EXPECT_EQ(Walk(which, d), 2);
    const std::string touch = TOUCHES[which];
    EXPECT_THAT(Touched(), ElementsAre(touch + "/d", touch + "/d/f"));
  }
  EXPECT_EQ(script.CallCount("TALOFSDirIsMntPoint"), 0);
}

TEST_F(WorkerWalksTest, ARefusedMountPointThatIsNoDirectoryIsNoEntry) {
  const std::string d = Dir("d");
  script.Say("CanFullPathBeIndexed", d, 0);
  script.Say("TALOFSDirIsMntPoint", d, 1);
  script.Say("IsDirExist", d, 0);
  for (int which = 0; which < TAKING_IN; ++which) {
    worker->op_count = 0;
    EXPECT_EQ(Walk(which, d), 2) << which;
    EXPECT_EQ(worker->op_count, 1) << which;
  }
  EXPECT_THAT(Touched(), IsEmpty());
}

TEST_F(WorkerWalksTest, AnyOtherRefusedDirectoryIsWalkedWithoutItsOwnEntry) {
  const std::string d = Dir("d");
  File("d/f");
  script.Say("CanFullPathBeIndexed", d, 0);

  EXPECT_EQ(worker->IndexDirAdd(d), 2);
  EXPECT_EQ(worker->IndexDirUpdate(d, Flags()), 2);

  EXPECT_THAT(Touched(), ElementsAre("Add /d/f", "Upd /d/f"));
  EXPECT_EQ(worker->op_count, 4);
}

TEST_F(WorkerWalksTest, ARefusedMountPointBelowIsOneEntryToo) {
  const std::string d = Dir("d");
  const std::string inner = Dir("d/m");
  File("d/m/f");
  script.Say("CanFullPathBeIndexed", inner, 0);
  script.Say("TALOFSDirIsMntPoint", inner, 1);

  for (int which = 0; which < TAKING_IN; ++which) {
    script.Forget();
    EXPECT_EQ(Walk(which, d), 2);
    const std::string touch = TOUCHES[which];
    EXPECT_THAT(Touched(), ElementsAre(touch + "/d", touch + "/d/m"));
  }
}

TEST_F(WorkerWalksTest, AMountPointInASnapshotIsWalked) {
  const std::string d = Dir("#snapshot");
  File("#snapshot/f");
  script.Say("CanFullPathBeIndexed", d, 0);
  script.Say("TALOFSDirIsMntPoint", d, 1);
  script.Say("QLIBFhsPathInSnapshot", d, 1);

  for (int which = 0; which < TAKING_IN; ++which) {
    script.Forget();
    EXPECT_EQ(Walk(which, d), 2);
    EXPECT_THAT(Touched(), ElementsAre(TOUCHES[which] + std::string("/#snapshot/f")));
  }
}

TEST_F(WorkerWalksTest, PreservedNamesAreNeverTouchedAtAnyDepth) {
  Dir("d/keep/kept");
  File("d/keep/f");
  File("d/e/keep");
  File("d/e/g");
  script.Say("IsSystemPreservedFileName", "keep", 1);
  for (int which = 0; which < WALKS; ++which) {
    script.Forget();
    if (which == 2) {
      script.Fail("IsFullPathIndexed");  // so that a clean descends
    }
    Walk(which, In("d"));
    EXPECT_EQ(Touched().size(), 3U);
    for (const std::string& call : script.Calls()) {
      EXPECT_EQ(call.find("/keep"), std::string::npos) << call;
    }
    EXPECT_THAT(script.Calls(), Not(Contains("IsSystemPreservedFileName .")));
    EXPECT_THAT(script.Calls(), Not(Contains("IsSystemPreservedFileName ..")));
  }
}

TEST_F(WorkerWalksTest, OnlyTheRuleDecidesWhetherAnEntryIsADirectory) {
  const std::string d = Dir("d");
  const std::string inner = Dir("d/e");
  File("d/e/f");
  script.Say("IsDirExist", inner, 0);
  script.Say("IsFileExist", inner, 1);

  worker->IndexDirAdd(d);

  EXPECT_THAT(Touched(), ElementsAre("Add /d", "Add /d/e"));
}

TEST_F(WorkerWalksTest, AnUpdateLeavesConfiguredFoldersAloneAndAnAddDoesNot) {
  const std::string d = Dir("d");
  File("d/own/f");
  File("d/own2/f");
  AddFolder(In("d/own"));
  worker->state = WORKER_IDLE;
  worker->ReloadSetting();
  worker->state = WORKER_RUNNING;
  script.Forget();

  worker->IndexDirUpdate(d, Flags());
  EXPECT_THAT(Touched(), ElementsAre("Upd /d", "Upd /d/own2", "Upd /d/own2/f"));

  script.Forget();
  worker->IndexDirAdd(d);
  EXPECT_THAT(Touched(), Contains("Add /d/own/f"));
}

TEST_F(WorkerWalksTest, AnUpdateThatBeginsAtAConfiguredFolderTakesIt) {
  File("f");
  worker->IndexDirUpdate(share_path, Flags());
  EXPECT_THAT(Touched(), ElementsAre("Upd ", "Upd /f"));
}

TEST_F(WorkerWalksTest, ACleanOfWhatIsAllIndexedChangesNothing) {
  File("d/f");
  File("d/e/g");

  EXPECT_EQ(worker->IndexDirClean(In("d")), 2);

  EXPECT_THAT(Touched(), IsEmpty());
  EXPECT_EQ(script.CallCount("IsDirExist"), 0);  // an indexed directory is not descended into
  EXPECT_EQ(worker->op_count, 0);
}

TEST_F(WorkerWalksTest, ACleanDeletesWhatIsNotCoveredAnyMoreParentsFirst) {
  File("d/f");
  File("d/e/g");
  File("d/kept/h");
  script.folders.clear();
  AddFolder(In("d/kept"));
  worker->state = WORKER_IDLE;
  worker->ReloadSetting();
  worker->state = WORKER_RUNNING;

  EXPECT_EQ(worker->IndexDirClean(In("d")), 2);

  const auto touched = Touched();
  EXPECT_THAT(touched, UnorderedElementsAre("Del /d", "Del /d/f", "Del /d/e", "Del /d/e/g"));
  EXPECT_EQ(touched.front(), "Del /d");
  EXPECT_LT(std::find(touched.begin(), touched.end(), "Del /d/e"),
            std::find(touched.begin(), touched.end(), "Del /d/e/g"));
  EXPECT_EQ(worker->op_count, 4);
}

TEST_F(WorkerWalksTest, ATrailingSlashIsPassedOnUnchanged) {
  File("d/f");
  worker->IndexDirAdd(In("d/"));
  EXPECT_THAT(Touched(), ElementsAre("Add /d/", "Add /d//f"));
}

TEST_F(WorkerWalksTest, ALongWalkCommitsOnItsWay) {
  File("d/f");
  worker->op_count = 1998;
  worker->IndexDirAdd(In("d"));
  EXPECT_EQ(script.CallCount("Commit"), 1);
}

}  // namespace
}  // namespace fileindexd
