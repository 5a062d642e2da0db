// SPDX-License-Identifier: GPL-2.0-or-later
// Settings that are read without opening the store: where that is right, and where not.
#include <sqlite3.h>
#include <sys/stat.h>
#include <unistd.h>

#include "tests/unit/state/fixture.h"

namespace fileindexd {
namespace {

class StorePeekTest : public StateTest {
 protected:
  StorePeekTest() : file(state_root + "/state.db") {
    const std::unique_ptr<StateStore> store = OpenStore();
    EXPECT_TRUE(store->AddShare({"a", "/v/a", "fs1"})) << store->Error();
    EXPECT_TRUE(store->AddFolder("/v/a", {true, false, false, false})) << store->Error();
  }

  // How many shares; -1 where the store has to be opened.
  static int Shares() {
    std::shared_ptr<const Settings> settings;
    return StateStore::PeekSettings(settings) ? static_cast<int>(settings->shares.size()) : -1;
  }

  void Exec(const char* sql) {
    sqlite3* db = nullptr;
    ASSERT_EQ(sqlite3_open(file.c_str(), &db), SQLITE_OK);
    EXPECT_EQ(sqlite3_exec(db, sql, nullptr, nullptr, nullptr), SQLITE_OK) << sqlite3_errmsg(db);
    sqlite3_close(db);
  }

  std::string file;
};

TEST_F(StorePeekTest, SettingsOfAnUnusedStoreAreRead) {
  std::shared_ptr<const Settings> settings;

  ASSERT_TRUE(StateStore::PeekSettings(settings));
  ASSERT_EQ(settings->shares.size(), 1U);
  EXPECT_EQ(settings->shares[0].path, "/v/a");
  ASSERT_EQ(settings->folders.size(), 1U);
  EXPECT_TRUE(settings->folders[0].wanted.document);
  EXPECT_EQ(settings->state_root, state_root);
  EXPECT_FALSE(Exists(file + "-wal"));
  EXPECT_FALSE(Exists(file + "-shm"));
}

TEST_F(StorePeekTest, AnOpenStoreIsNotPeekedAt) {
  const std::unique_ptr<StateStore> store = OpenStore();
  EXPECT_EQ(Shares(), -1);
  ASSERT_TRUE(store->AddShare({"b", "/v/b", "fs1"})) << store->Error();
  EXPECT_EQ(Shares(), -1);
}

TEST_F(StorePeekTest, OpeningIsPossibleAgainAfterwards) {
  EXPECT_EQ(Shares(), 1);
  EXPECT_TRUE(OpenStore()->AddShare({"b", "/v/b", "fs1"}));
  EXPECT_EQ(Shares(), 2);
}

TEST_F(StorePeekTest, WhatAKilledProgramLeftInTheLogIsNotOverlooked) {
  const pid_t child = Fork([this] {
    const std::unique_ptr<StateStore> store = OpenStore();
    const bool added = store->AddShare({"b", "/v/b", "fs1"});
    _exit(added ? 0 : 1);  // the store stays open
    return 1;
  });
  ASSERT_EQ(WaitFor(child), 0);

  EXPECT_EQ(Shares(), -1);
  EXPECT_NE(OpenStore(), nullptr);
  EXPECT_EQ(Shares(), 2);
}

TEST_F(StorePeekTest, WhatOpeningWouldRefuseOrMendIsLeftToIt) {
  Exec("PRAGMA user_version = 99");
  EXPECT_EQ(Shares(), -1);
  Exec("PRAGMA user_version = 3");
  EXPECT_EQ(Shares(), -1);

  WriteFile(file, std::string(9000, 'x'));
  EXPECT_EQ(Shares(), -1);
  EXPECT_EQ(ReadFile(file), std::string(9000, 'x'));

  ASSERT_EQ(unlink(file.c_str()), 0);
  EXPECT_EQ(Shares(), -1);
  ASSERT_EQ(mkfifo(file.c_str(), 0600), 0);
  EXPECT_EQ(Shares(), -1);
}

}  // namespace
}  // namespace fileindexd
