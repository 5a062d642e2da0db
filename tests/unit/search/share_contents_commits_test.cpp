// SPDX-License-Identifier: GPL-2.0-or-later
// Commits that take their time: reading goes on beside them.
#include "tests/unit/search/share_contents_fixture.h"

namespace fileindexd {
namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::Not;
using testing::SizeIs;

class CommitBesideTest : public ShareContentsTest {
 protected:
  void AddFiles() {
    for (int64_t row = 1; row <= 8; ++row) {
      AddFile(row);
    }
    Settle();
  }
  // Some are given out, the first one is read, and its result is being committed.
  void BeginCommit() {
    AddFiles();
    ids = GiveOut(3);
    ASSERT_THAT(ids, SizeIs(3));
    SideWorkTakesTime() = true;
    if (fails) {
      Scripted().failing["Commit"] = IndexError::IO;
    }
    End(ids[0], ExtractOutcome::Result::DONE);
    Pass(milliseconds(500));
    ASSERT_EQ(Count("Finish"), 1U);
    calls = Scripted().calls.size();
  }
  // Of the first four one is given out and then the others; the tries of the next ones are being
  // put on record meanwhile.
  void BeginTries() {
    AddFiles();
    ids = GiveOut(1);
    ASSERT_THAT(ids, SizeIs(1));
    SideWorkTakesTime() = true;
    ASSERT_THAT(GiveOut(), SizeIs(3));
  }
  void EndCommit() {
    SideWorkTakesTime() = false;
    contents.Work(now, Wall());
    Settle();
  }
  // Whatever happened before, in the end all is read.
  void ReadAll() {
    for (int rounds = 0; rounds < 4; ++rounds) {
      for (const uint64_t id : GiveOut()) {
        End(id, ExtractOutcome::Result::DONE);
      }
      Pass(milliseconds(500));
    }
    for (int64_t row = 1; row <= 8; ++row) {
      EXPECT_EQ(Kept(row).state, ScriptedFile::State::DONE) << row;
    }
  }
  std::vector<int> Polled() const {
    std::vector<pollfd> polled;
    contents.AddPolled(polled);
    std::vector<int> fds;
    for (const pollfd& one : polled) {
      fds.push_back(one.fd);
    }
    return fds;
  }
  bool IsWriterLeftAlone() const { return Scripted().calls.size() == calls; }

  std::vector<uint64_t> ids;
  bool fails = false;
  size_t calls = 0;
};

TEST_F(CommitBesideTest, FilesThatAreReadyAreGivenOutAndResultsWait) {
  BeginCommit();
  EXPECT_EQ(contents.Due(), Time::max());
  EXPECT_THAT(GiveOut(), Not(IsEmpty()));
  End(ids[1], ExtractOutcome::Result::DONE);
  contents.EntriesChanged();
  contents.LookAtAll();
  contents.Work(now, Wall());
  EXPECT_TRUE(IsWriterLeftAlone());
  EXPECT_TRUE(contents.TakesRoom(now));

  EndCommit();
  EXPECT_EQ(Count("Finish"), 2U);
  EXPECT_EQ(Count("LookAtAll"), 2U);
}

TEST_F(CommitBesideTest, WhatNeedsTheWriterWaitsForIt) {
  BeginCommit();
  contents.Halt();

  EXPECT_EQ(Count("Close"), 1U);
  for (int64_t row = 2; row <= 8; ++row) {
    EXPECT_EQ(Kept(row).tries, 0) << row;
  }
  EXPECT_EQ(Kept(1).state, ScriptedFile::State::DONE);
}

TEST_F(CommitBesideTest, TriesAreOnRecordBeforeTheirFilesAreGivenOut) {
  BeginTries();
  EXPECT_EQ(Count("NextJobs 8"), 1U);
  contents.Work(now, Wall());
  EXPECT_FALSE(contents.MayHaveJobs(Turn::NEW, now));
  EXPECT_TRUE(contents.IsNewWaiting(now));
  EXPECT_THAT(GiveOut(), IsEmpty());

  EndCommit();
  EXPECT_THAT(GiveOut(), SizeIs(4));
}

TEST_F(CommitBesideTest, TriesThatAreBeingRecordedAreTakenBackByAPause) {
  BeginTries();
  EXPECT_EQ(Kept(8).tries, 1);
  contents.Halt();

  for (int64_t row = 1; row <= 8; ++row) {
    EXPECT_EQ(Kept(row).tries, 0) << row;
  }
}

// The batch is answered first, and then the look at what was read, whose text is enough for a
// commit.
TEST_F(CommitBesideTest, WhatWasJustOpenedIsPutOnRecordByNoOtherCommit) {
  AddFile(1);
  Settle();
  ids = GiveOut();
  ASSERT_THAT(ids, SizeIs(1));
  AddFile(2);
  contents.EntriesChanged();
  Pass(seconds(1));
  FilesystemHangs() = true;
  EXPECT_THAT(GiveOut(), IsEmpty());
  FilesystemHangs() = false;
  const size_t asked = Count("NextJobs");
  End(ids[0], ExtractOutcome::Result::DONE, std::string(9 << 20, 'x'));

  EXPECT_THAT(GiveOut(), IsEmpty());
  EXPECT_EQ(Count("NextJobs"), asked);
  Settle();
  EXPECT_EQ(Kept(1).state, ScriptedFile::State::DONE);
  EXPECT_EQ(Kept(2).tries, 1);
  EXPECT_THAT(GiveOut(), SizeIs(1));
}

TEST_F(CommitBesideTest, TextsThatWaitAreBounded) {
  BeginCommit();
  End(ids[1], ExtractOutcome::Result::DONE, std::string(3 << 20, 'x'));
  EXPECT_FALSE(contents.MayHaveJobs(Turn::NEW, now));
  EXPECT_THAT(GiveOut(), IsEmpty());

  EndCommit();
  EXPECT_THAT(GiveOut(), Not(IsEmpty()));
}

TEST_F(CommitBesideTest, TextsThatWereTakenBackCountNoMore) {
  BeginCommit();
  End(ids[1], ExtractOutcome::Result::DONE, std::string(3 << 20, 'x'));
  contents.Halt();
  SideWorkTakesTime() = false;
  Settle();

  EXPECT_THAT(GiveOut(), Not(IsEmpty()));
}

TEST_F(CommitBesideTest, OneThatFailsLetsTheShareRestAndLosesNothing) {
  fails = true;
  BeginCommit();
  EXPECT_EQ(Count("Close"), 0U);
  SideWorkTakesTime() = false;
  contents.Work(now, Wall());
  EXPECT_EQ(Count("Close"), 1U);
  EXPECT_EQ(contents.Due(), now + seconds(1));

  Scripted().failing.clear();
  Pass(seconds(1));
  EXPECT_EQ(Kept(1).state, ScriptedFile::State::WAITS);
  ReadAll();
}

// What was read meanwhile, and was not looked at yet, is taken back along with all else.
TEST_F(CommitBesideTest, OneThatFailsBesideAPauseLosesNothing) {
  fails = true;
  BeginCommit();
  End(ids[1], ExtractOutcome::Result::DONE);
  contents.Halt();
  EXPECT_EQ(Count("Close"), 1U);

  Scripted().failing.clear();
  SideWorkTakesTime() = false;
  Settle();
  ReadAll();
}

TEST_F(CommitBesideTest, SettingsWaitForItsEndAndTakeNothingOfIt) {
  BeginTries();
  const size_t begun = Count("BeginTries");
  contents.Use(std::make_shared<Settings>());
  EXPECT_EQ(contents.Due(), Time::max());

  EndCommit();
  EXPECT_EQ(Count("BeginTries"), begun);
  EXPECT_EQ(Kept(8).tries, 1);
  EXPECT_EQ(Count("UseSettings"), 1U);
}

TEST_F(CommitBesideTest, ItsEndIsWaitedForBeforeAnswers) {
  BeginCommit();
  EXPECT_THAT(Polled(), ElementsAre(SIDE_WORK_POLLED));
  EndCommit();
  EXPECT_THAT(Polled(), ElementsAre(OPENER_POLLED));
}

TEST_F(CommitBesideTest, WithoutAThreadForItItIsDoneHere) {
  SideWorkFails() = true;
  BeginCommit();
  EXPECT_EQ(Kept(1).state, ScriptedFile::State::DONE);
  EXPECT_NE(contents.Due(), Time::max());
  End(ids[1], ExtractOutcome::Result::DONE);
  End(ids[2], ExtractOutcome::Result::DONE);
  ReadAll();
}

TEST_F(CommitBesideTest, WithNothingElseToReadItIsDoneAtOnce) {
  AddFile(1);
  Settle();
  SideWorkTakesTime() = true;
  ids = GiveOut();
  ASSERT_THAT(ids, SizeIs(1));
  End(ids[0], ExtractOutcome::Result::DONE);

  EXPECT_EQ(Kept(1).state, ScriptedFile::State::DONE);
  EXPECT_NE(contents.Due(), Time::max());
}

}  // namespace
}  // namespace fileindexd
