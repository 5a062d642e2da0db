// SPDX-License-Identifier: GPL-2.0-or-later
// After many removals the database's file becomes smaller, in small steps, and stays sound whatever
// interrupts it.
#include "index/shrink.h"

#include <sys/stat.h>
#include <sys/wait.h>

#include <csignal>
#include <filesystem>

#include "index/schema.h"
#include "state/layout.h"
#include "state/sqlite.h"
#include "tests/unit/index/fixture.h"

namespace fileindexd {

namespace {

constexpr int FILES = 6000;

}  // namespace

class ShrinkTest : public IndexTest {
 protected:
  void MountRoot() override { MountTmpfs(root); }

  std::string NameOf(int number) const {
    return std::string(number % 2 == 0 ? "even" : "odd") + "/holiday picture of a long name " +
           std::to_string(number) + ".jpeg";
  }
  void MakeAll() {
    MakeFolder(At("even"));
    MakeFolder(At("odd"));
    for (int i = 0; i < FILES; ++i) {
      WriteFile(At(NameOf(i)), "");
    }
    AddAll();
    Settle();
  }
  void RemoveHalf() {
    RemoveTree(At("odd"));
    Delete("odd");
  }
  // Commits until there is nothing left to do, as the daemon's passes do.
  void Settle() {
    std::filesystem::remove(QueuePath("s"));
    do {
      ++commits;
      OpenWriter();
      Commit();
    } while (std::filesystem::remove(QueuePath("s")));
  }
  // In a child process. What the child before it committed is there.
  int RemoveAndKillAfterOneStep() {
    const auto own_store = OpenStore();
    bool armed = false;
    EntryWriter victim("s", *own_store, [&armed] {
      if (armed) {
        raise(SIGKILL);
      }
    });
    const bool removed = victim.Delete(At("odd"), DeleteMode::ENTRY);
    armed = true;
    return removed && victim.Commit() ? 0 : 1;
  }
  // With nothing in the log.
  int64_t FileSizeWithLog() const {
    IndexDatabase database;
    EXPECT_EQ(database.OpenForWriting(IndexPath("s"), false), IndexError::NONE);
    EXPECT_EQ(sqlite3_wal_checkpoint_v2(database.db, "main", SQLITE_CHECKPOINT_TRUNCATE, nullptr,
                                        nullptr),
              SQLITE_OK);
    return FileSize();
  }
  int64_t FileSize() const {
    struct stat status {};
    EXPECT_EQ(stat(File().c_str(), &status), 0);
    return status.st_size;
  }
  std::string File() const { return IndexPath("s") + "/" + ENTRIES_FILE; }
  void ExpectSound() {
    IndexDatabase database;
    ASSERT_EQ(database.OpenForWriting(IndexPath("s"), false), IndexError::NONE);
    Statement check;
    ASSERT_EQ(check.Prepare(database.db, "PRAGMA integrity_check"), SQLITE_OK);
    ASSERT_EQ(check.Step(), SQLITE_ROW);
    EXPECT_EQ(check.Bytes(0), "ok");
    check.Reset();
    for (const char* sql : {"INSERT INTO names(names) VALUES('integrity-check')",
                            "INSERT INTO parts(parts) VALUES('integrity-check')"}) {
      EXPECT_EQ(sqlite3_exec(database.db, sql, nullptr, nullptr, nullptr), SQLITE_OK) << sql;
    }
    database.Close();
    EXPECT_EQ(Differences(), Names());
  }

  int commits = 0;
};

TEST_F(ShrinkTest, FileShrinksAfterAFolderWithHalfOfAllIsRemoved) {
  MakeAll();
  const int64_t before = FileSizeWithLog();
  RemoveHalf();
  Commit();
  Settle();
  EXPECT_LE(FileSize() * 10, before * 7) << before << " bytes became " << FileSize();
  ExpectSound();
}

TEST_F(ShrinkTest, FileShrinksAfterEverySecondFileIsRemoved) {
  MakeAll();
  const int64_t before = FileSizeWithLog();
  for (int i = 0; i < FILES; ++i) {
    if (i % 4 >= 2) {
      RemoveTree(At(NameOf(i)));
      Delete(NameOf(i));
    }
  }
  Commit();
  Settle();
  // The full-text tables alone: pages of entries that are half empty are filled again, not merged.
  EXPECT_LE(FileSize() * 100, before * 95) << before << " bytes became " << FileSize();
  ExpectSound();
}

TEST_F(ShrinkTest, FewRemovalsMoveNothing) {
  MakeAll();
  OpenWriter();
  for (int i = 0; i < FILES / 10; ++i) {
    RemoveTree(At(NameOf(i)));
    Delete(NameOf(i));
  }
  slices = 0;
  Commit();
  EXPECT_EQ(slices, 0);
  EXPECT_FALSE(Exists(QueuePath("s")));
}

TEST_F(ShrinkTest, KillAfterEachStepLeavesASoundDatabase) {
  MakeAll();
  const int64_t before = FileSizeWithLog();
  RemoveTree(At("odd"));
  writer.reset();
  int killed = 0;
  for (; WaitFor(Fork([this] { return RemoveAndKillAfterOneStep(); })) != 0; ++killed) {
    ASSERT_LT(killed, 1000);
    ExpectSound();
  }
  EXPECT_GE(killed, 3);
  Settle();
  EXPECT_LE(FileSize() * 10, before * 7) << before << " bytes became " << FileSize();
  ExpectSound();
}

TEST_F(ShrinkTest, ReaderInTheWayIsComeBackTo) {
  MakeAll();
  const int64_t before = FileSizeWithLog();
  auto reader = Read();
  bool first = true;
  RemoveHalf();
  // The reader keeps seeing what there was, so the log cannot be copied back.
  EXPECT_TRUE(reader->ForEach(root, [&](const Entry& /*unused*/) {
    if (first) {
      first = false;
      Commit();
      EXPECT_TRUE(Exists(QueuePath("s")));
    }
    return true;
  }));
  Settle();
  EXPECT_LE(FileSize() * 10, before * 7) << before << " bytes became " << FileSize();
  ExpectSound();
}

}  // namespace fileindexd
