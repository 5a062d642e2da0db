// SPDX-License-Identifier: GPL-2.0-or-later
// A share's whole life, with one call of its databases failing: the process lives, and the next
// touch of the queue makes good what the fault spoilt.
#include <gtest/gtest.h>
#include <sqlite3.h>

#include <algorithm>
#include <cerrno>
#include <filesystem>
#include <fstream>
#include <ostream>
#include <string>
#include <vector>

#include "index/suspicion.h"
#include "platform/log.h"
#include "state/layout.h"
#include "unit/fault/each.h"
#include "unit/fault/operations.h"
#include "unit/fault/world.h"

namespace fileindexd::fault {

void PrintTo(const Fault& fault, std::ostream* stream) {
  *stream << "call " << static_cast<int>(fault.call) << ", code " << fault.code << ", target "
          << static_cast<int>(fault.target) << ", " << fault.times << " times";
}

namespace {

void ExpectLogged(const std::vector<std::string>& any_of) {
  const std::string log = Logged();
  EXPECT_TRUE(std::any_of(any_of.begin(), any_of.end(), [&log](const std::string& text) {
    return log.find(text) != std::string::npos;
  })) << testing::PrintToString(any_of);
}

void Live(const Fault& fault, int nth) {
  TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_DEBUG;
  World world;
  Arm(fault, nth);
  // A Worker whose making fails is made by the next start, or by who asks for it.
  if (!world.HaveWorker()) {
    ExpectLogged({"Failed to initiate worker for share=s", "TALOShareGet failed, share=s"});
  }
  world.Burst();
  world.ChangeFiles();
  world.Burst();
  world.AskForReindex();
  world.Burst();
  Disarm();

  world.ExpectMadeGoodByATouch();
  ExpectEachOperationLogged();
}

// A page that cannot be read for a moment looks like a damaged one to whoever checks them all.
void CheckOnSuspicion(const Fault& fault, int nth) {
  World world;
  world.HaveWorker();
  world.Burst();
  const std::string note = IndexPath("s") + "/" + SUSPICION_NOTE;
  ASSERT_TRUE(std::ofstream(note).good());
  Arm(fault, nth);
  world.Touch();
  world.Burst();
  Disarm();

  EXPECT_EQ(Logged().find("set aside"), std::string::npos) << Logged();
  world.ExpectMadeGoodByATouch();
  EXPECT_FALSE(std::filesystem::exists(note));
}

}  // namespace

class IndexFaultTest : public testing::TestWithParam<Fault> {};

TEST_P(IndexFaultTest, NextTouchMakesGood) {
  const Fault fault = GetParam();
  ForEachCall(fault, [&fault](int nth) { Live(fault, nth); });
}

TEST(SuspicionFaultTest, AReadThatFailsOnceIsNoDamage) {
  const Fault fault{Call::READ, SQLITE_IOERR_READ, Target::ENTRIES};
  ForEachCall(fault, [&fault](int nth) { CheckOnSuspicion(fault, nth); });
}

INSTANTIATE_TEST_SUITE_P(
    Entries, IndexFaultTest,
    testing::Values(Fault{Call::OPEN, SQLITE_CANTOPEN, Target::ENTRIES},
                    Fault{Call::READ, SQLITE_IOERR_READ, Target::ENTRIES},
                    Fault{Call::WRITE, SQLITE_IOERR_WRITE, Target::ENTRIES},
                    Fault{Call::WRITE, SQLITE_FULL, Target::ENTRIES},
                    Fault{Call::HALF_WRITE, SQLITE_FULL, Target::ENTRIES},
                    Fault{Call::SYNC, SQLITE_IOERR_FSYNC, Target::ENTRIES},
                    Fault{Call::SHORT_READ, SQLITE_IOERR_SHORT_READ, Target::ENTRIES},
                    Fault{Call::SIZE, SQLITE_IOERR_FSTAT, Target::ENTRIES},
                    Fault{Call::LOCK, SQLITE_IOERR_LOCK, Target::ENTRIES},
                    Fault{Call::SHARED_MEMORY, SQLITE_IOERR_SHMMAP, Target::ENTRIES},
                    Fault{Call::SHARED_LOCK, SQLITE_IOERR_SHMLOCK, Target::ENTRIES},
                    Fault{Call::REMOVE, SQLITE_IOERR_DELETE, Target::ENTRIES},
                    Fault{Call::ACCESS, SQLITE_IOERR_ACCESS, Target::ENTRIES},
                    Fault{Call::STATEMENT, SQLITE_IOERR, Target::ENTRIES},
                    Fault{Call::STATEMENT, SQLITE_FULL, Target::ENTRIES},
                    Fault{Call::PREPARE, SQLITE_NOMEM, Target::ENTRIES}));

INSTANTIATE_TEST_SUITE_P(
    State, IndexFaultTest,
    testing::Values(Fault{Call::OPEN, SQLITE_CANTOPEN, Target::STATE},
                    Fault{Call::READ, SQLITE_IOERR_READ, Target::STATE},
                    Fault{Call::WRITE, SQLITE_IOERR_WRITE, Target::STATE},
                    Fault{Call::WRITE, SQLITE_FULL, Target::STATE},
                    Fault{Call::HALF_WRITE, SQLITE_FULL, Target::STATE},
                    Fault{Call::SYNC, SQLITE_IOERR_FSYNC, Target::STATE},
                    Fault{Call::SHORT_READ, SQLITE_IOERR_SHORT_READ, Target::STATE},
                    Fault{Call::SIZE, SQLITE_IOERR_FSTAT, Target::STATE},
                    Fault{Call::LOCK, SQLITE_IOERR_LOCK, Target::STATE},
                    Fault{Call::SHARED_MEMORY, SQLITE_IOERR_SHMMAP, Target::STATE},
                    Fault{Call::SHARED_LOCK, SQLITE_IOERR_SHMLOCK, Target::STATE},
                    Fault{Call::ACCESS, SQLITE_IOERR_ACCESS, Target::STATE},
                    Fault{Call::STATEMENT, SQLITE_IOERR, Target::STATE},
                    Fault{Call::STATEMENT, SQLITE_FULL, Target::STATE},
                    Fault{Call::PREPARE, SQLITE_NOMEM, Target::STATE}));

INSTANTIATE_TEST_SUITE_P(Memory, IndexFaultTest,
                         testing::Values(Fault{Call::MEMORY, SQLITE_NOMEM},
                                         Fault{Call::MEMORY, SQLITE_NOMEM, Target::BOTH, 20}));

INSTANTIATE_TEST_SUITE_P(
    Files, IndexFaultTest,
    testing::Values(Fault{Call::FILE_OPEN, EIO}, Fault{Call::FILE_WRITE, ENOSPC},
                    Fault{Call::FILE_SYNC, EIO}, Fault{Call::FILE_RENAME, EROFS},
                    Fault{Call::FILE_REMOVE, EROFS}, Fault{Call::FILE_MODE, EIO},
                    Fault{Call::FOLDER_MAKE, ENOSPC}));

// The fault lasts, and then it ends.
INSTANTIATE_TEST_SUITE_P(
    Lasting, IndexFaultTest,
    testing::Values(Fault{Call::OPEN, SQLITE_CANTOPEN, Target::ENTRIES, FOR_EVER},
                    Fault{Call::READ, SQLITE_IOERR_READ, Target::ENTRIES, FOR_EVER},
                    Fault{Call::WRITE, SQLITE_FULL, Target::ENTRIES, FOR_EVER},
                    Fault{Call::SYNC, SQLITE_IOERR_FSYNC, Target::ENTRIES, FOR_EVER},
                    Fault{Call::SHARED_MEMORY, SQLITE_IOERR_SHMMAP, Target::ENTRIES, FOR_EVER},
                    Fault{Call::SHARED_LOCK, SQLITE_IOERR_SHMLOCK, Target::ENTRIES, FOR_EVER},
                    Fault{Call::STATEMENT, SQLITE_IOERR, Target::ENTRIES, FOR_EVER},
                    Fault{Call::OPEN, SQLITE_CANTOPEN, Target::BOTH, FOR_EVER},
                    Fault{Call::WRITE, SQLITE_FULL, Target::STATE, FOR_EVER},
                    Fault{Call::WRITE, SQLITE_FULL, Target::BOTH, FOR_EVER},
                    Fault{Call::SYNC, SQLITE_IOERR_FSYNC, Target::BOTH, FOR_EVER},
                    Fault{Call::READ, SQLITE_IOERR_READ, Target::BOTH, FOR_EVER},
                    Fault{Call::STATEMENT, SQLITE_IOERR, Target::STATE, FOR_EVER},
                    Fault{Call::STATEMENT, SQLITE_IOERR, Target::BOTH, FOR_EVER},
                    Fault{Call::MEMORY, SQLITE_NOMEM, Target::BOTH, FOR_EVER},
                    Fault{Call::FILE_WRITE, ENOSPC, Target::BOTH, FOR_EVER},
                    Fault{Call::FILE_OPEN, EIO, Target::BOTH, FOR_EVER},
                    Fault{Call::FILE_SYNC, EIO, Target::BOTH, FOR_EVER}));

}  // namespace fileindexd::fault
