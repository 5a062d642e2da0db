// SPDX-License-Identifier: GPL-2.0-or-later
// Files without an entry, for good or for a while.
#include <unistd.h>

#include <cstdio>

#include "tests/unit/index/contents_fixture.h"

namespace fileindexd {

namespace {

constexpr int64_t NOW = 2'000'000'000;
constexpr int64_t DAY = 86400;

class ContentsAwayTest : public ContentsTest {
 protected:
  // While another one, and all that there is, is read anew.
  void BeAwayMeanwhile(const std::string& name) {
    ReadOldFile(name, 3000);
    ReadOldFile("other.txt", 2000);
    TakeAway(name);
    contents->LookAtAll();
    TakeIn();
    Sweep(clock);
    OpenContents(2);
    ASSERT_EQ(Read(), Names({"other.txt"}));
    ASSERT_EQ(Jobs(), Names());
    ASSERT_TRUE(contents->Commit());
    ASSERT_EQ(Number("SELECT extractor FROM meta"), 2);
  }
  // Out of the share, and into it.
  void TakeAway(const std::string& name) {
    ASSERT_EQ(rename(At(name).c_str(), (root + "/../" + name).c_str()), 0);
    Delete(name);
    Commit();
  }
  void BringBack(const std::string& name) {
    ASSERT_EQ(rename((root + "/../" + name).c_str(), At(name).c_str()), 0);
    Add(name);
    Commit();
  }
};

}  // namespace

TEST_F(ContentsAwayTest, WhatNoEntryRefersToIsSweptAfterADay) {
  File("a.txt");
  File("b.txt");
  Read();
  ASSERT_EQ(unlink(At("a.txt").c_str()), 0);
  Delete("a.txt");
  Commit();

  contents->LookAtAll();
  TakeIn();
  Sweep(NOW);
  EXPECT_EQ(Number("SELECT count(*) FROM files"), 2);
  Sweep(NOW + DAY - 1);
  EXPECT_EQ(Number("SELECT count(*) FROM files"), 2);
  Sweep(NOW + DAY);

  EXPECT_EQ(Number("SELECT count(*) FROM files"), 1);
  EXPECT_EQ(Number("SELECT count(*) FROM texts"), 1);
  EXPECT_EQ(Holding("b"), 1);
  EXPECT_EQ(Number("SELECT sum(done) FROM counts"), 1);
}

TEST_F(ContentsAwayTest, WhatComesBackWithinADayIsKept) {
  File("a.txt");
  Read();
  ASSERT_EQ(rename(At("a.txt").c_str(), (folder + "/aside").c_str()), 0);
  Delete("a.txt");
  Commit();
  contents->LookAtAll();
  TakeIn();
  Sweep(NOW);

  ASSERT_EQ(rename((folder + "/aside").c_str(), At("b.txt").c_str()), 0);
  Add("b.txt");
  Commit();
  TakeIn();
  Sweep(NOW + 2 * DAY);

  EXPECT_EQ(Jobs(), Names());
  EXPECT_EQ(Number("SELECT count(*) FROM files WHERE state = 1"), 1);
}

TEST_F(ContentsAwayTest, PassesThatWereUndoneBeginAnew) {
  File("a.txt");
  Read();
  ASSERT_EQ(unlink(At("a.txt").c_str()), 0);
  Delete("a.txt");
  Commit();
  contents->LookAtAll();
  bool more = false;
  ASSERT_TRUE(contents->TakeIn(100, more));
  ASSERT_TRUE(contents->Sweep(NOW, 100, more));

  contents->Close();  // nothing of it is on disk
  ASSERT_EQ(contents->Open(TheShare(), 1), IndexError::NONE);
  TakeIn();
  Sweep(NOW);

  EXPECT_EQ(Number("SELECT unreferred_since FROM files"), NOW);
}

// Entries may be made anew just now: what was read stays until they are there again.
TEST_F(ContentsAwayTest, WithoutAnEntryItIsKeptAndWaitsForOne) {
  ReadOldFile("a.txt", 3000);
  ReadOldFile("b.txt", 2000);
  OpenContents(2);
  TakeAway("a.txt");

  EXPECT_EQ(Read(), Names({"b.txt"}));
  EXPECT_EQ(Jobs(), Names());
  ASSERT_TRUE(contents->Commit());
  EXPECT_EQ(Holding("olda"), 1);
  EXPECT_EQ(Number("SELECT waiting FROM counts WHERE kind = 1"), 0);

  BringBack("a.txt");
  TakeIn();
  EXPECT_EQ(Jobs(), Names({"a.txt"}));
}

TEST_F(ContentsAwayTest, WhatLosesItsEntryWhileItWaitsIsKeptAndWaitsForAnother) {
  ReadOldFile("a.txt", 3000);
  ReadOldFile("b.txt", 2000);
  OpenContents(2);
  ASSERT_EQ(Jobs(1), Names({"a.txt"}));
  ASSERT_TRUE(contents->Commit());
  ASSERT_EQ(Number("SELECT waiting FROM counts WHERE kind = 1"), 2);
  TakeAway("b.txt");

  EXPECT_EQ(Jobs(), Names());
  ASSERT_TRUE(contents->Commit());
  EXPECT_EQ(Holding("oldb"), 1);
  EXPECT_EQ(Number("SELECT waiting FROM counts WHERE kind = 1"), 1);

  BringBack("b.txt");
  TakeIn();
  EXPECT_EQ(Jobs(), Names({"b.txt"}));
  Finish("b.txt", "anew");
  EXPECT_EQ(Number("SELECT count(*) FROM files"), 2);
}

TEST_F(ContentsAwayTest, WhatTheDiskDoesNotGiveIsKeptWithoutAnEntryToo) {
  ReadOldFile("a.txt", 3000);
  OpenContents(2);
  ASSERT_EQ(Jobs(), Names({"a.txt"}));
  ASSERT_TRUE(contents->Unread(JobOf("a.txt").file, "cannot be read", clock));
  ASSERT_TRUE(contents->Commit());
  TakeAway("a.txt");
  clock = contents->UnreadDue();

  EXPECT_EQ(Jobs(), Names());
  ASSERT_TRUE(contents->Commit());
  EXPECT_EQ(Holding("olda"), 1);
  EXPECT_EQ(contents->UnreadDue(), INT64_MAX);
  EXPECT_EQ(Number("SELECT count(*) FROM files WHERE reason <> ''"), 0) << "it is done";

  BringBack("a.txt");
  TakeIn();
  EXPECT_EQ(Jobs(), Names({"a.txt"}));
}

TEST_F(ContentsAwayTest, WhatWasAwayWhileAllElseWasReadAnewIsReadWhenItIsBack) {
  BeAwayMeanwhile("a.txt");
  BringBack("a.txt");

  TakeIn();

  EXPECT_EQ(Holding("olda"), 1);
  EXPECT_EQ(Read(), Names({"a.txt"}));
  EXPECT_EQ(Jobs(), Names());
}

TEST_F(ContentsAwayTest, SoItIsWhoeverSeesFirstThatItIsBack) {
  BeAwayMeanwhile("a.txt");
  BringBack("a.txt");
  contents->LookAtAll();

  Sweep(clock);
  TakeIn();

  EXPECT_EQ(Read(), Names({"a.txt"}));
}

}  // namespace fileindexd
