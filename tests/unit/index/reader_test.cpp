// SPDX-License-Identifier: GPL-2.0-or-later
#include <unistd.h>

#include <algorithm>
#include <optional>

#include "index/schema.h"
#include "state/layout.h"
#include "state/sqlite.h"
#include "tests/unit/index/fixture.h"

namespace fileindexd {

class ReaderTest : public IndexTest {};

TEST_F(ReaderTest, EntryTellsWhatTheDiskShows) {
  WriteFile(At("a.txt"), "12345");
  Add("a.txt");
  Commit();

  const Entry entry = Find("a.txt");
  EXPECT_EQ(entry.thing, Thing::FILE);
  EXPECT_EQ(entry.kind, Kind::DOCUMENT);
  EXPECT_EQ(entry.size, 5);
  EXPECT_GT(entry.mtime, 0);
  EXPECT_GE(entry.first_seen, entry.mtime);
  EXPECT_EQ(entry.mode & 0777U, ModeOf(At("a.txt")));
}

// What a writer puts into its log before it commits is no commit, though the log begins anew.
TEST_F(ReaderTest, AWriterThatHasBegunALogHasNotEnded) {
  AddAll();
  EntryReader reader;
  ASSERT_EQ(reader.Open("s"), IndexError::NONE);
  IndexDatabase other;
  ASSERT_EQ(other.OpenForWriting(IndexPath("s"), false), IndexError::NONE);
  // All of the log is copied back: the next writer begins it anew.
  ASSERT_EQ(Execute(other.db,
                    "PRAGMA wal_checkpoint(RESTART); PRAGMA cache_size = 1;"
                    "BEGIN IMMEDIATE"),
            SQLITE_OK);
  EXPECT_FALSE(reader.HasWriterEnded(0));

  ASSERT_EQ(Execute(other.db,
                    "CREATE TABLE filling AS WITH RECURSIVE n(i) AS"
                    " (SELECT 1 UNION ALL SELECT i + 1 FROM n WHERE i < 2000)"
                    " SELECT i, randomblob(400) AS more FROM n"),
            SQLITE_OK);
  EXPECT_FALSE(reader.HasWriterEnded(0));

  ASSERT_EQ(Execute(other.db, "ROLLBACK"), SQLITE_OK);
  EXPECT_TRUE(reader.HasWriterEnded(0));

  // Another one, of whom it is asked after opening anew.
  ASSERT_EQ(Execute(other.db, "UPDATE meta SET last_written = last_written + 1; BEGIN IMMEDIATE"),
            SQLITE_OK);
  ASSERT_EQ(reader.Open("s"), IndexError::NONE);
  EXPECT_FALSE(reader.HasWriterEnded(0));
}

TEST_F(ReaderTest, DirectoryHasNoSizeAndNoTime) {
  MakeFolder(At("d"));
  Add("d");
  Commit();

  EXPECT_EQ(Find("d").kind, Kind::FOLDER);
  EXPECT_EQ(Find("d").size, 0);
  EXPECT_EQ(Find("d").mtime, 0);
}

TEST_F(ReaderTest, UnderTakesTheEntryAndWhatLiesBelowItAlone) {
  for (const char* name : {"a", "a!b", "a.b", "a0"}) {
    MakeFolder(At(name));
    WriteFile(At(std::string(name) + "/f"), "");
  }
  AddAll();

  Names names;
  ASSERT_TRUE(Read()->ForEach(At("a"), [&](const Entry& entry) {
    names.push_back(entry.path);
    return true;
  }));
  EXPECT_EQ(names, Names({At("a"), At("a/f")}));
}

TEST_F(ReaderTest, VisitorEndsTheReading) {
  for (const char* name : {"a", "b", "c"}) {
    WriteFile(At(name), "");
  }
  AddAll();

  int visited = 0;
  EXPECT_TRUE(Read()->ForEach(root, [&](const Entry&) { return ++visited < 2; }));
  EXPECT_EQ(visited, 2);
}

TEST_F(ReaderTest, WritesThatAreNotCommittedAreNotSeen) {
  AddAll();
  WriteFile(At("a"), "");
  Add("a");

  EXPECT_EQ(Held(), Names({""}));
  Commit();
  EXPECT_EQ(Held(), Names({"", "a"}));
}

TEST_F(ReaderTest, WorksWhereTheLogMustBeMade) {
  WriteFile(At("a"), "");
  AddAll();
  writer.reset();
  const std::string file = state_root + "/shares/s/index/entries.db";
  Run("sqlite3 " + file + " 'PRAGMA wal_checkpoint(TRUNCATE)'");
  RemoveTree(file + "-wal");
  RemoveTree(file + "-shm");

  EXPECT_EQ(Held(), Names({"", "a"}));
}

TEST_F(ReaderTest, NothingIsMadeWhereThereIsNoIndex) {
  writer.reset();
  RemoveTree(state_root + "/shares/s/index");

  EntryReader reader;
  EXPECT_EQ(reader.Open("s"), IndexError::PATH_NOT_FOUND);
  EXPECT_FALSE(Exists(state_root + "/shares/s/index"));
}

TEST_F(ReaderTest, WhatIsNotHeldIsNotFound) {
  std::optional<Entry> entry = Entry();
  EXPECT_EQ(Read()->Find(At("none"), entry), IndexError::NONE);
  EXPECT_FALSE(entry.has_value());
}

TEST_F(ReaderTest, WhatCannotBeLookedUpIsNoMissingEntry) {
  writer.reset();
  DamageTable(IndexPath("s") + "/" + ENTRIES_FILE, "sqlite_autoindex_entries_1");

  std::optional<Entry> entry = Entry();
  EXPECT_EQ(Read()->Find(At("none"), entry), IndexError::DAMAGED);
  EXPECT_TRUE(entry.has_value()) << "changed";
}

TEST_F(ReaderTest, EntriesOfAnInodeAreAllItsNamesAndNoOthers) {
  WriteFile(At("a"), "");
  WriteFile(At("other"), "");
  ASSERT_EQ(link(At("a").c_str(), At("b").c_str()), 0);
  AddAll();
  const uint64_t inode = Find("a").inode;

  Names names;
  const auto visit = [&](const Entry& entry) {
    names.push_back(entry.path);
    EXPECT_EQ(entry.inode, inode);
    return true;
  };
  ASSERT_TRUE(Read()->ForEachOfInode(inode, visit));
  std::sort(names.begin(), names.end());
  EXPECT_EQ(names, Names({At("a"), At("b")}));
  ASSERT_TRUE(Read()->ForEachOfInode(1'000'000'007, visit));
  EXPECT_EQ(names.size(), 2U);
}

TEST_F(ReaderTest, TimeOfTheLastCommitIsKept) {
  EntryReader::Summary summary;
  ASSERT_TRUE(Read()->Summarise(summary));
  EXPECT_EQ(summary.last_commit, 0);
  AddAll();

  ASSERT_TRUE(Read()->Summarise(summary));
  EXPECT_GT(summary.last_commit, 0);
  EXPECT_EQ(summary.entries, 1U);
}

}  // namespace fileindexd
