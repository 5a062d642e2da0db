// SPDX-License-Identifier: GPL-2.0-or-later
// A state database is made, upgraded, or put in the place of one that was damaged, with one call
// failing: the next opening finds all that was acknowledged before and meanwhile.
#include <gtest/gtest.h>
#include <sqlite3.h>

#include <cerrno>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <functional>
#include <ostream>
#include <string>
#include <vector>

#include "state/store.h"
#include "unit/fault/each.h"
#include "unit/state/version_1.h"

namespace fileindexd::fault {

void PrintTo(const Fault& fault, std::ostream* stream);

namespace {

// Before an opening.
struct Situation {
  const char* name;
  std::function<void(const std::string& database)> make;
  bool is_first = false;  // nothing was acknowledged yet
};

std::unique_ptr<StateStore> OpenStore() {
  std::string error;
  auto store = StateStore::Open(error);
  EXPECT_NE(store, nullptr) << error;
  return store;
}

void Sql(const std::string& path, const char* sql) {
  sqlite3* db = nullptr;
  ASSERT_EQ(sqlite3_open(path.c_str(), &db), SQLITE_OK) << path;
  EXPECT_EQ(sqlite3_exec(db, sql, nullptr, nullptr, nullptr), SQLITE_OK) << sqlite3_errmsg(db);
  sqlite3_close(db);
}

void Copy(const std::string& from, const std::string& to) {
  std::filesystem::copy_file(from, to, std::filesystem::copy_options::overwrite_existing);
}

void Scribble(const std::string& path) {
  std::ofstream(path, std::ios::trunc) << std::string(10'000, 'x');
}

void MakeVersion1(const std::string& database) {
  std::filesystem::create_directories(std::filesystem::path(database).parent_path());
  Sql(database, VERSION_1);
}

// With what VERSION_1 holds.
void MakeCurrent(const std::string& database) {
  MakeVersion1(database);
  const auto store = OpenStore();
  EXPECT_TRUE(store->SetMarker("counted")) << store->Error();
}

const std::vector<Situation>& Situations() {
  static const std::vector<Situation> situations = {
      {"nothing", [](const std::string&) {}, true},
      {"first version", MakeVersion1},
      {"first version with a copy",
       [](const std::string& database) {
         MakeVersion1(database);
         Copy(database, database + ".copy");
       }},
      {"first version, damaged",
       [](const std::string& database) {
         MakeVersion1(database);
         std::filesystem::rename(database, database + ".copy");
         Scribble(database);
       }},
      {"damaged",
       [](const std::string& database) {
         MakeCurrent(database);
         Scribble(database);
         Scribble(database + "-wal");
         std::filesystem::create_directories(database + ".damaged/set/aside/before");
       }},
      {"missing",
       [](const std::string& database) {
         MakeCurrent(database);
         std::filesystem::remove(database);
       }},
      {"folder in its place",
       [](const std::string& database) {
         MakeCurrent(database);
         std::filesystem::remove(database);
         std::filesystem::create_directories(database + "/in/its/place");
       }},
      {"sound", MakeCurrent},
      {"log lost",
       [](const std::string& database) {
         MakeCurrent(database);
         Copy(database, database + ".older");
         EXPECT_TRUE(OpenStore()->UpdateStatus(
             "a", [](ShareStatus& status) { status.rebuild_wanted = true; }));
         std::filesystem::rename(database + ".older", database);
       }},
  };
  return situations;
}

// What was acknowledged before.
void ExpectAllThere(StateStore& store, const std::string& name) {
  std::shared_ptr<const Settings> settings;
  ASSERT_TRUE(store.GetSettings(settings)) << store.Error();
  ASSERT_EQ(settings->shares.size(), 1U);
  EXPECT_EQ(settings->shares[0].filesystem, "fs");
  ASSERT_EQ(settings->folders.size(), 1U);
  EXPECT_EQ(settings->folders[0].wanted, (ContentFlags{true, false, false, true}));
  ShareStatus status;
  ASSERT_TRUE(store.GetStatus("a", status)) << store.Error();
  EXPECT_TRUE(status.needs_reindex && status.missing);
  EXPECT_EQ(status.rebuild_wanted, name == "log lost");
  int64_t resume_time = 0;
  EXPECT_TRUE(store.GetPause(resume_time));
  EXPECT_EQ(resume_time, 77);
  bool has = false;
  EXPECT_TRUE(store.HasMarker("m", has) && has);
}

// Whether the change is acknowledged.
bool OpenAndChange() {
  std::string error;
  const auto store = StateStore::Open(error);
  EXPECT_NE(store == nullptr, error.empty()) << error;
  return store != nullptr && store->SetMarker("while calls fail");
}

void ExpectGood(const Situation& situation, const std::string& database, bool changed) {
  SCOPED_TRACE(situation.name);
  for (const char* marker : {"afterwards", "and after that"}) {
    const auto store = OpenStore();
    ASSERT_NE(store, nullptr);
    if (!situation.is_first) {
      ExpectAllThere(*store, situation.name);
    }
    bool has = false;
    EXPECT_TRUE(store->HasMarker("while calls fail", has)) << store->Error();
    EXPECT_TRUE(has || !changed);
    EXPECT_TRUE(store->SetMarker(marker)) << store->Error();
    std::filesystem::remove(database);  // the copy is to be looked at as well
  }
}

// The path of the database.
std::string Enter(const Situation& situation) {
  const std::string root = std::filesystem::current_path() / situation.name;
  setenv("FILEINDEXD_STATE_DIR", root.c_str(), 1);  // NOLINT(concurrency-mt-unsafe): one thread
  return root + "/state.db";
}

// What fails once, however it looks, is no damage.
void ExpectNotSetAside(const Fault& fault) {
  const std::string database = Enter({"sound", {}});
  EXPECT_TRUE(fault.times > 1 || !std::filesystem::exists(database + ".damaged"));
}

void OpenAll(const Fault& fault, int nth) {
  for (const Situation& situation : Situations()) {
    situation.make(Enter(situation));
  }
  std::vector<bool> changed;
  Arm(fault, nth);
  for (const Situation& situation : Situations()) {
    (void)Enter(situation);
    changed.push_back(OpenAndChange());
  }
  Disarm();
  ExpectNotSetAside(fault);

  for (size_t i = 0; i < changed.size(); ++i) {
    ExpectGood(Situations()[i], Enter(Situations()[i]), changed[i]);
  }
}

}  // namespace

class OpeningFaultTest : public testing::TestWithParam<Fault> {};

TEST_P(OpeningFaultTest, NextOpeningFindsAll) {
  const Fault fault = GetParam();
  ForEachCall(fault, [&fault](int nth) { OpenAll(fault, nth); });
}

// Without reads that give less than was asked for: to SQLite the rest is zeros, which an upgrade
// would write back.
INSTANTIATE_TEST_SUITE_P(
    Opening, OpeningFaultTest,
    testing::Values(
        Fault{Call::OPEN, SQLITE_CANTOPEN}, Fault{Call::READ, SQLITE_IOERR_READ},
        Fault{Call::WRITE, SQLITE_IOERR_WRITE}, Fault{Call::WRITE, SQLITE_FULL},
        Fault{Call::HALF_WRITE, SQLITE_FULL}, Fault{Call::SYNC, SQLITE_IOERR_FSYNC},
        Fault{Call::TRUNCATE, SQLITE_IOERR_TRUNCATE}, Fault{Call::SIZE, SQLITE_IOERR_FSTAT},
        Fault{Call::LOCK, SQLITE_IOERR_LOCK}, Fault{Call::SHARED_MEMORY, SQLITE_IOERR_SHMMAP},
        Fault{Call::SHARED_LOCK, SQLITE_IOERR_SHMLOCK}, Fault{Call::REMOVE, SQLITE_IOERR_DELETE},
        Fault{Call::ACCESS, SQLITE_IOERR_ACCESS}, Fault{Call::STATEMENT, SQLITE_IOERR},
        Fault{Call::STATEMENT, SQLITE_FULL}, Fault{Call::PREPARE, SQLITE_NOMEM},
        Fault{Call::MEMORY, SQLITE_NOMEM}, Fault{Call::FILE_OPEN, EIO}, Fault{Call::FILE_READ, EIO},
        Fault{Call::FILE_WRITE, ENOSPC}, Fault{Call::FILE_SYNC, EIO},
        Fault{Call::FILE_RENAME, EROFS}, Fault{Call::FILE_REMOVE, EROFS},
        Fault{Call::FILE_MODE, EIO}, Fault{Call::FOLDER_MAKE, ENOSPC},
        // The fault lasts, and then it ends.
        Fault{Call::OPEN, SQLITE_CANTOPEN, Target::BOTH, FOR_EVER},
        Fault{Call::READ, SQLITE_IOERR_READ, Target::BOTH, FOR_EVER},
        Fault{Call::WRITE, SQLITE_FULL, Target::BOTH, FOR_EVER},
        Fault{Call::SYNC, SQLITE_IOERR_FSYNC, Target::BOTH, FOR_EVER},
        Fault{Call::SHARED_MEMORY, SQLITE_IOERR_SHMMAP, Target::BOTH, FOR_EVER},
        Fault{Call::STATEMENT, SQLITE_IOERR, Target::BOTH, FOR_EVER},
        Fault{Call::MEMORY, SQLITE_NOMEM, Target::BOTH, FOR_EVER},
        Fault{Call::FILE_WRITE, ENOSPC, Target::BOTH, FOR_EVER},
        Fault{Call::FILE_RENAME, EROFS, Target::BOTH, FOR_EVER}));

}  // namespace fileindexd::fault
