// SPDX-License-Identifier: GPL-2.0-or-later
// Files whose bytes the disk does not give.
#include <gmock/gmock.h>
#include <sys/stat.h>
#include <unistd.h>

#include <ctime>

#include "state/layout.h"
#include "tests/unit/index/contents_fixture.h"

namespace fileindexd {

namespace {

constexpr int64_t HOUR = 3600;

class ContentsUnreadTest : public ContentsTest {
 protected:
  void Unread(const std::string& name) {
    ASSERT_TRUE(contents->BeginTries({JobOf(name).file}));
    ASSERT_TRUE(contents->Unread(JobOf(name).file, "cannot be read", clock));
    ASSERT_TRUE(contents->Commit());
  }
  // Waits until the next one is due: for how long.
  int64_t Pass() {
    const int64_t pause = contents->UnreadDue() - clock;
    clock += pause;
    return pause;
  }
};

}  // namespace

TEST_F(ContentsUnreadTest, ItIsListedAndCountedAndHoldsNothingUp) {
  File("a.txt");
  ASSERT_EQ(Jobs(), Names({"a.txt"}));
  Unread("a.txt");

  const std::vector<FailedContent> listed = Listed();
  ASSERT_EQ(listed.size(), 1U);
  EXPECT_EQ(listed[0].reason, "cannot be read");
  EXPECT_EQ(listed[0].tries, 1);
  EXPECT_EQ(Number("SELECT waiting * 10 + failed FROM counts WHERE kind = 1"), 1);
  EXPECT_EQ(Jobs(), Names());
  EXPECT_FALSE(more_jobs);
}

TEST_F(ContentsUnreadTest, ThoseOfOneMomentAreAllTriedAgain) {
  constexpr size_t FILES = 10;  // more than are given out at once
  for (size_t i = 0; i < FILES; ++i) {
    File("f" + std::to_string(i) + ".txt");
  }
  const Names all = Jobs();
  ASSERT_EQ(all.size(), FILES);
  for (const std::string& name : all) {
    Unread(name);
  }
  (void)Pass();

  size_t tried = 0;
  while (tried < FILES) {
    const size_t some = Jobs().size();
    ASSERT_GT(some, 0U);
    tried += some;
    EXPECT_EQ(more_jobs, tried < FILES);
  }
}

TEST_F(ContentsUnreadTest, ThoseThatLostTheirEntriesHoldNoneUpThatIsDue) {
  constexpr size_t FILES = 10;  // more than are given out at once
  for (size_t i = 0; i < FILES; ++i) {
    File("f" + std::to_string(i) + ".txt");
  }
  Names all = Jobs();
  ASSERT_EQ(all.size(), FILES);
  for (const std::string& name : all) {
    Unread(name);
    ++clock;
  }
  clock += HOUR;
  const std::string last = all.back();
  all.pop_back();
  for (const std::string& name : all) {
    ASSERT_EQ(unlink(At(name).c_str()), 0);
    Delete(name);
  }
  Commit();

  Names given = Jobs();
  while (given.empty() && more_jobs) {
    given = Jobs();
  }
  EXPECT_EQ(given, Names({last}));
}

TEST_F(ContentsUnreadTest, AKillDoesNotPutATryOff) {
  File("a.txt");
  ASSERT_EQ(Jobs(), Names({"a.txt"}));
  Unread("a.txt");
  (void)Pass();
  ASSERT_EQ(Jobs(), Names({"a.txt"}));
  ASSERT_TRUE(contents->BeginTries({JobOf("a.txt").file}));

  OpenContents();

  EXPECT_LE(contents->UnreadDue(), clock);
  EXPECT_EQ(Jobs(), Names({"a.txt"}));
}

TEST_F(ContentsUnreadTest, AKillWhileItIsBeingOpenedDoesNotPutATryOffEither) {
  clock = time(nullptr);
  File("a.txt");
  ASSERT_EQ(Jobs(), Names({"a.txt"}));
  Unread("a.txt");
  (void)Pass();
  ASSERT_EQ(Jobs(), Names({"a.txt"}));
  File("b.txt");  // a commit in between

  OpenContents();

  EXPECT_LE(contents->UnreadDue(), clock);
  EXPECT_EQ(NewJobs(), Names({"b.txt"}));
  EXPECT_EQ(Jobs(), Names({"a.txt"}));
}

TEST_F(ContentsUnreadTest, WhatIsWithAHelperHidesNoneThatIsDue) {
  constexpr size_t FILES = 30;  // many times as many as are given out at once
  for (size_t i = 0; i < FILES; ++i) {
    File("f" + std::to_string(i) + ".txt");
  }
  for (const std::string& name : Jobs()) {
    Unread(name);
    ++clock;
  }
  clock += HOUR;

  size_t given = 0;
  for (Names some = Jobs(); !some.empty(); some = Jobs()) {
    EXPECT_LE(some.size(), 4U);
    given += some.size();
    EXPECT_EQ(contents->UnreadDue() <= clock, given < FILES);
  }
  EXPECT_EQ(given, FILES);
  EXPECT_EQ(contents->UnreadDue(), INT64_MAX);
}

TEST_F(ContentsUnreadTest, AfterAWriteThatHidItselfItsPausesGoOnWhateverElseChanges) {
  OldFile("a.txt", 1000);
  TakeIn();
  ASSERT_EQ(Read(), Names({"a.txt"}));
  WriteHidden("a.txt");
  Commit();
  contents->LookAtAll();
  TakeIn();
  ASSERT_EQ(Jobs(), Names({"a.txt"}));
  Unread("a.txt");
  const int64_t due = contents->UnreadDue();

  ASSERT_EQ(chmod(At("a.txt").c_str(), 0640), 0);
  Refresh("a.txt");
  Commit();
  contents->LookAtAll();
  TakeIn();

  EXPECT_EQ(NewJobs(), Names());
  EXPECT_EQ(contents->UnreadDue(), due);
  (void)Pass();
  EXPECT_EQ(Jobs(), Names({"a.txt"}));
}

TEST_F(ContentsUnreadTest, ThePausesGrowToAnHour) {
  File("a.txt");
  ASSERT_EQ(Jobs(), Names({"a.txt"}));
  Unread("a.txt");
  int64_t last = 0;
  for (int tries = 1; tries < 15; ++tries) {
    const int64_t pause = Pass();
    EXPECT_GE(pause, last);
    EXPECT_LE(pause, HOUR);
    last = pause;
    --clock;
    EXPECT_EQ(Jobs(), Names());
    ++clock;
    ASSERT_EQ(NewJobs(), Names());
    ASSERT_EQ(Jobs(), Names({"a.txt"})) << tries;
    Unread("a.txt");
  }

  EXPECT_EQ(last, HOUR);
  EXPECT_EQ(Listed().at(0).tries, 15);
}

TEST_F(ContentsUnreadTest, OnceItIsReadNothingIsLeftOfIt) {
  File("a.txt");
  ASSERT_EQ(Jobs(), Names({"a.txt"}));
  Unread("a.txt");
  Pass();
  ASSERT_EQ(Jobs(), Names({"a.txt"}));

  Finish("a.txt", "words");

  EXPECT_EQ(Holding("words"), 1);
  EXPECT_THAT(Listed(), testing::IsEmpty());
  EXPECT_EQ(Number("SELECT count(*) FROM later"), 0);
  EXPECT_EQ(Number("SELECT tries FROM files"), 0);
}

TEST_F(ContentsUnreadTest, AFileThatChangesIsNewAtOnce) {
  File("a.txt");
  ASSERT_EQ(Jobs(), Names({"a.txt"}));
  Unread("a.txt");

  File("a.txt", "other bytes");

  EXPECT_EQ(NewJobs(), Names({"a.txt"}));
  EXPECT_EQ(Number("SELECT count(*) FROM later"), 0);
}

TEST_F(ContentsUnreadTest, WhoeverAsksHasItTriedAtOnce) {
  File("a.txt");
  ASSERT_EQ(Jobs(), Names({"a.txt"}));
  Unread("a.txt");

  ASSERT_TRUE(contents->RetryFailed());

  EXPECT_EQ(NewJobs(), Names({"a.txt"}));
}

TEST_F(ContentsUnreadTest, ItsTriesAreNoDeaths) {
  File("a.txt");
  ASSERT_EQ(Jobs(), Names({"a.txt"}));
  for (int tries = 0; tries < 3; ++tries) {
    Unread("a.txt");
    Pass();
    ASSERT_EQ(Jobs(), Names({"a.txt"}));
  }

  ASSERT_TRUE(contents->Fail(JobOf("a.txt").file, "killed", {}, true));
  ASSERT_TRUE(contents->Commit());

  EXPECT_EQ(Number("SELECT state FROM files"), 0);
  EXPECT_EQ(Jobs(), Names({"a.txt"}));
}

TEST_F(ContentsUnreadTest, WhatWasReadBeforeIsKeptAndTriedByItsReadersVersion) {
  File("a.txt");
  ASSERT_EQ(Read(), Names({"a.txt"}));
  OpenContents(2);
  ASSERT_EQ(Jobs(), Names({"a.txt"}));
  Unread("a.txt");

  EXPECT_EQ(Holding("a"), 1);
  Pass();
  ASSERT_EQ(Jobs(), Names({"a.txt"}));
  Finish("a.txt", "anew");
  EXPECT_EQ(Holding("anew"), 1);
  EXPECT_EQ(Number("SELECT extractor FROM files"), 2);
}

TEST_F(ContentsUnreadTest, WhatIsGivenBackIsDueAtOnce) {
  File("a.txt");
  ASSERT_EQ(Jobs(), Names({"a.txt"}));
  Unread("a.txt");
  Pass();
  ASSERT_EQ(Jobs(), Names({"a.txt"}));
  EXPECT_GT(contents->UnreadDue(), clock) << "it is with a helper";

  ASSERT_TRUE(contents->Release(JobOf("a.txt").file));

  EXPECT_LE(contents->UnreadDue(), clock);
  EXPECT_EQ(Jobs(), Names({"a.txt"}));
}

TEST_F(ContentsUnreadTest, AnOpeningDoesNotForgetIt) {
  File("a.txt");
  ASSERT_EQ(Jobs(), Names({"a.txt"}));
  Unread("a.txt");
  clock = time(nullptr);

  OpenContents();

  const int64_t opened = time(nullptr);  // or some seconds before
  EXPECT_THAT(Jobs(), Names());
  const int64_t latest = HOUR + opened - clock;
  const int64_t pause = Pass();
  EXPECT_GE(pause, HOUR) << "by a clock that was ahead";
  EXPECT_LE(pause, latest);
  EXPECT_EQ(Jobs(), Names({"a.txt"}));
}

TEST_F(ContentsUnreadTest, DatabasesThatWereMadeBeforeAreCompleted) {
  File("a.txt");
  for (const char* lacking : {"DROP INDEX files_to_read",
                              "DROP INDEX files_to_read; "
                              "DROP TABLE later"}) {
    contents->Close();
    Run("sqlite3 " + ContentsPath("s") + "/contents.db '" + lacking +
        "; CREATE INDEX files_waiting ON files(size) WHERE state = 0'");

    OpenContents();

    EXPECT_EQ(Number("SELECT count(*) FROM later"), 0) << lacking;
    EXPECT_EQ(Number("SELECT count(*) FROM sqlite_master WHERE name = 'files_waiting'"), 0);
    EXPECT_EQ(Number("SELECT count(*) FROM sqlite_master WHERE name = 'files_to_read'"), 1);
    EXPECT_EQ(Number("SELECT waiting FROM counts WHERE kind = 1"), 1);
    EXPECT_EQ(Jobs(), Names({"a.txt"}));
  }
}

}  // namespace fileindexd
