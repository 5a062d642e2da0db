// SPDX-License-Identifier: GPL-2.0-or-later
#include <sys/stat.h>

#include <filesystem>
#include <functional>
#include <vector>

#include "state/store.h"
#include "tests/unit/state/store_fixture.h"
#include "tests/unit/state/version_1.h"

namespace fileindexd {
namespace {

TEST_F(StoreDamageTest, ANewerVersionIsRefusedByNameAndLeftAlone) {
  Sql(database, "PRAGMA user_version=99");
  const std::string before = ReadFile(database);
  std::string error;

  EXPECT_EQ(StateStore::Open(error), nullptr);

  EXPECT_NE(error.find(database), std::string::npos) << error;
  EXPECT_NE(error.find("99"), std::string::npos) << error;
  EXPECT_EQ(ReadFile(database), before);
}

TEST_F(StoreDamageTest, TheCopyTakesTheDatabasesPlace) {
  const std::string good = ReadFile(database);
  std::string scribbled = good;
  scribbled.replace(4096, scribbled.size() - 4096, scribbled.size() - 4096, '\x5a');
  std::string no_version = good;
  no_version.replace(60, 4, 4, '\0');
  for (const std::string& damaged :
       {std::string("not a database, but long enough to look like one; ") + std::string(5000, 'x'),
        std::string(), good.substr(0, 5000), scribbled, no_version,
        std::string(good.size(), '\0')}) {
    WriteFile(database, damaged);

    const auto store = OpenStore();

    ASSERT_NE(store, nullptr);
    ExpectAllThere(*store);
    EXPECT_EQ(ReadFile(database + ".damaged"), damaged);
    EXPECT_EQ(ModeOf(database), 0600U);
  }
}

TEST_F(StoreDamageTest, AMissingDatabaseBesideItsCopyIsPutBack) {
  std::filesystem::remove(database);
  ExpectAllThere(*OpenStore());
}

TEST_F(StoreDamageTest, TheLogOfADamagedDatabaseIsNotPlayedIntoTheCopy) {
  auto writer = OpenStore();
  ASSERT_TRUE(writer->SetPause(5));
  const std::string log = ReadFile(database + "-wal");
  writer.reset();
  ASSERT_FALSE(log.empty());
  WriteFile(database, std::string(8192, 'x'));
  WriteFile(database + "-wal", log);

  ExpectAllThere(*OpenStore());
  EXPECT_TRUE(ReadFile(database + ".damaged-wal") == log);  // too long to be printed
}

// As a program leaves them that is killed. SQLite would remove the log: to it an empty file has
// none.
TEST_F(StoreDamageTest, TheLogBesideAnEmptyDatabaseIsKept) {
  auto killed = OpenStore();
  ASSERT_TRUE(killed->SetPause(5));
  const std::string log = ReadFile(database + "-wal");
  killed.reset();
  ASSERT_FALSE(log.empty());
  WriteFile(database, "");
  WriteFile(database + "-wal", log);

  ExpectAllThere(*OpenStore());
  EXPECT_TRUE(ReadFile(database + ".damaged-wal") == log);

  std::filesystem::remove(copy);
  WriteFile(database, "");
  WriteFile(database + "-wal", log);
  std::string error;
  EXPECT_EQ(StateStore::Open(error), nullptr);
  EXPECT_NE(error.find(database), std::string::npos) << error;
  EXPECT_NE(error.find("no sound copy"), std::string::npos) << error;
  EXPECT_TRUE(ReadFile(database + "-wal") == log);
}

TEST_F(StoreDamageTest, WithoutASoundCopyItFailsAndRebuildsNothing) {
  const std::string garbage(8192, 'x');
  for (const std::string& bad_copy : {garbage, std::string(), ReadFile(copy).substr(0, 5000)}) {
    WriteFile(database, garbage);
    WriteFile(copy, bad_copy);
    std::string error;

    EXPECT_EQ(StateStore::Open(error), nullptr);
    EXPECT_NE(error.find(database), std::string::npos) << error;
    EXPECT_EQ(ReadFile(database), garbage);
  }
  std::filesystem::remove(copy);
  std::string error;
  EXPECT_EQ(StateStore::Open(error), nullptr);
  EXPECT_EQ(ReadFile(database), garbage);
}

// As a program leaves them that is killed: the changes are in the log alone.
TEST_F(StoreDamageTest, AChangeThatWentWithTheLogComesBackFromTheCopy) {
  for (const size_t kept : {0, 32, 2000, -1}) {  // of the log; -1: not even its file
    auto killed = OpenStore();
    Sql(database, "PRAGMA wal_checkpoint(TRUNCATE)");
    ASSERT_TRUE(killed->SetPause(static_cast<int64_t>(kept + 100)));
    const std::string main_file = ReadFile(database);
    const std::string log = ReadFile(database + "-wal");
    killed.reset();
    WriteFile(database, main_file);
    if (kept != static_cast<size_t>(-1)) {
      WriteFile(database + "-wal", log.substr(0, kept) + std::string(log.size() - kept, 'x'));
    }

    const auto store = OpenStore();

    int64_t resume_time = 0;
    ASSERT_TRUE(store->GetPause(resume_time)) << store->Error();
    EXPECT_EQ(resume_time, static_cast<int64_t>(kept + 100));
    ExpectAllThere(*store);
    EXPECT_TRUE(ReadFile(database + ".damaged") == main_file);
  }
}

TEST_F(StoreDamageTest, AnOlderDatabaseGivesWayToTheCopy) {
  const std::string older = ReadFile(database);
  ASSERT_TRUE(OpenStore()->AddFolder("/v/a/new", {}));
  WriteFile(database, older);

  std::shared_ptr<const Settings> settings;
  ASSERT_TRUE(OpenStore()->GetSettings(settings));
  EXPECT_EQ(settings->folders.size(), 2U);
  EXPECT_TRUE(ReadFile(database + ".damaged") == older);
}

// As whoever puts it back leaves it that does not know of the log: each table is that of the log if
// that has it, else the older one.
TEST_F(StoreDamageTest, AnOlderDatabaseBelowANewerLogGivesWayToTheCopy) {
  const std::string older = ReadFile(database);
  auto killed = OpenStore();
  ASSERT_TRUE(killed->SetShareLanguage("a", "german"));
  Sql(database, "PRAGMA wal_checkpoint(TRUNCATE)");
  ASSERT_TRUE(killed->AddFolder("/v/a/new", {}));
  const std::string log = ReadFile(database + "-wal");
  killed.reset();
  WriteFile(database, older);
  WriteFile(database + "-wal", log);

  std::shared_ptr<const Settings> settings;
  ASSERT_TRUE(OpenStore()->GetSettings(settings));
  EXPECT_EQ(settings->folders.size(), 2U);
  EXPECT_EQ(settings->shares[0].language, "german");
  EXPECT_TRUE(ReadFile(database + ".damaged") == older);
}

TEST_F(StoreDamageTest, ACopyThatIsOlderOrDamagedOrAPipeIsPassedOver) {
  const std::string older = ReadFile(copy);
  ASSERT_TRUE(OpenStore()->SetPause(5));
  Sql(copy, "UPDATE number SET value = 1000 WHERE name = 'changes'");
  std::string damaged = ReadFile(copy);
  damaged.replace(4096, 4096, 4096, '\x5a');
  for (const std::string& bytes : {older, damaged, std::string()}) {
    std::filesystem::remove(copy);
    bytes.empty() ? (void)mkfifo(copy.c_str(), 0600) : WriteFile(copy, bytes);

    int64_t resume_time = 0;
    ASSERT_TRUE(OpenStore()->GetPause(resume_time));
    EXPECT_EQ(resume_time, 5);
    EXPECT_FALSE(std::filesystem::exists(database + ".damaged"));
  }
}

TEST_F(StoreDamageTest, ACopyOfANewerProgramIsPassedOver) {
  Sql(copy, "UPDATE number SET value = 1000 WHERE name = 'changes'; PRAGMA user_version=99");
  ExpectAllThere(*OpenStore());
  EXPECT_FALSE(std::filesystem::exists(database + ".damaged"));
}

TEST_F(StoreDamageTest, AVersionThatIsNotThatOfItsTablesGivesWayToTheCopy) {
  for (const char* sql :
       {"PRAGMA user_version=1", "PRAGMA user_version=2", "PRAGMA user_version=3"}) {
    Sql(database, sql);
    const std::string found = ReadFile(database);

    ExpectAllThere(*OpenStore());

    EXPECT_TRUE(ReadFile(database + ".damaged") == found) << sql;
  }
}

TEST_F(StoreDamageTest, TheCopyHoldsTheLastChangeAndStandsAlone) {
  const auto store = OpenStore();
  ASSERT_TRUE(store->SetPause(1234));
  EXPECT_EQ(ModeOf(copy), 0600U);

  // Opened elsewhere, with no log beside it.
  const std::string other = folder + "/other";
  std::filesystem::create_directories(other);
  std::filesystem::copy_file(copy, other + "/state.db");
  setenv("FILEINDEXD_STATE_DIR", other.c_str(), 1);
  int64_t resume_time = 0;
  const auto second = OpenStore();
  ASSERT_TRUE(second->GetPause(resume_time)) << second->Error();
  EXPECT_EQ(resume_time, 1234);
  ExpectAllThere(*second);
}

TEST_F(StoreDamageTest, AFolderInTheCopysPlaceIsSetAside) {
  const auto store = OpenStore();
  std::filesystem::remove(copy);
  std::filesystem::create_directories(copy + "/in/its/place");
  std::filesystem::create_directories(copy + ".new/in/its/place");

  EXPECT_TRUE(store->SetPause(5)) << store->Error();

  EXPECT_TRUE(std::filesystem::is_regular_file(copy));
  EXPECT_TRUE(std::filesystem::exists(copy + ".damaged/in/its/place"));
  EXPECT_FALSE(Exists(copy + ".new"));
}

// Without it the next damage would take what was changed last.
TEST_F(StoreDamageTest, AnOpeningLeavesACopyWhereOneLacks) {
  const std::string older = ReadFile(copy);
  ASSERT_TRUE(OpenStore()->SetPause(5));
  const std::vector<std::function<void()>> lacks = {
      [&] { std::filesystem::remove(copy); }, [&] { WriteFile(copy, older); },
      [&] { WriteFile(copy, std::string(10'000, 'x')); },
      [&] {
        std::filesystem::remove(copy);
        mkfifo(copy.c_str(), 0600);
      },
      [&] {
        std::filesystem::remove(copy);
        std::filesystem::create_directories(copy + "/in/its/place");
      }};
  for (const auto& make : lacks) {
    make();
    ExpectAllThere(*OpenStore());

    WriteFile(database, std::string(10'000, 'x'));
    int64_t resume_time = 0;
    ASSERT_TRUE(OpenStore()->GetPause(resume_time));
    EXPECT_EQ(resume_time, 5);
  }
}

TEST_F(StoreDamageTest, AnUpgradeLeavesACopy) {
  std::filesystem::remove(copy);
  std::filesystem::remove(database);
  Sql(database, VERSION_1);
  (void)OpenStore();
  std::filesystem::remove(database);

  std::shared_ptr<const Settings> settings;
  ASSERT_TRUE(OpenStore()->GetSettings(settings));
  EXPECT_EQ(settings->shares.size(), 1U);
}

TEST_F(StoreDamageTest, WhatStandsInTheJournalsPlaceIsSetAside) {
  ASSERT_TRUE(OpenStore()->SetPause(5));
  const std::string journal = database + "-journal";
  for (const bool folder_there : {true, false}) {
    folder_there ? (void)std::filesystem::create_directories(journal + "/in/its/place")
                 : (void)mkfifo(journal.c_str(), 0600);

    int64_t resume_time = 0;
    ASSERT_TRUE(OpenStore()->GetPause(resume_time));
    EXPECT_EQ(resume_time, 5);
    EXPECT_TRUE(Exists(database + ".damaged-journal"));
  }
}

// A folder that somebody made must not keep everybody out.
TEST_F(StoreDamageTest, AFolderInTheWayOfPuttingTheCopyInPlaceIsRemoved) {
  std::filesystem::remove(database);
  std::filesystem::create_directories(database + ".new/in/its/place");
  ExpectAllThere(*OpenStore());
}

}  // namespace
}  // namespace fileindexd
