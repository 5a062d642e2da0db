// SPDX-License-Identifier: GPL-2.0-or-later
// An index file that is to shrink, with one call of its work failing: nothing is lost, and what the
// fault kept from being cut off is cut off later.
#include <gtest/gtest.h>
#include <sqlite3.h>

#include <cstdint>
#include <ostream>
#include <string>

#include "index/schema.h"
#include "platform/log.h"
#include "state/layout.h"
#include "state/sqlite.h"
#include "unit/fault/each.h"
#include "unit/fault/operations.h"
#include "unit/fault/world.h"

namespace fileindexd::fault {

void PrintTo(const Fault& fault, std::ostream* stream);

namespace {

constexpr int64_t FREE_PAGES_KEPT = 16;

// What tells how much there is to cut off.
class Removed {
 public:
  Removed() {
    const std::string path = IndexPath("s") + "/" + ENTRIES_FILE;
    EXPECT_EQ(sqlite3_open(path.c_str(), &db), SQLITE_OK) << path;
  }
  ~Removed() { sqlite3_close_v2(db); }
  Removed(const Removed&) = delete;
  Removed& operator=(const Removed&) = delete;

  void SetCount(int64_t count) { Run("UPDATE meta SET removed = " + std::to_string(count)); }
  int64_t Count() { return Number("SELECT removed FROM meta"); }
  void MakeFreePages() {
    Run("CREATE TABLE large(bytes); INSERT INTO large VALUES(randomblob(2000000))");
    Run("DROP TABLE large");
  }
  int64_t FreePages() { return Number("PRAGMA freelist_count"); }

 private:
  void Run(const std::string& sql) {
    EXPECT_EQ(sqlite3_exec(db, sql.c_str(), nullptr, nullptr, nullptr), SQLITE_OK)
        << sqlite3_errmsg(db);
  }
  int64_t Number(const char* sql) {
    Statement statement;
    EXPECT_EQ(statement.Prepare(db, sql), SQLITE_OK);
    EXPECT_EQ(statement.Step(), SQLITE_ROW);
    return statement.Int(0);
  }

  sqlite3* db = nullptr;
};

void Shrink(const Fault& fault, int nth) {
  TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_DEBUG;
  World world;
  ASSERT_TRUE(world.HaveWorker());
  world.Burst();
  world.daemon.DeleteWorker("s");
  constexpr int64_t MANY = 1'000'000;
  Removed().SetCount(MANY);
  Removed().MakeFreePages();
  ASSERT_GT(Removed().FreePages(), 2 * 200);  // that many in one transaction
  ASSERT_TRUE(world.HaveWorker());
  world.ChangeFiles();

  Arm(fault, nth);
  world.Burst();
  Disarm();

  world.ExpectMadeGoodByATouch();
  ExpectEachOperationLogged();
  EXPECT_LT(Removed().Count(), MANY);
  EXPECT_LE(Removed().FreePages(), FREE_PAGES_KEPT);
}

}  // namespace

class ShrinkFaultTest : public testing::TestWithParam<Fault> {};

TEST_P(ShrinkFaultTest, NextTouchMakesGood) {
  const Fault fault = GetParam();
  ForEachCall(fault, [&fault](int nth) { Shrink(fault, nth); });
}

INSTANTIATE_TEST_SUITE_P(
    Shrink, ShrinkFaultTest,
    testing::Values(Fault{Call::TRUNCATE, SQLITE_IOERR_TRUNCATE, Target::ENTRIES},
                    Fault{Call::TRUNCATE, SQLITE_IOERR_TRUNCATE, Target::ENTRIES, FOR_EVER},
                    Fault{Call::READ, SQLITE_IOERR_READ, Target::ENTRIES},
                    Fault{Call::WRITE, SQLITE_FULL, Target::ENTRIES},
                    Fault{Call::HALF_WRITE, SQLITE_FULL, Target::ENTRIES},
                    Fault{Call::SYNC, SQLITE_IOERR_FSYNC, Target::ENTRIES},
                    Fault{Call::STATEMENT, SQLITE_IOERR, Target::ENTRIES},
                    Fault{Call::MEMORY, SQLITE_NOMEM},
                    Fault{Call::WRITE, SQLITE_FULL, Target::ENTRIES, FOR_EVER},
                    Fault{Call::SYNC, SQLITE_IOERR_FSYNC, Target::ENTRIES, FOR_EVER}));

}  // namespace fileindexd::fault
