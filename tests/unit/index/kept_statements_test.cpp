// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/kept_statements.h"

#include <gtest/gtest.h>

namespace fileindexd {

namespace {

constexpr const char* NUMBERS = "SELECT value FROM numbers WHERE value >= ?1 ORDER BY value";

class KeptStatementsTest : public testing::Test {
 protected:
  KeptStatementsTest() {
    Fill(db, "1), (2), (3");
    kept.Use(db);
  }
  ~KeptStatementsTest() override {
    kept.Use(nullptr);
    sqlite3_close(db);
  }

  static void Fill(sqlite3*& to, const std::string& values) {
    sqlite3_open(":memory:", &to);
    const std::string sql =
        "CREATE TABLE numbers(value); INSERT INTO numbers VALUES(" + values + ")";
    EXPECT_EQ(sqlite3_exec(to, sql.c_str(), nullptr, nullptr, nullptr), SQLITE_OK);
  }

  int64_t First(int64_t least) {
    EXPECT_EQ(kept.Find(NUMBERS, numbers), SQLITE_OK);
    numbers->BindInt(1, least);
    EXPECT_EQ(numbers->Step(), SQLITE_ROW);
    return numbers->Int(0);
  }

  sqlite3* db = nullptr;
  KeptStatements kept;
  Statement* numbers = nullptr;
};

TEST_F(KeptStatementsTest, SameTextIsPreparedOnceAndBeginsAnew) {
  EXPECT_EQ(First(2), 2);
  EXPECT_EQ(First(2), 2);
  EXPECT_EQ(First(1), 1);

  EXPECT_EQ(sqlite3_stmt_status(numbers->handle, SQLITE_STMTSTATUS_RUN, 0), 3);
}

TEST_F(KeptStatementsTest, ResetEndsWhatIsHalfRead) {
  First(1);
  ASSERT_NE(sqlite3_stmt_busy(numbers->handle), 0);

  kept.Reset();

  EXPECT_EQ(sqlite3_stmt_busy(numbers->handle), 0);
}

TEST_F(KeptStatementsTest, AnotherConnectionIsReadFromThenOn) {
  First(1);
  sqlite3* other = nullptr;
  Fill(other, "7");

  kept.Use(other);

  EXPECT_EQ(First(1), 7);
  kept.Use(db);
  EXPECT_EQ(sqlite3_close(other), SQLITE_OK);  // none of its statements is left
}

TEST_F(KeptStatementsTest, FailureIsToldAndAskedAgain) {
  Statement* statement = nullptr;
  EXPECT_EQ(kept.Find("SELECT 1 FROM later", statement), SQLITE_ERROR);
  EXPECT_EQ(statement, nullptr);
  ASSERT_EQ(sqlite3_exec(db, "CREATE TABLE later(value)", nullptr, nullptr, nullptr), SQLITE_OK);

  EXPECT_EQ(kept.Find("SELECT 1 FROM later", statement), SQLITE_OK);
  EXPECT_EQ(statement->Step(), SQLITE_DONE);
}

}  // namespace

}  // namespace fileindexd
