// SPDX-License-Identifier: GPL-2.0-or-later
// What entries say: what is read, what is not read twice, and what goes.
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdio>
#include <set>
#include <string>

#include "index/contents_writer.h"
#include "state/layout.h"
#include "tests/unit/index/contents_fixture.h"

namespace fileindexd {

class ContentsIntakeTest : public ContentsTest {
 protected:
  // The kinds that the administrator wants from now on.
  void Want(const ContentFlags& flags) {
    ASSERT_TRUE(store->SetFolder(root, flags));
    UseSettings();
    contents->LookAtAll();
    TakeIn();
  }
};

TEST_F(ContentsIntakeTest, RenameMoveLinkAndRebuildCostNoReading) {
  File("a.txt");
  MakeFolder(At("d"));
  Add("d");
  ASSERT_EQ(Read(), Names({"a.txt"}));

  ASSERT_EQ(rename(At("a.txt").c_str(), At("b.txt").c_str()), 0);
  Add("b.txt");
  Delete("a.txt");
  Commit();
  TakeIn();
  EXPECT_EQ(Jobs(), Names()) << "renamed";

  ASSERT_EQ(rename(At("b.txt").c_str(), At("d/c.txt").c_str()), 0);
  Delete("b.txt");
  Commit();
  TakeIn();
  Add("d/c.txt");
  Commit();
  TakeIn();
  EXPECT_EQ(Jobs(), Names()) << "moved";

  ASSERT_EQ(link(At("d/c.txt").c_str(), At("e.txt").c_str()), 0);
  Add("e.txt");
  Commit();
  TakeIn();
  Add("d/c.txt");
  Commit();
  TakeIn();
  EXPECT_EQ(Jobs(), Names()) << "linked";

  writer.reset();
  RemoveTree(IndexPath("s"));
  WantRebuild();
  OpenWriter();
  AddAll();
  TakeIn();
  EXPECT_EQ(Jobs(), Names()) << "rebuilt";
  EXPECT_EQ(Number("SELECT count(*) FROM files WHERE state = 1"), 1);
}

TEST_F(ContentsIntakeTest, LinkThatIsTakenAwayCostsNoReading) {
  OldFile("a.txt", 1000);
  MakeFolder(At("d"));
  for (const char* name : {"b.txt", "d/c.txt"}) {
    ASSERT_EQ(link(At("a.txt").c_str(), At(name).c_str()), 0);
  }
  AddAll();
  TakeIn();
  ASSERT_EQ(Read().size(), 1U);

  for (const char* name : {"b.txt", "d"}) {
    RemoveTree(At(name));
    Delete(name);
    Commit();
    TakeIn();
    AddAll();
    TakeIn();
    EXPECT_EQ(Jobs(), Names()) << name;
  }
}

TEST_F(ContentsIntakeTest, ChangedFileIsReadAnewAndItsOldContentIsGone) {
  File("a.txt");
  Jobs();
  Finish("a.txt", "first");

  File("a.txt", "other bytes");
  EXPECT_EQ(Holding("first"), 0);
  EXPECT_EQ(Jobs(), Names({"a.txt"}));
  Finish("a.txt", "second");

  EXPECT_EQ(Holding("second"), 1);
  EXPECT_EQ(Number("SELECT count(*) FROM files"), 1);
  EXPECT_EQ(Number("SELECT count(*) FROM texts"), 1);
}

TEST_F(ContentsIntakeTest, AddWithAnotherChangeTimeReadsAnewAnUpdateOnlyStoresIt) {
  OldFile("a.txt", 1000);
  TakeIn();
  ASSERT_EQ(Read(), Names({"a.txt"}));

  ASSERT_EQ(chmod(At("a.txt").c_str(), 0640), 0);
  Refresh("a.txt");
  Commit();
  TakeIn();
  EXPECT_EQ(Jobs(), Names()) << "updated";

  WriteHidden("a.txt");
  Commit();
  contents->LookAtAll();
  TakeIn();
  EXPECT_EQ(Jobs(), Names({"a.txt"})) << "added";
  EXPECT_EQ(Holding("txt"), 1) << "until it is read, what was read stays";
  Finish("a.txt", "anew");

  contents->LookAtAll();
  TakeIn();
  EXPECT_EQ(Jobs(), Names());
  EXPECT_EQ(Holding("txt"), 0);
}

TEST_F(ContentsIntakeTest, WriteThatIsHiddenBehindAChangeOfModeIsReadAnew) {
  OldFile("a.txt", 1000);
  TakeIn();
  ASSERT_EQ(Read(), Names({"a.txt"}));

  WriteHidden("a.txt");
  Commit();
  ASSERT_EQ(chmod(At("a.txt").c_str(), 0640), 0);
  Refresh("a.txt");
  Commit();
  contents->LookAtAll();
  TakeIn();

  EXPECT_EQ(Jobs(), Names({"a.txt"}));
}

TEST_F(ContentsIntakeTest, WriteWhoseTimeIsSetBackBeforeAnybodyLooksIsReadAnew) {
  OldFile("a.txt", 1000);
  TakeIn();
  ASSERT_EQ(Read(), Names({"a.txt"}));

  WriteFile(At("a.txt"), "bytea");
  Add("a.txt");
  Commit();
  SetTime(At("a.txt"), 1000);
  Refresh("a.txt");
  Commit();
  TakeIn();

  EXPECT_EQ(Jobs(), Names({"a.txt"}));
}

TEST_F(ContentsIntakeTest, WriteIsReadOnceWhateverComesAfterwards) {
  File("a.txt");
  ASSERT_EQ(link(At("a.txt").c_str(), At("b.txt").c_str()), 0);
  File("b.txt", "of either name");
  Add("a.txt");
  Commit();
  TakeIn();
  ASSERT_EQ(Read().size(), 1U);
  const auto nothing_is_left = [this](const char* after) {
    Commit();
    TakeIn();
    contents->LookAtAll();
    TakeIn();
    EXPECT_EQ(Jobs(), Names()) << after;
  };

  ASSERT_EQ(chmod(At("a.txt").c_str(), 0640), 0);
  Refresh("a.txt");
  nothing_is_left("another mode");
  ASSERT_EQ(rename(At("a.txt").c_str(), At("c.txt").c_str()), 0);
  Delete("a.txt");
  Add("c.txt");
  nothing_is_left("another name");
  AddAll();
  nothing_is_left("a reindex");
}

// More rows than one slice takes, of which each tells of a write: none is missed.
TEST_F(ContentsIntakeTest, WritesAreSeenWhateverSliceTheyFallInto) {
  constexpr int FILES = 10;
  Names names;
  for (int i = 0; i < FILES; ++i) {
    names.push_back("f" + std::to_string(i) + ".txt");
    OldFile(names.back(), 1000);
  }
  TakeIn();
  ASSERT_EQ(Read().size(), names.size());
  for (const std::string& name : names) {
    WriteHidden(name);
  }
  for (const std::string& name : names) {
    ASSERT_EQ(chmod(At(name).c_str(), 0640), 0);
    Refresh(name);
  }
  Commit();

  TakeIn();

  EXPECT_EQ(Read().size(), names.size());
}

TEST_F(ContentsIntakeTest, WhatEntriesDidWhileNobodyFollowedIsTakenIn) {
  File("a.txt");
  Read();
  contents.reset();
  OldFile("b.txt", 1000);

  OpenContents();
  TakeIn();
  EXPECT_EQ(Jobs(), Names({"b.txt"}));
}

TEST_F(ContentsIntakeTest, OutcomeForOldBytesIsThrownAway) {
  File("a.txt");
  Jobs();
  File("a.txt", "other bytes");

  Finish("a.txt", "first");

  EXPECT_EQ(Holding("first"), 0);
  EXPECT_EQ(Jobs(), Names({"a.txt"}));
}

TEST_F(ContentsIntakeTest, KindThatIsSwitchedOffIsDroppedAtOnce) {
  File("a.txt");
  File("b.mp3");
  AddAll();
  Read();
  ASSERT_EQ(Number("SELECT count(*) FROM texts"), 2);

  wanted.document = false;
  ASSERT_TRUE(store->SetFolder(root, wanted));
  EXPECT_TRUE(writer->Refresh(At("a.txt"), wanted, {.document = true}));
  Commit();
  TakeIn();

  EXPECT_EQ(Number("SELECT count(*) FROM files"), 1);
  EXPECT_EQ(Number("SELECT count(*) FROM texts"), 1);
  EXPECT_EQ(Holding("mp3"), 1);
  EXPECT_EQ(Differences(), Names()) << "for all others the entry is one that is not wanted";
}

TEST_F(ContentsIntakeTest, SwitchedOffKindIsDroppedThoughItsFileChangedBefore) {
  File("a.txt");
  Read();
  WriteFile(At("a.txt"), "other bytes");
  wanted.document = false;
  ASSERT_TRUE(store->SetFolder(root, wanted));
  EXPECT_TRUE(writer->Refresh(At("a.txt"), wanted, {.document = true}));
  Commit();

  TakeIn();

  EXPECT_EQ(Number("SELECT count(*) FROM files"), 0);
  EXPECT_EQ(Number("SELECT count(*) FROM texts"), 0);
}

TEST_F(ContentsIntakeTest, WhatIsFoundToBeOfAnUnwantedKindIsNotKept) {
  File("plain");
  Want({false, true, true, true});
  ASSERT_EQ(Read(), Names({"plain"}));
  EXPECT_EQ(Number("SELECT count(*) FROM texts"), 0);
  EXPECT_EQ(Number("SELECT found_kind FROM files"), 1);
  EXPECT_EQ(Jobs(), Names());

  Want({true, true, true, true});
  EXPECT_EQ(Read(), Names({"plain"}));
  EXPECT_EQ(Holding("plain"), 1);
  Want({true, false, false, false});
  EXPECT_EQ(Jobs(), Names());

  Want({false, true, true, true});
  EXPECT_EQ(Holding("plain"), 0);
  EXPECT_EQ(Number("SELECT count(*) FROM texts"), 0);
  EXPECT_EQ(Jobs(), Names());
}

TEST_F(ContentsIntakeTest, PartOfAnUnwantedKindIsNotKeptEither) {
  File("plain");
  Want({false, true, true, true});
  Jobs();
  ASSERT_TRUE(contents->Fail(JobOf("plain").file, "damaged", TextContent("half"), false));
  ASSERT_TRUE(contents->Commit());
  EXPECT_EQ(Number("SELECT count(*) FROM texts"), 0);

  Want({true, true, true, true});
  ASSERT_EQ(Jobs(), Names({"plain"})) << "wanted by now";
  ASSERT_TRUE(contents->Fail(JobOf("plain").file, "damaged", TextContent("half"), false));
  ASSERT_TRUE(contents->Commit());
  EXPECT_EQ(Holding("half"), 1);

  Want({false, true, true, true});
  EXPECT_EQ(Holding("half"), 0);
  EXPECT_EQ(Number("SELECT count(*) FROM texts"), 0);
  EXPECT_EQ(Jobs(), Names());
}

TEST_F(ContentsIntakeTest, ABacklogOfMoreThanOneSliceIsTakenInAndHandedOutOnce) {
  constexpr size_t FILES = 1500;
  constexpr size_t SLICE = 1000;
  for (size_t file = 0; file < FILES; ++file) {
    const std::string name = "f" + std::to_string(file) + ".txt";
    WriteFile(At(name), "bytes");
    Add(name);
  }
  Commit();
  contents->LookAtAll();

  int taken = 0;
  for (bool more = true; more; ++taken) {
    ASSERT_TRUE(contents->TakeIn(SLICE, more)) << IndexErrorText(contents->Error());
  }
  ASSERT_TRUE(contents->Commit());
  EXPECT_GE(taken, 2);
  EXPECT_EQ(Number("SELECT waiting FROM counts WHERE kind = 1"), static_cast<int64_t>(FILES));

  std::set<std::string> seen;
  for (more_jobs = true; more_jobs;) {
    for (const std::string& name : Jobs(64)) {
      EXPECT_TRUE(seen.insert(name).second) << name;
    }
  }
  EXPECT_EQ(seen.size(), FILES);
}

}  // namespace fileindexd
