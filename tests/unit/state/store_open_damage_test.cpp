// SPDX-License-Identifier: GPL-2.0-or-later
// What befalls the database of a store that is open.
#include <sqlite3.h>

#include <filesystem>
#include <fstream>

#include "state/store.h"
#include "tests/unit/state/store_fixture.h"

namespace fileindexd {
namespace {

TEST_F(StoreDamageTest, AnOpenStoreFollowsADatabaseThatWasReplaced) {
  const auto old = OpenStore();
  ExpectAllThere(*old);
  std::filesystem::rename(database, database + ".aside");
  std::filesystem::remove(database + "-wal");
  std::filesystem::remove(database + "-shm");
  ASSERT_TRUE(OpenStore()->AddFolder("/v/a/new", {}));

  std::shared_ptr<const Settings> settings;
  ASSERT_TRUE(old->GetSettings(settings)) << old->Error();
  EXPECT_EQ(settings->folders.size(), 2U);
}

// Written over in place: no other program says so by putting another file there.
TEST_F(StoreDamageTest, AnOpenStoreMendsADatabaseThatWasOverwritten) {
  for (const size_t kept : {0, 4096, 5000}) {
    const auto store = OpenStore();
    ExpectAllThere(*store);
    Sql(database, "PRAGMA wal_checkpoint(TRUNCATE)");
    ASSERT_TRUE(OpenStore()->SetPause(static_cast<int64_t>(kept)));
    const std::string log = ReadFile(database + "-wal");
    std::string damaged = ReadFile(database);
    damaged.replace(kept, damaged.size() - kept, damaged.size() - kept, '\x5a');
    WriteFile(database, damaged);

    ShareStatus status;
    (void)store->GetStatus("a", status);  // this one may be told that it failed

    ASSERT_TRUE(store->GetStatus("a", status)) << kept << ": " << store->Error();
    ExpectAllThere(*store);
    EXPECT_TRUE(ReadFile(database + ".damaged") == damaged) << kept;
    EXPECT_TRUE(ReadFile(database + ".damaged-wal") == log) << kept;
  }
}

// Another program puts the copy in its place just before the commit.
TEST_F(StoreDamageTest, AChangeToAFileThatIsSetAsideMeanwhileIsMadeAgain) {
  const auto store = OpenStore();
  int times = 0;
  ASSERT_TRUE(store->UpdateStatus("a", [&](ShareStatus& status) {
    status.missing = true;
    if (++times == 1) {
      std::filesystem::rename(database, database + ".aside");
      std::filesystem::copy_file(copy, database);
    }
  })) << store->Error();

  EXPECT_EQ(times, 2);
  ShareStatus status;
  ASSERT_TRUE(OpenStore()->GetStatus("a", status));
  EXPECT_TRUE(status.missing);
}

TEST_F(StoreDamageTest, AnOpenStoreLosesNothingWithItsLog) {
  const auto store = OpenStore();
  ASSERT_TRUE(store->SetPause(5));
  std::filesystem::remove(database + "-wal");

  ASSERT_TRUE(store->UpdateStatus("a", [](ShareStatus& status) { status.missing = true; }))
      << store->Error();

  int64_t resume_time = 0;
  ShareStatus status;
  const auto other = OpenStore();
  ASSERT_TRUE(other->GetPause(resume_time)) << other->Error();
  EXPECT_EQ(resume_time, 5);
  ASSERT_TRUE(other->GetStatus("a", status));
  EXPECT_TRUE(status.missing);
  ASSERT_TRUE(other->SetPause(6));
  ASSERT_TRUE(store->GetPause(resume_time)) << store->Error();
  EXPECT_EQ(resume_time, 6);
}

// Two programs with a memory of their own would write over each other's changes.
TEST_F(StoreDamageTest, AnOpenStoreLosesNothingWithItsSharedMemory) {
  OtherProgram other("/v/a/b");
  OtherProgram asker([](StateStore& store) {
    int64_t paused = 0;
    return store.GetPause(paused) && paused == 6;
  });
  const auto store = OpenStore();
  ASSERT_TRUE(store->SetPause(5));
  std::filesystem::remove(database + "-shm");
  other.Act();
  std::filesystem::remove(copy);  // nothing comes out of it

  std::shared_ptr<const Settings> settings;
  ASSERT_TRUE(store->GetSettings(settings)) << store->Error();
  EXPECT_EQ(settings->folders.size(), 2U);
  ASSERT_TRUE(store->SetPause(6)) << store->Error();
  ASSERT_TRUE(OpenStore()->GetSettings(settings));
  EXPECT_EQ(settings->folders.size(), 2U);
  asker.Act();
  EXPECT_FALSE(Exists(database + ".damaged"));
}

// Its end would copy back what it knows of the log, and remove the rest.
TEST_F(StoreDamageTest, AStoreThatEndsWithoutItsSharedMemoryTakesNothingWithIt) {
  OtherProgram other("/v/a/b");
  auto store = OpenStore();
  ASSERT_TRUE(store->SetPause(5));
  std::filesystem::remove(database + "-shm");
  other.Act();
  std::filesystem::remove(copy);

  store.reset();

  std::shared_ptr<const Settings> settings;
  ASSERT_TRUE(OpenStore()->GetSettings(settings));
  EXPECT_EQ(settings->folders.size(), 2U);
}

TEST_F(StoreDamageTest, TheFirstStoreNoticesThatItsLogWent) {
  std::filesystem::remove_all(state_root);
  OtherProgram other("/v/a");
  const auto store = OpenStore();
  ASSERT_TRUE(store->AddShare({"a", "/v/a", ""})) << store->Error();
  Sql(database, "PRAGMA wal_checkpoint(TRUNCATE)");
  std::filesystem::remove(database + "-wal");
  other.Act();

  ExpectAllThere(*store);
  EXPECT_FALSE(Exists(database + ".damaged"));
}

TEST_F(StoreDamageTest, TheFirstStoreEndsWithoutLeavingALog) {
  std::filesystem::remove_all(state_root);
  ASSERT_TRUE(OpenStore()->AddShare({"a", "/v/a", ""}));

  EXPECT_FALSE(Exists(database + "-wal"));
}

// In a page that the change does not touch, so that only the copy that is to be left tells.
TEST_F(StoreDamageTest, AChangeToAnOpenDatabaseThatIsDamagedIsMadeAgainInTheCopy) {
  const auto store = OpenStore();
  ASSERT_TRUE(store->SetMarker("m"));
  Sql(database, "PRAGMA wal_checkpoint(TRUNCATE)");
  int64_t page = 0;
  sqlite3* db = nullptr;
  ASSERT_EQ(sqlite3_open(database.c_str(), &db), SQLITE_OK);
  const auto take = [](void* number, int, char** row, char**) {
    *static_cast<int64_t*>(number) = std::stoll(row[0]);
    return 0;
  };
  sqlite3_exec(db, "SELECT rootpage FROM sqlite_schema WHERE name = 'marker'", take, &page,
               nullptr);
  sqlite3_close(db);
  ASSERT_GT(page, 1);
  std::fstream file(database, std::ios::in | std::ios::out | std::ios::binary);
  file.seekp((page - 1) * 4096);
  file << std::string(4096, '\x55');
  file.close();

  ASSERT_TRUE(store->SetPause(5)) << store->Error();

  const auto other = OpenStore();
  int64_t resume_time = 0;
  ASSERT_TRUE(other->GetPause(resume_time));
  EXPECT_EQ(resume_time, 5);
  bool has = false;
  EXPECT_TRUE(other->HasMarker("m", has) && has) << other->Error();
  EXPECT_TRUE(Exists(database + ".damaged"));
}

}  // namespace
}  // namespace fileindexd
