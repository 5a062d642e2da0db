// SPDX-License-Identifier: GPL-2.0-or-later
// What is read out of files, and written down.
#include "tests/unit/search/share_contents_fixture.h"

namespace fileindexd {
namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;
using testing::Contains;
using testing::IsEmpty;
using testing::Not;

TEST_F(ShareContentsTest, WhatWasReadIsPreparedBeforeTheWriterGetsIt) {
  AddFile(1);
  Settle();
  const auto ids = GiveOut();
  ASSERT_EQ(ids.size(), 1U);
  End(ids[0], ExtractOutcome::Result::DONE);
  Settle();

  EXPECT_EQ(Kept(1).text, "words");
  EXPECT_TRUE(Kept(1).is_prepared);
}

TEST_F(ShareContentsTest, AFileIsReadAndWrittenDown) {
  AddFile(1);
  Settle();

  const auto ids = GiveOut();
  ASSERT_EQ(ids.size(), 1U);
  EXPECT_EQ(names, std::vector<std::string>{"f1"});
  EXPECT_EQ(Kept(1).tries, 1);  // on record before it is read
  End(ids[0], ExtractOutcome::Result::DONE, "words");

  EXPECT_EQ(Kept(1).state, ScriptedFile::State::DONE);  // nothing else comes: at once
  EXPECT_EQ(Kept(1).text, "words");
}

TEST_F(ShareContentsTest, WhileWorkFlowsResultsAreCommittedAfterHalfASecondAtMost) {
  AddFile(1);
  AddFile(2);
  Settle();
  const auto ids = GiveOut();
  ASSERT_EQ(ids.size(), 2U);

  End(ids[0], ExtractOutcome::Result::DONE);
  EXPECT_EQ(Kept(1).state, ScriptedFile::State::WAITS);
  EXPECT_LE(contents.Due() - now, milliseconds(500));
  Pass(milliseconds(500));

  EXPECT_EQ(Kept(1).state, ScriptedFile::State::DONE);
}

TEST_F(ShareContentsTest, WhatWasReadBesideASlowFileDoesNotWaitForIt) {
  AddFile(1);
  AddFile(2);
  Settle();
  const auto ids = GiveOut();
  ASSERT_EQ(ids.size(), 2U);

  End(ids[0], ExtractOutcome::Result::DONE);
  EXPECT_THAT(GiveOut(), IsEmpty());
  Pass(milliseconds(50));

  EXPECT_EQ(Kept(1).state, ScriptedFile::State::DONE);
  EXPECT_EQ(Kept(2).state, ScriptedFile::State::WAITS);
}

TEST_F(ShareContentsTest, BesideAFileThatIsKnownToBeSlowNothingElseIsWaitedFor) {
  AddFile(1);
  AddFile(2);
  Settle();
  const auto ids = GiveOut();
  ASSERT_EQ(ids.size(), 2U);
  Quieten();

  End(ids[0], ExtractOutcome::Result::DONE);
  EXPECT_THAT(GiveOut(), IsEmpty());
  Settle();

  EXPECT_EQ(Kept(1).state, ScriptedFile::State::DONE);
}

TEST_F(ShareContentsTest, MuchTextIsCommittedAtOnce) {
  AddFile(1);
  AddFile(2);
  Settle();
  const auto ids = GiveOut();
  ASSERT_EQ(ids.size(), 2U);

  End(ids[0], ExtractOutcome::Result::DONE, std::string(9 << 20, 'x'));
  Settle();

  EXPECT_EQ(Kept(1).state, ScriptedFile::State::DONE);
}

TEST_F(ShareContentsTest, AFileThatChangesWhileItIsReadWaitsAgain) {
  const std::string path = AddFile(1);
  Settle();
  const auto ids = GiveOut();
  ASSERT_EQ(ids.size(), 1U);

  WriteFile(path, "longer than before");
  End(ids[0], ExtractOutcome::Result::DONE);
  Pass(milliseconds(500));

  EXPECT_EQ(Kept(1).state, ScriptedFile::State::WAITS);
  EXPECT_EQ(Kept(1).tries, 0);
  EXPECT_THAT(GiveOut(), IsEmpty());  // not at once: whoever writes it is still at it
}

TEST_F(ShareContentsTest, AFileThatIsAnotherThanTheIndexKnowsIsNotTried) {
  AddFile(1);
  WriteFile(root + "/f1", "longer than before");
  Settle();

  EXPECT_THAT(GiveOut(), IsEmpty());
  EXPECT_THAT(Scripted().calls, Not(Contains("BeginTries 1")));

  AddEntry(2, root + "/f1");
  contents.EntriesChanged();
  Pass(milliseconds(200));
  EXPECT_EQ(GiveOut().size(), 1U);
}

TEST_F(ShareContentsTest, AFileThatCameBackIsReadLater) {
  const std::string path = AddFile(1);
  std::filesystem::rename(path, path + "x");
  Settle();
  EXPECT_THAT(GiveOut(), IsEmpty());

  std::filesystem::rename(path + "x", path);
  Pass(seconds(3));

  EXPECT_EQ(GiveOut().size(), 1U);
}

TEST_F(ShareContentsTest, AHaltTakesBackWhatIsGivenOut) {
  for (int64_t row = 1; row <= 4; ++row) {
    AddFile(row);
  }
  Settle();
  const auto ids = GiveOut(2);
  ASSERT_EQ(ids.size(), 2U);
  EXPECT_EQ(Kept(1).tries + Kept(2).tries + Kept(3).tries + Kept(4).tries, 4);

  contents.Halt();
  End(ids[0], ExtractOutcome::Result::DONE);  // too late

  for (int64_t row = 1; row <= 4; ++row) {
    EXPECT_EQ(Kept(row).tries, 0) << row;
    EXPECT_EQ(Kept(row).state, ScriptedFile::State::WAITS) << row;
  }
  Settle();
  EXPECT_EQ(GiveOut().size(), 4U);
}

TEST_F(ShareContentsTest, AFailingDatabaseRestsLongerEachTimeAndGoesOn) {
  AddFile(1);
  Scripted().failing["Open"] = IndexError::IO;
  Settle();
  const Time first = contents.Due();
  EXPECT_GT(first, now);
  now = first;
  Settle();
  EXPECT_GE(contents.Due() - now, 2 * seconds(1));

  Scripted().failing.clear();
  now = contents.Due();
  Settle();
  EXPECT_EQ(GiveOut().size(), 1U);
}

TEST_F(ShareContentsTest, AFailureAtAnyCallLosesNothing) {
  for (const char* call : {"TakeIn", "Sweep", "NextJobs", "BeginTries", "Finish", "Commit"}) {
    ForgetScripted();
    ShareContents fresh({"a", root, ""});
    const auto run = [&] {
      for (int round = 0; round < 20; ++round, now += seconds(2)) {
        fresh.Work(now, Wall());
        ExtractJob job;
        if (fresh.Next(Turn::NEW, now, ++last_id, job)) {
          ExtractOutcome outcome;
          outcome.id = last_id;
          outcome.result = ExtractOutcome::Result::DONE;
          fresh.End(std::move(outcome), now);
        }
      }
    };
    AddFile(1);
    Scripted().failing[call] = IndexError::FULL;
    run();
    EXPECT_NE(Kept(1).state, ScriptedFile::State::DONE) << call;

    Scripted().failing.clear();
    now += seconds(100);
    run();
    EXPECT_EQ(Kept(1).state, ScriptedFile::State::DONE) << call;
  }
}

TEST_F(ShareContentsTest, AnEndMayLetAnotherFileGo) {
  AddFile(1);
  Settle();
  const auto ids = GiveOut();
  ASSERT_EQ(ids.size(), 1U);
  ASSERT_FALSE(contents.MayHaveJobs(Turn::NEW, now));

  End(ids[0], ExtractOutcome::Result::DONE);

  EXPECT_TRUE(contents.MayHaveJobs(Turn::NEW, now));
}

TEST_F(ShareContentsTest, NothingIsSweptWhileTheEntriesAreMadeAnew) {
  for (const ShareStatus& status :
       {ShareStatus{.needs_reindex = true}, ShareStatus{.reindex_begun = true}}) {
    contents.Set(contents.share, status);
    contents.EntriesChanged();
    Pass(seconds(1));
    EXPECT_EQ(Count("Sweep"), 0U);
  }
  EXPECT_GT(contents.Due(), now);

  contents.Set(contents.share, {});
  Settle();

  EXPECT_GT(Count("Sweep"), 0U);
}

TEST_F(ShareContentsTest, WordsAreMergedWhenNothingElseIsToBeDone) {
  Scripted().unmerged = 3;
  AddFile(1);
  Settle();
  const std::vector<uint64_t> ids = GiveOut();
  ASSERT_EQ(ids.size(), 1U);
  Settle();
  EXPECT_EQ(Count("Merge"), 0U);

  End(ids[0], ExtractOutcome::Result::DONE);
  (void)GiveOut();  // there is nothing more
  Settle();
  EXPECT_EQ(Count("Merge"), 4U);
  Wait(20);
  EXPECT_EQ(Count("Merge"), 4U);
}

TEST_F(ShareContentsTest, WhatComesMeanwhileIsReadBeforeTheMergingGoesOn) {
  Scripted().unmerged = 1000;
  Settle();
  (void)GiveOut();
  contents.Work(now, Wall());
  EXPECT_EQ(Count("Merge"), 1U);

  AddFile(1);
  contents.EntriesChanged();
  Pass(milliseconds(2));
  EXPECT_EQ(GiveOut().size(), 1U);
  const size_t merged = Count("Merge");
  Settle();
  EXPECT_EQ(Count("Merge"), merged);
}

TEST_F(ShareContentsTest, AFileSystemThatDoesNotAnswerLetsItsShareRest) {
  AddFile(1);
  Settle();
  FilesystemHangs() = true;
  EXPECT_THAT(GiveOut(), IsEmpty());
  EXPECT_FALSE(contents.MayHaveJobs(Turn::NEW, now));

  Pass(seconds(9));
  EXPECT_EQ(Count("Close"), 0U);
  Pass(seconds(1));
  EXPECT_EQ(Count("Close"), 1U);
  EXPECT_EQ(contents.Due(), now + seconds(1));
  Pass(seconds(1));
  EXPECT_EQ(Count("Open"), 1U) << "its root does not answer either";
  FilesystemHangs() = false;
  contents.Work(now, Wall());
  Settle();
  EXPECT_THAT(GiveOut(), Not(IsEmpty()));
}

TEST_F(ShareContentsTest, AFileSystemThatIsTooSlowForABatchIsAskedForSmallerOnes) {
  for (int64_t row = 1; row <= 100; ++row) {
    AddFile(row);
  }
  Settle();
  ASSERT_EQ(GiveOut(12).size(), 12U);
  ASSERT_EQ(Count("NextJobs 16"), 1U);
  FilesystemHangs() = true;
  EXPECT_EQ(GiveOut().size(), 16U) << "those that were open before";
  ASSERT_EQ(Count("NextJobs 32"), 1U);
  Pass(seconds(10));
  ASSERT_EQ(Count("Close"), 1U);

  FilesystemHangs() = false;
  Pass(seconds(1));
  (void)GiveOut(1);
  EXPECT_EQ(Count("NextJobs 16"), 2U);
}

TEST_F(ShareContentsTest, WhatWasReadWhenTheFileSystemHungIsReadAgain) {
  AddFile(1);
  Settle();
  const std::vector<uint64_t> ids = GiveOut();
  ASSERT_EQ(ids.size(), 1U);
  FilesystemHangs() = true;
  End(ids[0], ExtractOutcome::Result::DONE);
  Settle();
  EXPECT_EQ(Count("Finish"), 0U);

  contents.Halt();
  FilesystemHangs() = false;
  Settle();
  EXPECT_EQ(Kept(1).tries, 0);
  const std::vector<uint64_t> again = GiveOut();
  ASSERT_EQ(again.size(), 1U);
  End(again[0], ExtractOutcome::Result::DONE);
  Settle();
  EXPECT_EQ(Kept(1).state, ScriptedFile::State::DONE);
}

TEST_F(ShareContentsTest, ItTakesRoomUntilAllIsWrittenDown) {
  EXPECT_FALSE(contents.TakesRoom(now));
  AddFile(1);
  AddFile(2);
  Settle();
  FilesystemHangs() = true;
  EXPECT_THAT(GiveOut(), IsEmpty());
  EXPECT_FALSE(contents.MayHaveJobs(Turn::NEW, now));
  EXPECT_TRUE(contents.TakesRoom(now)) << "files are being opened";

  FilesystemHangs() = false;
  contents.Work(now, Wall());
  const std::vector<uint64_t> ids = GiveOut();
  ASSERT_EQ(ids.size(), 2U);
  EXPECT_FALSE(contents.MayHaveJobs(Turn::NEW, now));
  EXPECT_TRUE(contents.TakesRoom(now)) << "they are being read";
  for (const uint64_t id : ids) {
    End(id, ExtractOutcome::Result::DONE);
  }
  Pass(seconds(1));
  EXPECT_THAT(GiveOut(), IsEmpty());
  EXPECT_FALSE(contents.TakesRoom(now));
}

TEST_F(ShareContentsTest, QuickFilesAreGivenOutInLargerBatches) {
  for (int64_t row = 1; row <= 300; ++row) {
    AddFile(row);
  }
  Settle();
  EXPECT_EQ(GiveOut(300).size(), 300U);

  EXPECT_EQ(Count("NextJobs 4"), 1U);
  EXPECT_GT(Count("NextJobs 64"), 1U);
  EXPECT_EQ(Count("NextJobs 128"), 0U);
}

}  // namespace
}  // namespace fileindexd
