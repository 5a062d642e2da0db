// SPDX-License-Identifier: GPL-2.0-or-later
// An index that is damaged or of no use is set aside and made anew, with one call failing: the pass
// that follows builds it again.
#include <gtest/gtest.h>
#include <sqlite3.h>

#include <cerrno>
#include <filesystem>
#include <fstream>
#include <ostream>
#include <string>
#include <tuple>

#include "index/schema.h"
#include "state/layout.h"
#include "unit/fault/each.h"
#include "unit/fault/world.h"

namespace fileindexd::fault {

void PrintTo(const Fault& fault, std::ostream* stream);

namespace {

enum class Damage { OVERWRITTEN, LOG_LOST, FOREIGN, FILE_IN_ITS_PLACE };

void Do(Damage damage) {
  const std::string folder = IndexPath("s");
  const std::string file = folder + "/" + ENTRIES_FILE;
  const std::string garbage(20'000, 'x');
  switch (damage) {
    case Damage::OVERWRITTEN:
      std::ofstream(file) << garbage;
      break;
    case Damage::LOG_LOST:
      ASSERT_TRUE(std::filesystem::remove(file + "-wal"));
      break;
    case Damage::FOREIGN: {
      std::filesystem::remove(file + "-wal");
      std::filesystem::remove(file);
      sqlite3* db = nullptr;
      ASSERT_EQ(sqlite3_open(file.c_str(), &db), SQLITE_OK);
      EXPECT_EQ(sqlite3_exec(db, "CREATE TABLE other(x)", nullptr, nullptr, nullptr), SQLITE_OK);
      sqlite3_close(db);
      break;
    }
    case Damage::FILE_IN_ITS_PLACE:
      std::filesystem::remove_all(folder);
      std::ofstream(folder) << garbage;
      break;
  }
}

void SetAside(Damage damage, const Fault& fault, int nth) {
  World world;
  ASSERT_TRUE(world.HaveWorker());
  world.Burst();
  world.daemon.DeleteWorker("s");
  Do(damage);

  Arm(fault, nth);
  (void)world.HaveWorker();
  world.ChangeFiles();
  world.Burst();
  Disarm();

  world.ExpectMadeGoodByATouch();
  // What a lost log leaves may hold nothing.
  EXPECT_TRUE(damage == Damage::LOG_LOST || std::filesystem::exists(DamagedIndexPath("s")));
}

}  // namespace

class SetAsideFaultTest : public testing::TestWithParam<std::tuple<Damage, Fault>> {};

TEST_P(SetAsideFaultTest, ThePassThatFollowsBuildsItAgain) {
  const auto [damage, fault] = GetParam();
  ForEachCall(fault, [damage = damage, &fault = fault](int nth) { SetAside(damage, fault, nth); });
}

INSTANTIATE_TEST_SUITE_P(
    SetAside, SetAsideFaultTest,
    testing::Combine(testing::Values(Damage::OVERWRITTEN, Damage::LOG_LOST, Damage::FOREIGN,
                                     Damage::FILE_IN_ITS_PLACE),
                     testing::Values(Fault{Call::OPEN, SQLITE_CANTOPEN, Target::ENTRIES},
                                     Fault{Call::READ, SQLITE_IOERR_READ, Target::ENTRIES},
                                     Fault{Call::WRITE, SQLITE_FULL, Target::ENTRIES},
                                     Fault{Call::SYNC, SQLITE_IOERR_FSYNC, Target::ENTRIES},
                                     Fault{Call::STATEMENT, SQLITE_IOERR, Target::ENTRIES},
                                     Fault{Call::MEMORY, SQLITE_NOMEM}, Fault{Call::FILE_OPEN, EIO},
                                     Fault{Call::FILE_RENAME, EROFS}, Fault{Call::FILE_MODE, EIO},
                                     Fault{Call::FOLDER_MAKE, ENOSPC},
                                     Fault{Call::WRITE, SQLITE_FULL, Target::BOTH, FOR_EVER},
                                     Fault{Call::FILE_OPEN, EIO, Target::BOTH, FOR_EVER})));

}  // namespace fileindexd::fault
