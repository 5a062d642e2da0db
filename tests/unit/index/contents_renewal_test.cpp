// SPDX-License-Identifier: GPL-2.0-or-later
// What older readers read well is read anew by newer ones, behind all else.
#include <gmock/gmock.h>

#include "index/contents_schema.h"
#include "index/contents_table.h"
#include "state/layout.h"
#include "state/sqlite.h"
#include "tests/unit/index/contents_fixture.h"

namespace fileindexd {

namespace {

class ContentsRenewalTest : public ContentsTest {
 protected:
  void BeginAndDie(const std::string& name, int64_t extractor) {
    ASSERT_TRUE(contents->BeginTries({JobOf(name).file}));
    OpenContents(extractor);
  }
};

}  // namespace

TEST_F(ContentsRenewalTest, NewestAndSmallestComeFirstBehindAllThatWaits) {
  ReadOldFile("big.txt", 3000, "many bytes");
  ReadOldFile("old.txt", 1000);
  ReadOldFile("small.txt", 3000, "few");
  OldFile("failed.txt", 500);
  TakeIn();
  Jobs();
  ASSERT_TRUE(contents->Fail(JobOf("failed.txt").file, "damaged", {}, false));
  ASSERT_TRUE(contents->Commit());

  OpenContents(2);
  OldFile("new.txt", 100);
  TakeIn();

  EXPECT_EQ(Jobs(1), Names({"new.txt"}));
  EXPECT_EQ(Jobs(), Names({"small.txt", "big.txt", "old.txt", "failed.txt"}));
}

TEST_F(ContentsRenewalTest, WhatComesMeanwhileIsHandedOutByItself) {
  constexpr int FILES = 100;
  for (int i = 0; i < FILES; ++i) {
    OldFile("f" + std::to_string(i) + ".txt", 60 * (i + 100));
  }
  TakeIn();
  ASSERT_EQ(Read().size(), 100U);
  OpenContents(2);
  ASSERT_EQ(Jobs(1).size(), 1U);
  EXPECT_TRUE(more_jobs);

  OldFile("new.txt", 60);
  TakeIn();

  EXPECT_EQ(NewJobs(64), Names({"new.txt"}));
}

TEST_F(ContentsRenewalTest, OldTextIsFoundUntilTheNewOneIsThere) {
  ReadOldFile("a.txt", 3000);
  OpenContents(2);
  ASSERT_EQ(Jobs(), Names({"a.txt"}));
  ASSERT_TRUE(contents->BeginTries({JobOf("a.txt").file}));
  EXPECT_EQ(Holding("olda"), 1);
  EXPECT_EQ(Number("SELECT done * 10 + waiting FROM counts WHERE kind = 1"), 1);

  Finish("a.txt", "anew");

  EXPECT_EQ(Holding("olda"), 0);
  EXPECT_EQ(Holding("anew"), 1);
  EXPECT_EQ(Number("SELECT done * 10 + waiting FROM counts WHERE kind = 1"), 10);
}

TEST_F(ContentsRenewalTest, NothingIsReadTwiceForOneVersion) {
  ReadOldFile("a.txt", 3000);
  OpenContents(2);
  EXPECT_EQ(Read(), Names({"a.txt"}));

  EXPECT_EQ(Jobs(), Names());
  OpenContents(2);
  EXPECT_EQ(Jobs(), Names());
  OpenContents(1);
  EXPECT_EQ(Jobs(), Names()) << "older readers";
  OpenContents(3);
  EXPECT_EQ(Jobs(), Names({"a.txt"}));
}

TEST_F(ContentsRenewalTest, WhatWasNotRenewedBeforeARestartIsAfterwards) {
  ReadOldFile("a.txt", 3000);
  ReadOldFile("b.txt", 2000);
  OpenContents(2);
  ASSERT_EQ(Jobs(1), Names({"a.txt"}));
  Finish("a.txt", "anew");

  OpenContents(2);
  EXPECT_EQ(Jobs(), Names({"b.txt"}));
  OpenContents(3);
  EXPECT_THAT(Jobs(), testing::UnorderedElementsAre("a.txt", "b.txt"));
}

TEST_F(ContentsRenewalTest, AFailureIsNamedOnceAndTakesNothingAway) {
  ReadOldFile("a.txt", 3000);
  OpenContents(2);
  ASSERT_EQ(Jobs(), Names({"a.txt"}));
  ASSERT_TRUE(contents->Fail(JobOf("a.txt").file, "damaged", {}, false));
  ASSERT_TRUE(contents->Commit());

  EXPECT_EQ(Number("SELECT state FROM files"), 2);
  EXPECT_EQ(Number("SELECT reason = 'damaged' FROM files"), 1);
  EXPECT_EQ(Holding("olda"), 1);
  EXPECT_EQ(Jobs(), Names());
  OpenContents(2);
  EXPECT_EQ(Jobs(), Names());
}

TEST_F(ContentsRenewalTest, SecondDeathIsTheLast) {
  ReadOldFile("a.txt", 3000);
  OpenContents(2);
  for (int death = 0; death < 2; ++death) {
    ASSERT_EQ(Jobs(), Names({"a.txt"})) << death;
    ASSERT_TRUE(contents->Fail(JobOf("a.txt").file, "killed", {}, true));
    ASSERT_TRUE(contents->Commit());
  }

  EXPECT_EQ(Jobs(), Names());
  EXPECT_EQ(Number("SELECT state FROM files"), 3);
  EXPECT_EQ(Holding("olda"), 1);
}

TEST_F(ContentsRenewalTest, WhoEndsTheServiceAloneFiveTimesIsLeftAlone) {
  ReadOldFile("a.txt", 3000);
  OpenContents(2);
  for (int death = 0; death < 5; ++death) {
    ASSERT_EQ(Jobs(), Names({"a.txt"})) << death;
    BeginAndDie("a.txt", 2);
  }

  EXPECT_EQ(Jobs(), Names());
  EXPECT_EQ(Number("SELECT state FROM files"), 3);
  EXPECT_EQ(Holding("olda"), 1);
}

TEST_F(ContentsRenewalTest, FailuresThatFollowTakeNothingAwayEither) {
  ReadOldFile("a.txt", 3000);
  for (int64_t version = 2; version < 4; ++version) {
    OpenContents(version);
    ASSERT_EQ(Jobs(), Names({"a.txt"}));
    ASSERT_TRUE(contents->Fail(JobOf("a.txt").file, "damaged", {}, false));
    ASSERT_TRUE(contents->Commit());
  }
  ASSERT_TRUE(contents->RetryFailed());
  ASSERT_EQ(Jobs(), Names({"a.txt"}));
  ASSERT_TRUE(contents->Fail(JobOf("a.txt").file, "damaged", {}, false));
  ASSERT_TRUE(contents->Commit());

  EXPECT_EQ(Number("SELECT state FROM files"), 2);
  EXPECT_EQ(Holding("olda"), 1);
}

TEST_F(ContentsRenewalTest, WhatWasWrittenToLosesItsOldTextWithTheFailure) {
  ReadOldFile("a.txt", 3000);
  WriteFile(At("a.txt"), "bytea");
  SetTime(At("a.txt"), 3000);
  Add("a.txt");
  Commit();
  contents->LookAtAll();
  TakeIn();
  ASSERT_EQ(Jobs(), Names({"a.txt"}));
  ASSERT_TRUE(contents->Fail(JobOf("a.txt").file, "damaged", {}, false));
  ASSERT_TRUE(contents->Commit());

  EXPECT_EQ(Holding("olda"), 0);
}

TEST_F(ContentsRenewalTest, WhatWasUndoneIsRenewedAllTheSame) {
  ReadOldFile("a.txt", 3000);
  OpenContents(2);
  ASSERT_EQ(Jobs(), Names({"a.txt"}));
  contents->Close();  // nothing of that was committed
  ASSERT_EQ(contents->Open(TheShare(), 2), IndexError::NONE);

  EXPECT_EQ(Jobs(), Names({"a.txt"}));
}

TEST_F(ContentsRenewalTest, AFailureTakesNoNumbersAway) {
  OldFile("a.jpg", 3000);
  TakeIn();
  ASSERT_EQ(Jobs(), Names({"a.jpg"}));
  Content found;
  found.kind = Kind::PHOTO;
  found.numbers = {{ContentField::WIDTH, 640}};
  found.sample = 7;
  ASSERT_TRUE(contents->Finish(JobOf("a.jpg").file, found));
  ASSERT_TRUE(contents->Commit());
  ASSERT_EQ(Number("SELECT text FROM files"), 0);

  Content part;
  part.kind = Kind::PHOTO;
  OpenContents(2);
  ASSERT_EQ(Jobs(), Names({"a.jpg"}));
  ASSERT_TRUE(contents->Fail(JobOf("a.jpg").file, "damaged", part, false));
  ASSERT_TRUE(contents->RetryFailed());
  for (int death = 0; death < 2; ++death) {
    ASSERT_EQ(Jobs(), Names({"a.jpg"}));
    ASSERT_TRUE(contents->Fail(JobOf("a.jpg").file, "killed", {}, true));
  }
  ASSERT_TRUE(contents->Commit());

  EXPECT_EQ(Number("SELECT state FROM files"), 3);
  EXPECT_EQ(Number("SELECT width FROM files"), 640);
  EXPECT_EQ(Number("SELECT sample FROM files"), 7);
  EXPECT_EQ(Number("SELECT found_kind FROM files"), static_cast<int64_t>(Kind::PHOTO));
}

TEST_F(ContentsRenewalTest, WhereNothingWasKnownPartIsKept) {
  OldFile("a.txt", 3000);
  TakeIn();
  for (int64_t version = 1; version < 3; ++version) {
    OpenContents(version);
    ASSERT_EQ(Jobs(), Names({"a.txt"}));
    const Content found = version == 1 ? Content() : TextContent("half");
    ASSERT_TRUE(contents->Fail(JobOf("a.txt").file, "damaged", found, false));
    ASSERT_TRUE(contents->Commit());
  }

  EXPECT_EQ(Holding("half"), 1);
}

TEST_F(ContentsRenewalTest, AFileThatChangedMeanwhileWaitsAsEver) {
  ReadOldFile("a.txt", 3000);
  OpenContents(2);
  ASSERT_EQ(Jobs(), Names({"a.txt"}));
  const int64_t file = JobOf("a.txt").file;
  OldFile("a.txt", 4000, "other bytes");
  TakeIn();
  ASSERT_TRUE(contents->Finish(file, TextContent("stale")));
  ASSERT_TRUE(contents->Commit());

  EXPECT_EQ(Holding("stale"), 0);
  EXPECT_EQ(Number("SELECT state FROM files"), 0);
  EXPECT_EQ(Jobs(), Names({"a.txt"}));
}

// However much waits that older readers read, what is new is found without looking at it.
TEST_F(ContentsRenewalTest, WhatWaitsIsFoundByAnIndexInItsOrder) {
  ASSERT_TRUE(contents->Commit());
  IndexDatabase database;
  ASSERT_EQ(database.OpenForWriting(ContentsPath("s"), false, CONTENTS_FORM), IndexError::NONE);
  ContentsTable table;
  ASSERT_EQ(table.Prepare(database.db), SQLITE_OK);

  int looked = 0;
  for (sqlite3_stmt* one = nullptr; (one = sqlite3_next_stmt(database.db, one)) != nullptr;) {
    const std::string sql = sqlite3_sql(one);
    if (sql.find("state = 0") == std::string::npos) {
      continue;
    }
    ++looked;
    Statement plan;
    ASSERT_EQ(plan.Prepare(database.db, ("EXPLAIN QUERY PLAN " + sql).c_str()), SQLITE_OK);
    ASSERT_EQ(plan.ReadAll([&] {
      EXPECT_THAT(plan.Bytes(3), testing::Not(testing::HasSubstr("SCAN"))) << sql;
      EXPECT_THAT(plan.Bytes(3), testing::Not(testing::HasSubstr("TEMP B-TREE"))) << sql;
    }),
              SQLITE_OK);
  }
  EXPECT_EQ(looked, 2);
}

TEST_F(ContentsRenewalTest, WhatTheseReadersFailedAtAndIsTriedOnceMoreStandsAmongWhatIsNew) {
  OldFile("failed.txt", 3000);
  TakeIn();
  ASSERT_EQ(Jobs(), Names({"failed.txt"}));
  ASSERT_TRUE(contents->Fail(JobOf("failed.txt").file, "damaged", {}, false));
  ASSERT_TRUE(contents->RetryFailed());
  OldFile("older.txt", 2000);
  OldFile("newer.txt", 4000);
  TakeIn();

  EXPECT_EQ(NewJobs(), Names({"newer.txt", "failed.txt", "older.txt"}));
}

TEST_F(ContentsRenewalTest, ManyAreReadInBatchesToTheEnd) {
  constexpr int FILES = 150;
  for (int i = 0; i < FILES; ++i) {
    OldFile("f" + std::to_string(i) + ".txt", 60 * (i + 1));
  }
  TakeIn();
  ASSERT_EQ(Read().size(), 100U);
  ASSERT_EQ(Read().size(), 50U);
  OpenContents(2);

  ASSERT_EQ(Read().size(), 100U);
  EXPECT_EQ(Read().size(), 50U);
  EXPECT_EQ(Jobs(), Names());
}

}  // namespace fileindexd
