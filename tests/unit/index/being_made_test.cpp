// SPDX-License-Identifier: GPL-2.0-or-later
// Statistics of a share whose database is not there yet, or is just put in another's place.
#include <sys/syscall.h>
#include <time.h>
#include <unistd.h>

#include <filesystem>
#include <functional>

#include "index/statistics.h"
#include "state/layout.h"
#include "tests/unit/index/fixture.h"

namespace fileindexd {
namespace {

std::function<void()> while_asleep;  // in the place of the next sleep

class BeingMadeTest : public IndexTest {
 protected:
  void SetUp() override {
    IndexTest::SetUp();
    WriteFile(At("a"), "text");
    AddAll();
    writer.reset();
    std::filesystem::rename(Database(), Database() + ".away");
  }
  void TearDown() override {
    while_asleep = nullptr;
    IndexTest::TearDown();
  }

  static std::string Database() { return IndexPath("s") + "/entries.db"; }

  Statistics Ask() {
    Share share;
    share.name = "s";
    share.path = root;
    StatisticsWish wish;
    wish.shares = {share};
    wish.totals = true;
    Statistics statistics;
    Gather(wish, statistics);
    return statistics;
  }
};

TEST_F(BeingMadeTest, ADatabaseThatComesAtOnceIsCounted) {
  while_asleep = [] { std::filesystem::rename(Database() + ".away", Database()); };

  const Statistics statistics = Ask();

  EXPECT_TRUE(statistics.failures.empty());
  ASSERT_EQ(statistics.totals.size(), 1u);
  EXPECT_EQ(statistics.totals[0].files, 1u);
}

TEST_F(BeingMadeTest, OneThatDoesNotComeIsNamed) {
  int sleeps = 0;
  while_asleep = [&sleeps] { ++sleeps; };

  EXPECT_EQ(Ask().failures.size(), 1u);
  EXPECT_GT(sleeps, 0);
}

}  // namespace
}  // namespace fileindexd

extern "C" int nanosleep(const timespec* length, timespec* left) {
  if (fileindexd::while_asleep) {
    fileindexd::while_asleep();
    return 0;
  }
  return static_cast<int>(syscall(SYS_nanosleep, length, left));
}
