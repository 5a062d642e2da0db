// SPDX-License-Identifier: GPL-2.0-or-later
#include "platform/standalone/walk.h"

#include <gtest/gtest.h>

#include <thread>

namespace fileindexd {

class WalkTest : public testing::Test {
 protected:
  void SetUp() override { EndWalks(); }
};

TEST_F(WalkTest, OneBeginsWhereNoneWasBegunAbove) {
  EXPECT_TRUE(BeginsWalk("/s/d"));
  EXPECT_FALSE(BeginsWalk("/s/d/e"));
  EXPECT_FALSE(BeginsWalk("/s/d/e/f"));
  EXPECT_TRUE(BeginsWalk("/s/d!"));
  EXPECT_TRUE(BeginsWalk("/s"));
  EXPECT_FALSE(BeginsWalk("/s/d"));
}

TEST_F(WalkTest, ASecondEventForADirectoryBeginsAnother) {
  EXPECT_TRUE(BeginsWalk("/s/d"));
  EXPECT_FALSE(BeginsWalk("/s/d/e"));
  EXPECT_TRUE(BeginsWalk("/s/d"));
  EXPECT_TRUE(BeginsWalk("/s//d/"));
}

TEST_F(WalkTest, WhatWasLookedAtIsWalkedOnceWithoutAnotherLook) {
  NoteLookedAt("/s/d/");
  EXPECT_FALSE(BeginsWalk("/s/d"));
  EXPECT_FALSE(BeginsWalk("/s/d/e"));
  EXPECT_TRUE(BeginsWalk("/s/d"));
}

TEST_F(WalkTest, WhatWasLookedAtCountsWhereItIsNotWalkedItself) {
  NoteLookedAt("/s");
  EXPECT_FALSE(BeginsWalk("/s/d"));
}

TEST_F(WalkTest, TheEndOfAPassEndsThem) {
  EXPECT_TRUE(BeginsWalk("/s/d"));
  EndWalks();
  EXPECT_TRUE(BeginsWalk("/s/d/e"));
  NoteLookedAt("/s");
  EndWalks();
  EXPECT_TRUE(BeginsWalk("/s"));
}

TEST_F(WalkTest, EachThreadHasItsOwn) {
  EXPECT_TRUE(BeginsWalk("/s"));
  std::thread([] { EXPECT_TRUE(BeginsWalk("/s/d")); }).join();
}

}  // namespace fileindexd
