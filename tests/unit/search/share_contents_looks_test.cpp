// SPDX-License-Identifier: GPL-2.0-or-later
// When it looks for what waits, when it rests, and what it asks for meanwhile.
#include "tests/unit/search/share_contents_fixture.h"

namespace fileindexd {
namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;
using testing::IsEmpty;

TEST_F(ShareContentsTest, ItAsksAgainWhileMoreMayWait) {
  AddFile(1);
  Scripted().unseen = true;
  Settle();
  EXPECT_THAT(GiveOut(), IsEmpty());

  EXPECT_TRUE(contents.MayHaveJobs(Turn::NEW, now));
  EXPECT_EQ(GiveOut().size(), 1U);
}

TEST_F(ShareContentsTest, WithoutEntriesItWaitsForThem) {
  AddFile(1);
  Scripted().failing["Open"] = IndexError::PATH_NOT_FOUND;
  Settle();
  Pass(seconds(30));
  EXPECT_EQ(Count("Open"), 1U);

  Scripted().failing.clear();
  contents.EntriesChanged();
  Settle();
  EXPECT_EQ(GiveOut().size(), 1U);
}

// Their log alone may have gone, and nobody may write to them for long.
TEST_F(ShareContentsTest, EntriesThatSeemToGoAreLookedForOnceMore) {
  AddFile(1);
  Scripted().failing["Open"] = IndexError::PATH_NOT_FOUND;
  Scripted().entries_go = true;
  Settle();
  EXPECT_EQ(Count("Open"), 1U);

  Scripted().failing.clear();
  Pass(ContentsWriter::LONGEST_REMOVAL);
  EXPECT_EQ(GiveOut().size(), 1U);
}

TEST_F(ShareContentsTest, AMissingRootIsNotTakenForMissingFiles) {
  AddFile(1);
  Settle();
  std::filesystem::rename(root, root + ".away");

  EXPECT_THAT(GiveOut(), IsEmpty());
  EXPECT_FALSE(contents.MayHaveJobs(Turn::NEW, now));  // rests
  std::filesystem::rename(root + ".away", root);
  Pass(seconds(100));

  EXPECT_EQ(GiveOut().size(), 1U);
}

TEST_F(ShareContentsTest, FilesOfAFileSystemThatHangsAreNotClosedHere) {
  const auto open_files = [] {
    return std::distance(std::filesystem::directory_iterator("/proc/self/fd"), {});
  };
  for (int64_t row = 1; row <= 3; ++row) {
    AddFile(row);
  }
  Settle();
  const auto closed = open_files();
  ASSERT_EQ(GiveOut(1).size(), 1U);
  const auto open = open_files();
  ASSERT_EQ(open, closed + 3);

  FilesystemHangs() = true;
  contents.Halt();
  EXPECT_EQ(open_files(), open);

  FilesystemHangs() = false;
  Settle();
  EXPECT_EQ(open_files(), closed);
}

TEST_F(ShareContentsTest, AShareLowOnSpaceGetsNoContents) {
  AddFile(1);
  Settle();
  const auto ids = GiveOut();
  ASSERT_EQ(ids.size(), 1U);

  contents.Set(contents.share, {.no_space = true});
  End(ids[0], ExtractOutcome::Result::DONE);
  EXPECT_EQ(contents.Due(), Time::max());
  EXPECT_EQ(Kept(1).state, ScriptedFile::State::WAITS);

  contents.Set(contents.share, {});
  Settle();
  EXPECT_EQ(GiveOut().size(), 1U);
}

TEST_F(ShareContentsTest, AWishToRetryIsFulfilledOnce) {
  AddFile(1);
  Scripted().kept = Scripted().entries;
  Scripted().kept[1].state = ScriptedFile::State::FAILED;
  Settle();
  EXPECT_THAT(GiveOut(), IsEmpty());
  EXPECT_FALSE(contents.TakeRetried());

  contents.Set(contents.share, {.retry_contents = true});
  Settle();

  EXPECT_TRUE(contents.TakeRetried());
  EXPECT_FALSE(contents.TakeRetried());
  EXPECT_EQ(GiveOut().size(), 1U);
}

TEST_F(ShareContentsTest, WhatWasFoundBeforeAFailureIsKept) {
  AddFile(1);
  Settle();
  const auto ids = GiveOut();
  ASSERT_EQ(ids.size(), 1U);

  End(ids[0], ExtractOutcome::Result::FAILED, "a part");
  Pass(milliseconds(500));

  EXPECT_EQ(Kept(1).state, ScriptedFile::State::FAILED);
  EXPECT_EQ(Kept(1).text, "the reason");
  EXPECT_EQ(Kept(1).found, "a part");
}

TEST_F(ShareContentsTest, AFileThatWasReadHasLostNoPatience) {
  AddFile(1);
  Settle();
  for (const bool is_retried : {false, true}) {
    contents.Set(contents.share, {.retry_contents = is_retried});
    Settle();
    auto ids = GiveOut();
    ASSERT_EQ(ids.size(), 1U);
    End(ids[0], ExtractOutcome::Result::LOST);
    Pass(milliseconds(500));

    (void)GiveOut();
    Pass(seconds(3));  // twice as long, if it counted as the second time

    ids = GiveOut();
    ASSERT_EQ(ids.size(), 1U) << is_retried;
    End(ids[0], ExtractOutcome::Result::FAILED);
    Pass(milliseconds(500));
  }
}

TEST_F(ShareContentsTest, WhatIsToldOfBeforeItCountsIsSeenALittleLater) {
  Settle();
  contents.EntriesChanged();
  Pass(milliseconds(200));
  AddFile(1);  // the commit's end, which nothing tells of

  Pass(seconds(2));

  EXPECT_EQ(GiveOut().size(), 1U);
}

TEST_F(ShareContentsTest, WhatIsClosedIsLookedAtAtOnce) {
  Quieten();
  contents.EntriesChanged();
  Settle();
  AddFile(1);

  contents.EntriesClosed();
  Pass(milliseconds(2));

  EXPECT_EQ(GiveOut().size(), 1U);
}

TEST_F(ShareContentsTest, NothingIsOpenedForAClosing) {
  Quieten();
  const size_t opened = Count("Open");
  ASSERT_EQ(Count("Close"), opened);

  contents.EntriesClosed();
  Quieten();

  EXPECT_EQ(Count("Open"), opened);
}

TEST_F(ShareContentsTest, AllIsLookedAtOnceADay) {
  Quieten();
  EXPECT_EQ(Count("LookAtAll"), 1U);
  Pass(std::chrono::hours(23));
  EXPECT_EQ(Count("LookAtAll"), 1U);

  Pass(std::chrono::hours(2));

  EXPECT_EQ(Count("LookAtAll"), 2U);
}

TEST_F(ShareContentsTest, WithNothingToDoItClosesAndSleeps) {
  Settle();
  EXPECT_THAT(GiveOut(), IsEmpty());
  Wait(20);
  EXPECT_EQ(Count("Close"), 1U);  // though it looks once more later
  EXPECT_EQ(Count("CutLog"), 1U);
  Quieten();

  EXPECT_GT(contents.Due() - now, std::chrono::hours(20));
  const size_t opened = Count("Open");
  contents.EntriesChanged();
  Settle();
  EXPECT_GT(Count("Open"), opened);
  EXPECT_EQ(Count("LookAtAll"), 1U);
}

TEST_F(ShareContentsTest, ACommitThatTheDiskTakesLongForIsSeen) {
  Settle();
  Wait(20);
  AddFile(1);  // the commit's end, which nothing tells of

  Pass(seconds(20));

  EXPECT_EQ(GiveOut().size(), 1U);
}

}  // namespace
}  // namespace fileindexd
