// SPDX-License-Identifier: GPL-2.0-or-later
// Commits that take their time: reading goes on beside them.
#include "tests/unit/search/share_contents_fixture.h"

namespace fileindexd {
namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;
using testing::Contains;
using testing::IsEmpty;
using testing::Not;
using testing::SizeIs;

class CommitBesideTest : public ShareContentsTest {
 protected:
  // Some are given out, the first one is read, and its result is being committed.
  void BeginCommit() {
    for (int64_t row = 1; row <= 8; ++row) {
      AddFile(row);
    }
    Settle();
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
  void EndCommit() {
    SideWorkTakesTime() = false;
    contents.Work(now, Wall());
    Settle();
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
  for (int64_t row = 1; row <= 8; ++row) {
    AddFile(row);
  }
  Settle();
  ids = GiveOut(1);  // of four; the next ones are opened behind it
  ASSERT_THAT(ids, SizeIs(1));
  SideWorkTakesTime() = true;
  EXPECT_THAT(GiveOut(), SizeIs(3));
  EXPECT_EQ(Count("NextJobs 8"), 1U);
  contents.Work(now, Wall());
  EXPECT_THAT(GiveOut(), IsEmpty());

  EndCommit();
  EXPECT_THAT(GiveOut(), SizeIs(4));
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
