// SPDX-License-Identifier: GPL-2.0-or-later
#include "tests/unit/state/store_fixture.h"

#include <fcntl.h>
#include <sqlite3.h>
#include <unistd.h>

namespace fileindexd {

StoreDamageTest::StoreDamageTest() : database(state_root + "/state.db"), copy(database + ".copy") {
  const auto store = OpenStore();
  EXPECT_TRUE(store->AddShare({"a", "/v/a", ""})) << store->Error();
  EXPECT_TRUE(store->AddFolder("/v/a", {})) << store->Error();
}

void StoreDamageTest::Sql(const std::string& path, const char* sql) {
  sqlite3* db = nullptr;
  ASSERT_EQ(sqlite3_open(path.c_str(), &db), SQLITE_OK);
  EXPECT_EQ(sqlite3_exec(db, sql, nullptr, nullptr, nullptr), SQLITE_OK) << sqlite3_errmsg(db);
  sqlite3_close(db);
}

void StoreDamageTest::ExpectAllThere(StateStore& store) {
  std::shared_ptr<const Settings> settings;
  ASSERT_TRUE(store.GetSettings(settings)) << store.Error();
  EXPECT_EQ(settings->shares.size(), 1U);
  EXPECT_EQ(settings->folders.size(), 1U);
}

OtherProgram::OtherProgram(const Deed& deed) {
  EXPECT_EQ(pipe2(ends.data(), O_CLOEXEC), 0);
  child = Fork([&] {
    close(ends[1]);  // so that it ends with the test, whatever becomes of that
    char go = 0;
    const bool told = read(ends[0], &go, 1) == 1;
    std::string error;
    const auto store = StateStore::Open(error);
    return told && store != nullptr && deed(*store) ? 0 : 1;
  });
}

OtherProgram::OtherProgram(const std::string& folder)
    : OtherProgram([&folder](StateStore& store) { return store.AddFolder(folder, {}); }) {}

OtherProgram::~OtherProgram() {
  close(ends[0]);
  close(ends[1]);
}

void OtherProgram::Act() {
  EXPECT_EQ(write(ends[1], "g", 1), 1);
  EXPECT_EQ(WaitFor(child), 0);
}

}  // namespace fileindexd
