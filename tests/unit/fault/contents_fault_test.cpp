// SPDX-License-Identifier: GPL-2.0-or-later
// A share's contents are written, and their words made anew, with one call of its databases
// failing: the process lives, and whoever opens them afterwards makes good what the fault spoilt.
#include <gtest/gtest.h>
#include <sqlite3.h>

#include <memory>
#include <ostream>
#include <string>
#include <vector>

#include "index/contents_schema.h"
#include "index/contents_writer.h"
#include "state/layout.h"
#include "state/sqlite.h"
#include "state/store.h"
#include "unit/fault/each.h"
#include "unit/fault/world.h"

namespace fileindexd::fault {

void PrintTo(const Fault& fault, std::ostream* stream);

namespace {

constexpr size_t FILES = 24;  // of the world

Share TheShare(const std::string& language) {
  std::string error;
  const std::unique_ptr<StateStore> store = StateStore::Open(error);
  std::shared_ptr<const Settings> settings;
  EXPECT_TRUE(store != nullptr && store->GetSettings(settings)) << error;
  Share share = *settings->ShareByName("s");
  share.language = language;
  return share;
}

// All that is to be done, until it is done or fails.
bool WorkThrough(ContentsWriter& writer, const Share& share) {
  if (writer.Open(share, 1) != IndexError::NONE) {
    return false;
  }
  writer.LookAtAll();
  for (bool more = true; more;) {
    if (!writer.TakeIn(7, more)) {
      return false;
    }
  }
  std::vector<ContentJob> jobs;
  for (bool more = true; more;) {
    if (!writer.NextJobs(5, jobs, more)) {
      return false;
    }
    std::vector<int64_t> files;
    files.reserve(jobs.size());
    for (const ContentJob& job : jobs) {
      files.push_back(job.file);
    }
    if (!files.empty() && !writer.BeginTries(files)) {
      return false;
    }
    for (const ContentJob& job : jobs) {
      Content content;
      content.kind = Kind::DOCUMENT;
      content.text = "houses of inode" + std::to_string(job.identity.inode);
      if (!writer.Finish(job.file, content)) {
        return false;
      }
    }
    more = more || !jobs.empty();
  }
  return writer.Commit();
}

int64_t Number(sqlite3* db, const std::string& sql) {
  Statement statement;
  EXPECT_EQ(statement.Prepare(db, sql.c_str()), SQLITE_OK) << sql << ": " << sqlite3_errmsg(db);
  EXPECT_EQ(statement.Step(), SQLITE_ROW) << sql << ": " << sqlite3_errmsg(db);
  return statement.Int(0);
}

void ExpectWhole() {
  constexpr auto ALL = static_cast<int64_t>(FILES);
  IndexDatabase database;
  ASSERT_EQ(database.OpenForWriting(ContentsPath("s"), false, CONTENTS_FORM), IndexError::NONE);
  sqlite3* db = database.db;
  EXPECT_EQ(Number(db, "SELECT count(*) FROM files WHERE state = 1 AND begun = 0"), ALL);
  EXPECT_EQ(Number(db, "SELECT count(*) FROM texts"), ALL);
  EXPECT_EQ(Number(db, "SELECT sum(done) * 1000 + sum(waiting) + sum(failed) FROM counts"),
            ALL * 1000);
  EXPECT_EQ(Number(db, "SELECT count(*) FROM words WHERE words MATCH 'houses'"), ALL);
  EXPECT_EQ(Number(db, "SELECT count(*) FROM sqlite_master WHERE name LIKE 'old_words%'"), 0);
  EXPECT_EQ(Number(db, "SELECT count(*) FROM sqlite_master WHERE name LIKE 'new_words%'"), 0);
  EXPECT_EQ(Number(db,
                   "SELECT count(*) FROM files f WHERE (SELECT count(*) FROM words "
                   "WHERE words MATCH 'inode' || f.inode) <> 1"),
            0);
  Statement check;
  ASSERT_EQ(check.Prepare(db, "PRAGMA integrity_check"), SQLITE_OK);
  ASSERT_EQ(check.Step(), SQLITE_ROW);
  EXPECT_EQ(check.Bytes(0), "ok");
}

void Live(const Fault& fault, int nth) {
  World world;
  ASSERT_TRUE(world.HaveWorker());
  world.Burst();
  const Share english = TheShare("english");
  const Share german = TheShare("german");

  Arm(fault, nth);
  {
    ContentsWriter writer;
    (void)(WorkThrough(writer, english) && WorkThrough(writer, german));
    writer.Close();
  }
  Disarm();

  ContentsWriter writer;
  EXPECT_TRUE(WorkThrough(writer, german)) << IndexErrorText(writer.Error());
  writer.Close();
  ExpectWhole();
}

}  // namespace

class ContentsFaultTest : public testing::TestWithParam<Fault> {};

TEST_P(ContentsFaultTest, NextOpeningMakesGood) {
  const Fault fault = GetParam();
  ForEachCall(fault, [&fault](int nth) { Live(fault, nth); });
}

INSTANTIATE_TEST_SUITE_P(Contents, ContentsFaultTest,
                         testing::Values(Fault{Call::OPEN, SQLITE_CANTOPEN, Target::ENTRIES},
                                         Fault{Call::READ, SQLITE_IOERR_READ, Target::ENTRIES},
                                         Fault{Call::WRITE, SQLITE_IOERR_WRITE, Target::ENTRIES},
                                         Fault{Call::HALF_WRITE, SQLITE_FULL, Target::ENTRIES},
                                         Fault{Call::SYNC, SQLITE_IOERR_FSYNC, Target::ENTRIES},
                                         Fault{Call::LOCK, SQLITE_BUSY, Target::ENTRIES, 20},
                                         Fault{Call::SHARED_LOCK, SQLITE_BUSY, Target::ENTRIES, 20},
                                         Fault{Call::STATEMENT, SQLITE_IOERR, Target::ENTRIES},
                                         Fault{Call::STATEMENT, SQLITE_BUSY, Target::ENTRIES},
                                         Fault{Call::MEMORY, SQLITE_NOMEM}));

}  // namespace fileindexd::fault
