// SPDX-License-Identifier: GPL-2.0-or-later
// The redo list: databases that vanish, are locked, or do not open.
#include <sys/stat.h>
#include <unistd.h>

#include "state/layout.h"
#include "state/sqlite.h"
#include "tests/unit/index/fixture.h"

namespace fileindexd {

class RedoTest : public IndexTest {
 protected:
  ShareStatus Status() {
    ShareStatus status;
    EXPECT_TRUE(store->GetStatus("s", status));
    return status;
  }
  void Files(int first, int count) {
    for (int i = first; i < first + count; ++i) {
      WriteFile(At(std::to_string(i)), "");
      Add(std::to_string(i));
    }
  }
};

TEST_F(RedoTest, DatabaseRemovedUnderTheWriterIsMadeAnew) {
  AddAll();
  Files(0, 10);
  RemoveTree(IndexPath("s"));
  RemoveTree(QueuePath("s"));

  Commit();
  EXPECT_EQ(Held().size(), 10U);
  EXPECT_TRUE(Status().needs_reindex);
  EXPECT_TRUE(Exists(QueuePath("s")));
}

TEST_F(RedoTest, LogStaysShortOverManyCommitsThatNobodyReads) {
  constexpr off_t MOST_BYTES = 1100 * (4096 + 24) + 32;  // the limit, and one commit beyond it
  for (int i = 0; i < 300; ++i) {
    OpenWriter();
    Files(i * 10, 10);
    Commit();

    struct stat log = {};
    ASSERT_EQ(stat((IndexPath("s") + "/entries.db-wal").c_str(), &log), 0);
    ASSERT_LE(log.st_size, MOST_BYTES) << "after " << i << " commits";
  }
}

TEST_F(RedoTest, DatabaseRemovedBetweenCommitsIsMadeAnew) {
  AddAll();
  RemoveTree(IndexPath("s"));
  Commit();
  EXPECT_TRUE(Status().needs_reindex);
  AddAll();
  EXPECT_EQ(Differences(), Names());
}

TEST_F(RedoTest, OtherFileMovedOntoTheDatabaseIsNoticed) {
  AddAll();
  Files(0, 3);
  const std::string file = IndexPath("s") + "/entries.db";
  ASSERT_EQ(rename(file.c_str(), (file + ".old").c_str()), 0);
  WriteFile(file,
            "garbage that is no database at all, and long enough to be read as a header"
            "................................................................");
  Commit();
  EXPECT_EQ(Held().size(), 3U);
  EXPECT_TRUE(Status().needs_reindex);
}

TEST_F(RedoTest, WriterThatFoundNoDatabaseMakesItAtItsFirstOperation) {
  writer.reset();
  RemoveTree(IndexPath("s"));
  OpenWriter();
  ASSERT_EQ(writer->last_error, IndexError::PATH_NOT_FOUND);
  EXPECT_FALSE(Exists(IndexPath("s")));
  WriteFile(At("a"), "");
  EXPECT_TRUE(writer->Add(At("a"), {}));

  Commit();
  EXPECT_EQ(Held(), Names({"a"}));
  EXPECT_TRUE(Status().needs_reindex);
}

TEST_F(RedoTest, LockedDatabaseKeepsTheOperations) {
  AddAll();
  sqlite3* other = nullptr;
  ASSERT_EQ(sqlite3_open((IndexPath("s") + "/entries.db").c_str(), &other), SQLITE_OK);
  ASSERT_EQ(sqlite3_exec(other, "BEGIN IMMEDIATE", nullptr, nullptr, nullptr), SQLITE_OK);
  WriteFile(At("a"), "");
  EXPECT_FALSE(writer->Add(At("a"), {}));
  EXPECT_EQ(writer->last_error, IndexError::BUSY);
  ASSERT_EQ(sqlite3_exec(other, "COMMIT", nullptr, nullptr, nullptr), SQLITE_OK);
  sqlite3_close(other);

  Commit();
  EXPECT_EQ(Differences(), Names());
}

TEST_F(RedoTest, ListThatGrowsTooLongBecomesAReindex) {
  writer.reset();
  RemoveTree(IndexPath("s"));
  WriteFile(IndexPath("s"), "");
  OpenWriter();
  ASSERT_FALSE(writer->IsOpen());
  // Nothing can be made here, so that everything stays on the list.
  RemoveTree(ShareFolder("s"));
  WriteFile(ShareFolder("s"), "");
  for (int i = 0; i <= 100000; ++i) {
    ASSERT_FALSE(writer->Delete(At(std::to_string(i)), DeleteMode::ENTRY));
  }
  EXPECT_TRUE(Status().needs_reindex);
}

// What was dropped may be the reindex's own, which ends well once the disk is well again.
TEST_F(RedoTest, ReindexUnderWayIsNotEnoughForALongList) {
  ASSERT_TRUE(store->UpdateStatus("s", [](ShareStatus& status) { status.reindex_begun = true; }));
  writer.reset();
  RemoveTree(ShareFolder("s"));
  WriteFile(ShareFolder("s"), "");
  OpenWriter();
  for (int i = 0; i < 100000; ++i) {
    ASSERT_FALSE(writer->Delete(At(std::to_string(i)), DeleteMode::ENTRY));
  }
  EXPECT_FALSE(Status().needs_reindex);

  ASSERT_FALSE(writer->Delete(At("last"), DeleteMode::ENTRY));
  EXPECT_TRUE(Status().needs_reindex);
}

TEST_F(RedoTest, CommitWithoutChangesWritesNothing) {
  AddAll();
  struct stat before {};
  struct stat after {};
  const std::string log = IndexPath("s") + "/entries.db-wal";
  ASSERT_EQ(stat(log.c_str(), &before), 0);
  Add("");
  Commit();
  ASSERT_EQ(stat(log.c_str(), &after), 0);
  EXPECT_EQ(before.st_mtim.tv_nsec, after.st_mtim.tv_nsec);
  EXPECT_EQ(before.st_size, after.st_size);
}

TEST_F(RedoTest, WriterThatIsDroppedLeavesWhatWasCommitted) {
  AddAll();
  Files(0, 5);
  OpenWriter();
  EXPECT_EQ(Held(), Names({""}));
}

}  // namespace fileindexd
