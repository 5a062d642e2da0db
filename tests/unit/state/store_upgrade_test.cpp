// SPDX-License-Identifier: GPL-2.0-or-later
// Databases of older versions are upgraded in place, and keep what they hold.
#include <sqlite3.h>

#include <filesystem>

#include "state/store.h"
#include "tests/unit/state/fixture.h"
#include "tests/unit/state/version_1.h"

namespace fileindexd {
namespace {

class StoreUpgradeTest : public StateTest {
 protected:
  StoreUpgradeTest() : database(state_root + "/state.db") {
    std::filesystem::create_directories(state_root);
    Sql(VERSION_1);
  }

  void Sql(const char* sql) {
    sqlite3* db = nullptr;
    EXPECT_EQ(sqlite3_open(database.c_str(), &db), SQLITE_OK);
    EXPECT_EQ(sqlite3_exec(db, sql, nullptr, nullptr, nullptr), SQLITE_OK) << sqlite3_errmsg(db);
    sqlite3_close(db);
  }

  void ExpectAllThere(StateStore& store) {
    std::shared_ptr<const Settings> settings;
    ASSERT_TRUE(store.GetSettings(settings)) << store.Error();
    ASSERT_EQ(settings->shares.size(), 1U);
    EXPECT_EQ(settings->shares[0].filesystem, "fs");
    EXPECT_EQ(settings->shares[0].language, "english");
    ASSERT_EQ(settings->folders.size(), 1U);
    EXPECT_EQ(settings->folders[0].path, "/v/a/f");
    EXPECT_EQ(settings->folders[0].wanted, (ContentFlags{true, false, false, true}));
    ShareStatus status;
    ASSERT_TRUE(store.GetStatus("a", status)) << store.Error();
    EXPECT_TRUE(status.needs_reindex && status.missing);
    EXPECT_FALSE(status.reindex_begun || status.accept_empty || status.retry_contents);
    int64_t resume_time = 0;
    EXPECT_TRUE(store.GetPause(resume_time));
    EXPECT_EQ(resume_time, 77);
    bool has = false;
    EXPECT_TRUE(store.HasMarker("m", has) && has);
  }

  std::string database;
};

TEST_F(StoreUpgradeTest, TheFirstVersionKeepsAllThatItHolds) {
  ExpectAllThere(*OpenStore());
  ExpectAllThere(*OpenStore());  // upgraded once, opened again as it is
}

TEST_F(StoreUpgradeTest, WhatIsNewCanBeSetAfterAnUpgrade) {
  const auto store = OpenStore();
  ASSERT_TRUE(store->UpdateStatus("a", [](ShareStatus& status) {
    status.accept_empty = true;
    status.retry_contents = true;
  })) << store->Error();

  ShareStatus status;
  ASSERT_TRUE(OpenStore()->GetStatus("a", status));
  EXPECT_TRUE(status.accept_empty && status.retry_contents && status.needs_reindex);
}

TEST_F(StoreUpgradeTest, TheLanguageCanBeSetAfterAnUpgrade) {
  ASSERT_TRUE(OpenStore()->SetShareLanguage("a", "german"));

  std::shared_ptr<const Settings> settings;
  ASSERT_TRUE(OpenStore()->GetSettings(settings));
  EXPECT_EQ(settings->shares[0].language, "german");
  EXPECT_FALSE(OpenStore()->SetShareLanguage("b", "german"));
}

TEST_F(StoreUpgradeTest, ACopyOfAnOlderVersionTakesTheDatabasesPlaceAndIsUpgraded) {
  std::filesystem::rename(database, database + ".copy");
  WriteFile(database, std::string(8192, 'x'));

  ExpectAllThere(*OpenStore());
}

// What the copy holds is what the database held before, and as many changes are counted in both.
TEST_F(StoreUpgradeTest, ACopyFromBeforeTheUpgradeIsMadeAnewByTheNextOpening) {
  const std::string copy = database + ".copy";
  Sql("INSERT INTO number VALUES('changes', 3)");
  std::filesystem::copy_file(database, copy);
  (void)OpenStore();

  ExpectAllThere(*OpenStore());

  EXPECT_FALSE(Exists(database + ".damaged"));
  std::filesystem::rename(copy, database);
  Sql("SELECT retry_contents FROM status");  // of the newest version only
}

}  // namespace
}  // namespace fileindexd
