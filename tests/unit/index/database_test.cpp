// SPDX-License-Identifier: GPL-2.0-or-later
// What stands in the database's place, and what becomes of it.
#include "index/database.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <utime.h>

#include <filesystem>

#include "state/layout.h"
#include "state/sqlite.h"
#include "tests/unit/index/fixture.h"

namespace fileindexd {

class DatabaseTest : public IndexTest {
 protected:
  void SetUp() override {
    IndexTest::SetUp();
    if (IsSkipped()) {
      return;
    }
    WriteFile(At("a"), "");
    AddAll();
    writer.reset();
    index = IndexPath("s");
    file = index + "/entries.db";
  }

  ShareStatus Status() {
    ShareStatus status;
    EXPECT_TRUE(store->GetStatus("s", status));
    return status;
  }
  // What opening says first, and after a rebuild was asked for.
  void ExpectMissedThenRebuilt() {
    OpenWriter();
    EXPECT_FALSE(writer->IsOpen());
    EXPECT_EQ(writer->last_error, IndexError::PATH_NOT_FOUND);
    EXPECT_TRUE(Status().missing);
    WantRebuild();
    OpenWriter();
    ASSERT_TRUE(writer->IsOpen()) << IndexErrorText(writer->last_error);
    EXPECT_FALSE(Status().missing);
    EXPECT_FALSE(Status().rebuild_wanted);
    AddAll();
    EXPECT_EQ(Differences(), Names());
  }

  // Of a table of the database in that folder; -1: it cannot be asked.
  int64_t RowsIn(const std::string& place, const std::string& table) {
    sqlite3* db = nullptr;
    int64_t rows = -1;
    Statement ask;
    if (sqlite3_open((place + "/entries.db").c_str(), &db) == SQLITE_OK &&
        ask.Prepare(db, ("SELECT count(*) FROM " + table).c_str()) == SQLITE_OK &&
        ask.Step() == SQLITE_ROW) {
      rows = ask.Int(0);
    }
    sqlite3_close_v2(db);
    return rows;
  }

  std::string index;
  std::string file;
};

TEST_F(DatabaseTest, FilesAreForTheirOwnerAlone) {
  EXPECT_EQ(ModeOf(index), 0700U);
  for (const auto& entry : std::filesystem::directory_iterator(index)) {
    EXPECT_EQ(ModeOf(entry.path()), 0600U) << entry.path();
  }
}

TEST_F(DatabaseTest, ModesDoNotDependOnTheMask) {
  RemoveTree(index);
  for (const mode_t mask : {0U, 0177U}) {
    RemoveTree(index);
    WantRebuild();
    const mode_t before = umask(mask);
    OpenWriter();
    umask(before);
    ASSERT_TRUE(writer->IsOpen());
    EXPECT_EQ(ModeOf(index), 0700U);
    EXPECT_EQ(ModeOf(file), 0600U);
    writer.reset();
  }
}

TEST_F(DatabaseTest, OpensAgainWithWhatWasCommitted) {
  OpenWriter();
  ASSERT_TRUE(writer->IsOpen());
  EXPECT_EQ(Held(), Names({"", "a"}));
}

TEST_F(DatabaseTest, RemovedFolderIsMissedThenRebuilt) {
  RemoveTree(index);
  ExpectMissedThenRebuilt();
}

TEST_F(DatabaseTest, RemovedShareFolderIsMissedThenRebuilt) {
  RemoveTree(ShareFolder("s"));
  ExpectMissedThenRebuilt();
}

TEST_F(DatabaseTest, RemovedFileIsMissedThenRebuilt) {
  RemoveTree(file);
  ExpectMissedThenRebuilt();
}

TEST_F(DatabaseTest, EmptyFileIsMissedThenRebuilt) {
  for (const char* name : {"", "-wal", "-shm"}) {
    WriteFile(file + name, "");
  }
  ExpectMissedThenRebuilt();
}

TEST_F(DatabaseTest, EmptyFileBesideAFullLogIsSetAsideThenRebuilt) {
  const std::string log = ReadFile(file + "-wal");
  ASSERT_FALSE(log.empty());
  WriteFile(file, "");
  ExpectMissedThenRebuilt();
  EXPECT_TRUE(ReadFile(DamagedIndexPath("s") + "/entries.db-wal") == log);
}

TEST_F(DatabaseTest, PlainFileInPlaceOfTheFolderIsSetAsideThenRebuilt) {
  RemoveTree(index);
  WriteFile(index, "x");
  ExpectMissedThenRebuilt();
  EXPECT_EQ(ReadFile(DamagedIndexPath("s")), "x");
}

TEST_F(DatabaseTest, EmptyFileInPlaceOfTheFolderIsMissedThenRebuilt) {
  RemoveTree(index);
  WriteFile(index, "");
  ExpectMissedThenRebuilt();
  EXPECT_FALSE(Exists(DamagedIndexPath("s")));
}

TEST_F(DatabaseTest, DirectoryInPlaceOfTheFileIsMissedThenRebuilt) {
  RemoveTree(file);
  MakeFolder(file);
  ExpectMissedThenRebuilt();
  EXPECT_FALSE(Exists(DamagedIndexPath("s")));
}

TEST_F(DatabaseTest, FullDirectoryInPlaceOfTheFileIsSetAsideThenRebuilt) {
  RemoveTree(file);
  MakeFolder(file);
  WriteFile(file + "/x", "y");
  ExpectMissedThenRebuilt();
  EXPECT_EQ(ReadFile(DamagedIndexPath("s") + "/entries.db/x"), "y");
}

TEST_F(DatabaseTest, PipeInPlaceOfTheFileIsMissedThenRebuilt) {
  RemoveTree(file);
  ASSERT_EQ(mkfifo(file.c_str(), 0600), 0);
  ExpectMissedThenRebuilt();
}

TEST_F(DatabaseTest, PipeInPlaceOfTheFolderIsMissedThenRebuilt) {
  RemoveTree(index);
  ASSERT_EQ(mkfifo(index.c_str(), 0600), 0);
  ExpectMissedThenRebuilt();
}

TEST_F(DatabaseTest, DatabaseOfAnotherVersionIsSetAsideThenRebuilt) {
  for (const char* version : {"0", "99"}) {
    writer.reset();
    RemoveTree(DamagedIndexPath("s"));
    Run("sqlite3 " + file + " 'PRAGMA user_version = " + version + "'");
    ExpectMissedThenRebuilt();
    EXPECT_EQ(RowsIn(DamagedIndexPath("s"), "entries"), 2) << version;
  }
}

TEST_F(DatabaseTest, DatabaseOfAnotherProgramIsSetAsideThenRebuilt) {
  RemoveTree(index);
  MakeFolder(index);
  Run("sqlite3 " + file + " 'CREATE TABLE t(a); INSERT INTO t VALUES(1)'");
  ExpectMissedThenRebuilt();
  EXPECT_EQ(RowsIn(DamagedIndexPath("s"), "t"), 1);
}

TEST_F(DatabaseTest, DatabaseOfAnotherProgramThatCannotBeReadIsSetAsideThenRebuilt) {
  RemoveTree(index);
  MakeFolder(index);
  Run("sqlite3 " + file + " 'CREATE TABLE t(a); INSERT INTO t VALUES(1)'");
  std::string bytes = ReadFile(file);
  bytes[47] = 99;  // the schema's format, which no SQLite knows
  WriteFile(file, bytes);
  ExpectMissedThenRebuilt();
  EXPECT_EQ(ReadFile(DamagedIndexPath("s") + "/entries.db"), bytes);
}

TEST_F(DatabaseTest, DatabaseWithoutAnyTableIsMissedThenRebuilt) {
  RemoveTree(index);
  MakeFolder(index);
  Run("sqlite3 " + file + " 'PRAGMA user_version = 99'");
  ExpectMissedThenRebuilt();
  EXPECT_FALSE(Exists(DamagedIndexPath("s")));
}

TEST_F(DatabaseTest, DatabaseOfAnotherVersionIsSetAsideByARebuildToo) {
  Run("sqlite3 " + file + " 'PRAGMA user_version = 99'");
  WantRebuild();

  OpenWriter();

  ASSERT_TRUE(writer->IsOpen()) << IndexErrorText(writer->last_error);
  EXPECT_EQ(RowsIn(DamagedIndexPath("s"), "entries"), 2);
}

TEST_F(DatabaseTest, GarbageIsSetAsideThenRebuilt) {
  RemoveTree(file + "-wal");
  WriteFile(file, std::string(9000, 'x'));
  ExpectMissedThenRebuilt();
  EXPECT_EQ(ReadFile(DamagedIndexPath("s") + "/entries.db"), std::string(9000, 'x'));
}

TEST_F(DatabaseTest, TruncatedDatabaseIsSetAsideThenRebuilt) {
  Run("sqlite3 " + file + " 'PRAGMA wal_checkpoint(TRUNCATE)'");
  ASSERT_EQ(truncate(file.c_str(), 8192), 0);
  ExpectMissedThenRebuilt();
  EXPECT_TRUE(Exists(DamagedIndexPath("s")));
}

TEST_F(DatabaseTest, DatabaseWithoutItsTablesIsSetAsideThenRebuilt) {
  Run("sqlite3 " + file + " 'DROP TABLE entries'");
  ExpectMissedThenRebuilt();
  EXPECT_TRUE(Exists(DamagedIndexPath("s")));
}

// What is left is sound, and of an earlier moment.
TEST_F(DatabaseTest, DatabaseWhoseLogIsGoneIsSetAsideThenRebuilt) {
  RemoveTree(file + "-wal");
  const std::string left = ReadFile(file);
  ExpectMissedThenRebuilt();
  EXPECT_TRUE(ReadFile(DamagedIndexPath("s") + "/entries.db") == left);
}

TEST_F(DatabaseTest, DatabaseWhoseLogLostItsLastCommitIsSetAsideThenRebuilt) {
  const auto before = static_cast<off_t>(std::filesystem::file_size(file + "-wal"));
  OpenWriter();
  WriteFile(At("b"), "");
  AddAll();
  writer.reset();
  ASSERT_GT(static_cast<off_t>(std::filesystem::file_size(file + "-wal")), before);
  ASSERT_EQ(truncate((file + "-wal").c_str(), before), 0);
  ExpectMissedThenRebuilt();
  EXPECT_EQ(RowsIn(DamagedIndexPath("s"), "entries"), 2);
}

// The log was copied back before it went, as other programs do when they close the database.
TEST_F(DatabaseTest, DatabaseWhoseLogWasCopiedBackGoesOn) {
  Run("sqlite3 " + file + " 'PRAGMA wal_checkpoint(TRUNCATE)'");
  RemoveTree(file + "-wal");
  RemoveTree(file + "-shm");
  OpenWriter();
  ASSERT_TRUE(writer->IsOpen()) << IndexErrorText(writer->last_error);
  EXPECT_EQ(Held(), Names({"", "a"}));
}

TEST_F(DatabaseTest, NoteOfTheLastCommitThatIsNoneCountsForNothing) {
  const std::string note = index + "/last-commit";
  const std::string good = ReadFile(note);
  ASSERT_EQ(good.size(), 20U);
  for (const std::string& text : {std::string(), std::string("9999999999999999999\n"),
                                  good.substr(0, 19), std::string(20, '\0'), good + "x"}) {
    WriteFile(note, text);
    OpenWriter();
    ASSERT_TRUE(writer->IsOpen()) << text;
    writer.reset();
  }
  RemoveTree(note);
  ASSERT_EQ(mkfifo(note.c_str(), 0600), 0);
  OpenWriter();
  ASSERT_TRUE(writer->IsOpen());
  WriteFile(At("b"), "");
  AddAll();
  EXPECT_EQ(Held(), Names({"", "a", "b"}));
}

TEST_F(DatabaseTest, SecondDamageWithinTheHourKeepsTheFirstCopy) {
  WriteFile(file, std::string(9000, 'x'));
  RemoveTree(file + "-wal");
  ExpectMissedThenRebuilt();
  writer.reset();
  RemoveTree(file + "-wal");
  WriteFile(file, std::string(9000, 'y'));
  ExpectMissedThenRebuilt();
  EXPECT_EQ(ReadFile(DamagedIndexPath("s") + "/entries.db")[0], 'x');

  writer.reset();
  RemoveTree(file + "-wal");
  WriteFile(file, std::string(9000, 'z'));
  const utimbuf old = {1000, 1000};
  ASSERT_EQ(utime(DamagedIndexPath("s").c_str(), &old), 0);
  ExpectMissedThenRebuilt();
  EXPECT_EQ(ReadFile(DamagedIndexPath("s") + "/entries.db")[0], 'z');
}

TEST_F(DatabaseTest, DamageFoundAtWorkIsSeenByTheNextOpening) {
  Run("sqlite3 " + file + " 'PRAGMA wal_checkpoint(TRUNCATE)'");
  std::string bytes = ReadFile(file);
  ASSERT_GT(bytes.size(), 5U * 4096);
  std::fill(bytes.begin() + 4096, bytes.end(), '\xee');
  // The first page alone is whole: opening does not look further than the tables' text.
  WriteFile(file, bytes);
  OpenWriter();
  if (writer->IsOpen()) {
    EXPECT_FALSE(writer->Add(At("a"), {}));
    EXPECT_EQ(writer->last_error, IndexError::DAMAGED);
    EXPECT_FALSE(writer->IsOpen());
  }
  ExpectMissedThenRebuilt();
}

TEST_F(DatabaseTest, ReadingRepairsAndMovesNothing) {
  RemoveTree(file + "-wal");
  WriteFile(file, std::string(9000, 'x'));
  EntryReader reader;

  EXPECT_EQ(reader.Open("s"), IndexError::DAMAGED);
  EXPECT_EQ(ReadFile(file), std::string(9000, 'x'));
  EXPECT_FALSE(Exists(DamagedIndexPath("s")));
}

TEST_F(DatabaseTest, ReadingLeavesWhatIsOfAnotherVersion) {
  Run("sqlite3 " + file + " 'PRAGMA user_version = 99'");
  EntryReader reader;

  EXPECT_EQ(reader.Open("s"), IndexError::PATH_NOT_FOUND);
  EXPECT_EQ(RowsIn(index, "entries"), 2);
  EXPECT_FALSE(Exists(DamagedIndexPath("s")));
}

TEST_F(DatabaseTest, FreedPagesGoBack) {
  MakeFolder(At("d"));
  for (int i = 0; i < 3000; ++i) {
    WriteFile(At("d/some longer name of a file " + std::to_string(i)), "");
  }
  OpenWriter();
  AddAll();
  Run("sqlite3 " + file + " 'PRAGMA wal_checkpoint(TRUNCATE)'");
  const auto before = std::filesystem::file_size(file);
  Delete("d", DeleteMode::ALL);
  Commit();
  for (int i = 0; i < 10; ++i) {
    WriteFile(At("a"), std::string(static_cast<size_t>(i) + 1, 'x'));
    Refresh("a");
    Commit();
  }
  Run("sqlite3 " + file + " 'PRAGMA wal_checkpoint(TRUNCATE)'");
  EXPECT_LT(std::filesystem::file_size(file), before - 200000);
}

}  // namespace fileindexd
