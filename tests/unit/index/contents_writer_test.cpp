// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/contents_writer.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <functional>
#include <utility>

#include "base/scoped_fd.h"
#include "index/schema.h"
#include "index/suspicion.h"
#include "state/layout.h"
#include "state/sqlite.h"
#include "tests/unit/index/contents_fixture.h"

namespace fileindexd {

namespace {

constexpr int64_t NOW = 2'000'000'000;

}  // namespace

class ContentsWriterTest : public ContentsTest {
 protected:
  // Whether the entries' writer was told of damage since it was last asked.
  static bool TakeNote() { return remove((IndexPath("s") + "/" + SUSPICION_NOTE).c_str()) == 0; }

  // Writes over the first page of each of these tables or indexes of the entries.
  void DamageEntries(const std::vector<std::string>& names) {
    const std::string path = IndexPath("s") + "/entries.db";
    std::vector<int64_t> pages;
    {
      IndexDatabase database;
      ASSERT_EQ(database.OpenForWriting(IndexPath("s"), false), IndexError::NONE);
      Statement page;
      ASSERT_EQ(page.Prepare(database.db, "SELECT rootpage FROM sqlite_schema WHERE name = ?1"),
                SQLITE_OK);
      for (const std::string& name : names) {
        page.BindText(1, name);
        ASSERT_EQ(page.Step(), SQLITE_ROW) << name;
        pages.push_back(page.Int(0));
        page.Reset();
      }
      ASSERT_EQ(sqlite3_wal_checkpoint_v2(database.db, nullptr, SQLITE_CHECKPOINT_TRUNCATE, nullptr,
                                          nullptr),
                SQLITE_OK);
    }
    const ScopedFd file(open(path.c_str(), O_WRONLY | O_CLOEXEC));
    const std::string garbage(4096, 'x');
    for (const int64_t page : pages) {
      ASSERT_EQ(pwrite(file.fd, garbage.data(), garbage.size(), (page - 1) * 4096), 4096);
    }
  }
};

TEST_F(ContentsWriterTest, WantedFilesWaitNewestAndSmallestFirst) {
  OldFile("old.txt", 1000);
  OldFile("new big.txt", 3000, "many bytes");
  OldFile("new small.txt", 3000, "few");
  MakeFolder(At("d.txt"));
  Add("d.txt");
  Commit();
  TakeIn();

  EXPECT_EQ(Jobs(2), Names({"new small.txt", "new big.txt"}));
  EXPECT_EQ(Jobs(), Names({"old.txt"}));
  EXPECT_EQ(Jobs(), Names());
  EXPECT_EQ(Number("SELECT sum(waiting) FROM counts"), 3);
}

// Within a minute the size counts.
TEST_F(ContentsWriterTest, SmallerFilesOfTheSameMinuteComeFirst) {
  OldFile("big.txt", 6030, "many bytes");
  OldFile("small.txt", 6000, "few");
  TakeIn();

  EXPECT_EQ(Jobs(), Names({"small.txt", "big.txt"}));
}

TEST_F(ContentsWriterTest, ContentIsStoredOnce) {
  File("a.txt");

  EXPECT_EQ(Read(), Names({"a.txt"}));
  EXPECT_EQ(Read(), Names());

  EXPECT_EQ(Holding("txt"), 1);
  EXPECT_EQ(Number("SELECT done FROM counts WHERE kind = 1"), 1);
  EXPECT_EQ(Number("SELECT sum(waiting) FROM counts"), 0);
  EXPECT_EQ(Number("SELECT sum(done) FROM rate"), 1);
}

TEST_F(ContentsWriterTest, WaitingFileWithoutAnEntryIsNotHandedOut) {
  File("a.txt");
  ASSERT_EQ(unlink(At("a.txt").c_str()), 0);
  Delete("a.txt");
  Commit();

  EXPECT_EQ(Jobs(), Names());
  EXPECT_TRUE(contents->Commit());
  EXPECT_EQ(Number("SELECT count(*) FROM files"), 0);
  EXPECT_EQ(Number("SELECT sum(waiting) FROM counts"), 0);
}

TEST_F(ContentsWriterTest, BehindManyFilesWithoutAnEntryOthersAreFound) {
  constexpr int GONE = 1100;
  for (int i = 0; i < GONE; ++i) {
    WriteFile(At("gone" + std::to_string(i) + ".txt"), "bytes");
  }
  OldFile("a.txt", 1000);
  AddAll();
  TakeIn();
  for (int i = 0; i < GONE; ++i) {
    ASSERT_EQ(unlink(At("gone" + std::to_string(i) + ".txt").c_str()), 0);
    Delete("gone" + std::to_string(i) + ".txt");
  }
  Commit();

  Names found;
  for (int round = 0; found.empty() && round < 10; ++round) {
    found = Jobs(4);
    EXPECT_TRUE(!found.empty() || more_jobs) << round;
  }
  EXPECT_EQ(found, Names({"a.txt"}));
}

TEST_F(ContentsWriterTest, RemovalsOfMuchTextAreSpreadOverTransactions) {
  constexpr int FILES = 12;
  std::string text;
  while (text.size() < 1 << 20) {
    text += "word ";
  }
  for (int i = 0; i < FILES; ++i) {
    OldFile("f" + std::to_string(i) + ".txt", 1000);
  }
  TakeIn();
  for (const std::string& name : Jobs()) {
    Finish(name, text);
  }
  for (int i = 0; i < FILES; ++i) {
    WriteFile(At("f" + std::to_string(i) + ".txt"), "other bytes");
    Add("f" + std::to_string(i) + ".txt");
  }
  Commit();

  int commits = 0;
  for (bool more = true; more; ++commits) {
    ASSERT_TRUE(contents->TakeIn(1000, more));
    EXPECT_LE(contents->PendingBytes(), ContentsWriter::ENOUGH_PENDING + 2 * text.size());
    ASSERT_TRUE(contents->Commit());
  }
  EXPECT_GE(commits, 3);
  EXPECT_EQ(Number("SELECT count(*) FROM texts"), 0);
}

TEST_F(ContentsWriterTest, SecondDeathIsTheLast) {
  File("a.txt");
  for (const char* reason : {"killed", "killed again"}) {
    ASSERT_EQ(Jobs(), Names({"a.txt"})) << reason;
    ASSERT_TRUE(contents->BeginTries({JobOf("a.txt").file}));
    ASSERT_TRUE(contents->Fail(JobOf("a.txt").file, reason, {}, true));
    ASSERT_TRUE(contents->Commit());
  }

  EXPECT_EQ(Jobs(), Names());
  EXPECT_EQ(Number("SELECT state FROM files"), 3);
  EXPECT_EQ(Number("SELECT reason = 'killed again' FROM files"), 1);
  EXPECT_EQ(Number("SELECT failed FROM counts WHERE kind = 1"), 1);

  OpenContents(1);
  EXPECT_EQ(Jobs(), Names()) << "nothing changed";
  OpenContents(2);
  EXPECT_EQ(Jobs(), Names({"a.txt"})) << "other readers";
  File("a.txt", "other bytes");
  EXPECT_EQ(JobOf("a.txt").tries, 0);
}

TEST_F(ContentsWriterTest, FailureKeepsWhatWasFoundAndIsTriedAgainWhenAsked) {
  File("a.txt");
  Jobs();
  ASSERT_TRUE(contents->Fail(JobOf("a.txt").file, "damaged", TextContent("half"), false));
  ASSERT_TRUE(contents->Commit());

  EXPECT_EQ(Jobs(), Names());
  EXPECT_EQ(Holding("half"), 1);
  EXPECT_EQ(Number("SELECT failed FROM counts WHERE kind = 1"), 1);

  ASSERT_TRUE(contents->RetryFailed());
  EXPECT_EQ(Jobs(), Names({"a.txt"}));
  Finish("a.txt", "whole");
  EXPECT_EQ(Holding("half"), 0);
  EXPECT_EQ(Holding("whole"), 1);
}

TEST_F(ContentsWriterTest, ReleasedFilesWaitAgainBehindTheOthers) {
  OldFile("a.txt", 3000);
  OldFile("b.txt", 2000);
  TakeIn();
  ASSERT_EQ(Jobs(1), Names({"a.txt"}));
  ASSERT_TRUE(contents->BeginTries({JobOf("a.txt").file}));

  ASSERT_TRUE(contents->Release(JobOf("a.txt").file));

  EXPECT_EQ(Jobs(), Names({"b.txt", "a.txt"}));
  EXPECT_EQ(JobOf("a.txt").tries, 0);
}

// A service that is killed: the writer goes without a word.
TEST_F(ContentsWriterTest, OfManyThatWereInFlightAtTwoDeathsNoneIsGuiltyAndEachIsTriedAlone) {
  OldFile("a.txt", 3000);
  OldFile("b.txt", 2000);
  TakeIn();
  for (int round = 0; round < 2; ++round) {
    ASSERT_EQ(Jobs(), Names({"a.txt", "b.txt"})) << round;
    ASSERT_TRUE(contents->BeginTries({JobOf("a.txt").file, JobOf("b.txt").file}));
    OpenContents();
  }
  OldFile("c.txt", 1000);
  TakeIn();

  ASSERT_EQ(Jobs(), Names({"c.txt"}));
  Finish("c.txt", "c");
  ASSERT_EQ(Jobs(), Names({"a.txt"}));
  ASSERT_TRUE(contents->BeginTries({JobOf("a.txt").file}));
  OldFile("d.txt", 500);
  TakeIn();
  EXPECT_EQ(Jobs(), Names()) << "beside a suspect";
  Finish("a.txt", "a");
  ASSERT_EQ(Jobs(), Names({"d.txt"}));
  Finish("d.txt", "d");
  EXPECT_EQ(Jobs(), Names({"b.txt"}));
}

// Others come without end, and one file ends the service each time that it is read.
TEST_F(ContentsWriterTest, WhoEndsTheServiceIsFoundAmongOthers) {
  OldFile("a.txt", 3000);
  OldFile("killer.txt", 4000);
  TakeIn();
  for (int deaths = 0; deaths < 5; ++deaths) {
    OldFile("n" + std::to_string(deaths) + ".txt", 5000 + deaths);
    TakeIn();
    for (Names names = Jobs(); !names.empty(); names = Jobs()) {
      std::vector<int64_t> files;
      for (const std::string& name : names) {
        files.push_back(JobOf(name).file);
      }
      ASSERT_TRUE(contents->BeginTries(files));
      if (std::count(names.begin(), names.end(), "killer.txt") != 0) {
        break;
      }
      for (const std::string& name : names) {
        Finish(name, name);
      }
    }
    OpenContents();
  }

  EXPECT_EQ(Number("SELECT state FROM files WHERE mtime = 4000000000000"), 3);
  EXPECT_EQ(Number("SELECT count(*) FROM files WHERE state = 3"), 1);
}

TEST_F(ContentsWriterTest, WhoWasAloneInFlightAtFiveDeathsIsGuilty) {
  File("a.txt");
  for (int round = 0; round < 5; ++round) {
    ASSERT_EQ(Jobs(), Names({"a.txt"})) << round;
    ASSERT_TRUE(contents->BeginTries({JobOf("a.txt").file}));
    OpenContents();
  }

  EXPECT_EQ(Jobs(), Names());
  EXPECT_EQ(Number("SELECT state FROM files"), 3);
}

TEST_F(ContentsWriterTest, WhoIsJoinedByAnotherIsNotAlone) {
  OldFile("a.txt", 3000);
  OldFile("b.txt", 2000);
  TakeIn();
  Jobs();
  ASSERT_TRUE(contents->BeginTries({JobOf("a.txt").file}));
  ASSERT_EQ(Number("SELECT begun FROM files WHERE mtime = 3000000000000"), 1);

  ASSERT_TRUE(contents->BeginTries({JobOf("b.txt").file}));

  EXPECT_EQ(Number("SELECT count(*) FROM files WHERE begun = 2"), 2);
}

TEST_F(ContentsWriterTest, ClosingTakesBackWhatIsInFlight) {
  File("a.txt");
  for (int round = 0; round < 3; ++round) {
    ASSERT_EQ(Jobs(), Names({"a.txt"})) << round;
    ASSERT_TRUE(contents->BeginTries({JobOf("a.txt").file}));
    contents->Close();
    OpenContents();
  }

  EXPECT_EQ(Jobs(), Names({"a.txt"}));
  EXPECT_EQ(JobOf("a.txt").tries, 0);
}

TEST_F(ContentsWriterTest, OpeningAnewDoesNotJudgeWhatIsStillInFlight) {
  File("a.txt");
  for (int round = 0; round < 3; ++round) {
    if (round == 0) {
      Jobs();
      ASSERT_TRUE(contents->BeginTries({JobOf("a.txt").file}));
    }
    ASSERT_EQ(contents->Open(TheShare(), 1), IndexError::NONE);
  }

  Finish("a.txt", "found");
  EXPECT_EQ(Holding("found"), 1);
  EXPECT_EQ(Number("SELECT state * 10 + tries FROM files"), 10);
}

TEST_F(ContentsWriterTest, UncommittedOutcomesAreReadAgain) {
  File("a.txt");
  Jobs();
  ASSERT_TRUE(contents->Finish(JobOf("a.txt").file, TextContent("lost")));
  EXPECT_TRUE(contents->HasChanges());
  EXPECT_EQ(contents->PendingBytes(), 4U);
  OpenContents();

  EXPECT_EQ(Read(), Names({"a.txt"}));
  EXPECT_FALSE(contents->HasChanges());
  EXPECT_EQ(Number("SELECT sum(waiting) * 10 + sum(done) FROM counts"), 1);
}

TEST_F(ContentsWriterTest, ContentsOfAnotherFileSystemAreDropped) {
  File("a.txt");
  Read();
  ASSERT_TRUE(store->SetShareFilesystem("s", "another"));

  OpenContents();
  EXPECT_EQ(Number("SELECT count(*) FROM files"), 0);
  TakeIn();
  EXPECT_EQ(Jobs(), Names({"a.txt"}));
}

TEST_F(ContentsWriterTest, DamagedContentsAreSetAsideAndMadeAnew) {
  File("a.txt");
  Read();
  contents.reset();
  WriteFile(ContentsPath("s") + "/contents.db", std::string(9000, 'x'));

  OpenContents();
  TakeIn();
  EXPECT_EQ(Jobs(), Names({"a.txt"}));
  EXPECT_EQ(access((ContentsPath("s") + ".damaged").c_str(), F_OK), 0);
}

TEST_F(ContentsWriterTest, ContentsOfAnotherVersionAreSetAsideAndMadeAnew) {
  File("a.txt");
  Read();
  contents.reset();
  Run("sqlite3 " + ContentsPath("s") + "/contents.db 'PRAGMA user_version = 99'");

  OpenContents();
  TakeIn();
  EXPECT_EQ(Jobs(), Names({"a.txt"}));
  EXPECT_EQ(access((ContentsPath("s") + ".damaged/contents.db").c_str(), F_OK), 0);
}

// Every question that the writer asks of the entries meets a page that is not whole.
TEST_F(ContentsWriterTest, DamagedEntriesTakeNothingFromTheContents) {
  File("a.txt");
  Read();
  File("b.txt");
  writer.reset();
  DamageEntries({"entries", "entries_by_inode", "entries_wanted"});
  bool more = false;
  std::vector<ContentJob> jobs;
  const std::pair<const char*, std::function<bool()>> steps[] = {
      {"TakeIn",
       [&] {
         contents->LookAtAll();
         return contents->TakeIn(10, more);
       }},
      {"Sweep",
       [&] {
         contents->LookAtAll();
         return contents->Sweep(NOW, 10, more);
       }},
      {"NextJobs", [&] { return contents->NextJobs(10, jobs, more); }},
  };
  for (const auto& [name, step] : steps) {
    OpenContents();
    EXPECT_FALSE(step()) << name;
    EXPECT_EQ(contents->Error(), IndexError::DAMAGED) << name;
    EXPECT_TRUE(TakeNote()) << name;
  }

  OpenContents();
  EXPECT_EQ(Holding("txt"), 1);
  EXPECT_NE(access((ContentsPath("s") + ".damaged").c_str(), F_OK), 0);
}

TEST_F(ContentsWriterTest, EntriesThatCannotBeOpenedAreToldOf) {
  File("a.txt");
  contents.reset();
  writer.reset();
  WriteFile(IndexPath("s") + "/" + ENTRIES_FILE, "no database at all");

  ContentsWriter other;
  EXPECT_EQ(other.Open(TheShare(), 1), IndexError::DAMAGED);
  EXPECT_TRUE(TakeNote());
}

TEST_F(ContentsWriterTest, FilesAreTheOwnersAlone) {
  File("a.txt");
  EXPECT_EQ(ModeOf(ContentsPath("s")), 0700U);
  EXPECT_EQ(ModeOf(ContentsPath("s") + "/contents.db"), 0600U);
  EXPECT_EQ(ModeOf(ContentsPath("s") + "/contents.db-wal"), 0600U);
}

TEST_F(ContentsWriterTest, WithoutEntriesThereAreNoContents) {
  contents.reset();
  writer.reset();
  RemoveTree(IndexPath("s"));
  RemoveTree(ContentsPath("s"));

  ContentsWriter other;
  EXPECT_EQ(other.Open(TheShare(), 1), IndexError::PATH_NOT_FOUND);
  EXPECT_FALSE(other.IsOpen());
  EXPECT_NE(access(ContentsPath("s").c_str(), F_OK), 0);
}

}  // namespace fileindexd
