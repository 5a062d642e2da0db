// SPDX-License-Identifier: GPL-2.0-or-later
#include "search/side_work.h"

#include <gtest/gtest.h>

#include <future>

namespace fileindexd {
namespace {

TEST(SideWorkTest, ItRunsBesideAndTellsOfItsEnd) {
  SideWork work;
  EXPECT_FALSE(work.IsRunning());
  EXPECT_TRUE(work.HasEnded());
  std::promise<void> go;
  int done = 0;
  ASSERT_TRUE(work.Begin([&] {
    go.get_future().wait();
    done = 1;
  }));
  EXPECT_TRUE(work.IsRunning());
  EXPECT_FALSE(work.HasEnded());
  std::vector<pollfd> polled;
  work.AddPolled(polled);
  ASSERT_EQ(polled.size(), 1U);
  EXPECT_EQ(poll(polled.data(), 1, 0), 0);

  go.set_value();
  EXPECT_EQ(poll(polled.data(), 1, -1), 1);
  EXPECT_TRUE(work.HasEnded());
  EXPECT_TRUE(work.IsRunning()) << "until it is awaited";
  work.Await();
  EXPECT_FALSE(work.IsRunning());
  EXPECT_EQ(done, 1);
}

TEST(SideWorkTest, WhoeverAwaitsItFindsItDone) {
  SideWork work;
  for (int round = 0; round < 100; ++round) {
    int done = 0;
    ASSERT_TRUE(work.Begin([&done] { done = 1; }));
    work.Await();
    EXPECT_EQ(done, 1);
  }
}

TEST(SideWorkTest, ItsEndIsAwaitedWhenItGoes) {
  int done = 0;
  {
    SideWork work;
    ASSERT_TRUE(work.Begin([&done] { done = 1; }));
  }
  EXPECT_EQ(done, 1);
}

}  // namespace
}  // namespace fileindexd
