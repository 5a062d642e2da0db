// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/chunked.h"

#include <gtest/gtest.h>

#include <cstdint>

namespace fileindexd {

namespace {

using Few = Chunked<uint16_t, 4>;

}  // namespace

TEST(ChunkedTest, HoldsWhatWasWrittenAndZeroElsewhere) {
  Few values;
  values.At(3) = 7;
  values.At(1'000'000) = 9;
  values.At(3) += 1;

  EXPECT_EQ(values.Get(3), 8);
  EXPECT_EQ(values.Get(1'000'000), 9);
  for (const size_t at : {size_t{0}, size_t{2}, size_t{4}, size_t{999'999}, size_t{1'000'001},
                          size_t{4'000'000'000}}) {
    EXPECT_EQ(values.Get(at), 0) << at;
  }
}

TEST(ChunkedTest, AChunkIsThereOnlyWhereSomethingWasWritten) {
  Few values;
  EXPECT_EQ(values.End(), 0U);
  values.At(11) = 5;
  values.At(8) = 6;

  EXPECT_EQ(values.End(), 3U);
  EXPECT_EQ(values.All().size(), 1U);
  EXPECT_EQ(values.Find(1), nullptr);
  EXPECT_EQ(values.Find(3), nullptr);
  ASSERT_NE(values.Find(2), nullptr);
  EXPECT_EQ(*values.Find(2), (Few::Chunk{6, 0, 0, 5}));
}

TEST(ChunkedTest, AskingMakesNothing) {
  Few values;
  values.At(100) = 1;

  EXPECT_EQ(values.Get(1), 0);
  EXPECT_EQ(values.Get(1'000), 0);
  EXPECT_EQ(values.All().size(), 1U);
  EXPECT_EQ(values.End(), 26U);
}

TEST(ChunkedTest, ChunksKeepWhatTheyHoldWhateverOrderTheyAreMadeIn) {
  Few values;
  for (const size_t at : {size_t{400}, size_t{0}, size_t{80}, size_t{4}}) {
    values.At(at) = static_cast<uint16_t>(at + 1);
  }
  for (const size_t at : {size_t{0}, size_t{4}, size_t{80}, size_t{400}}) {
    EXPECT_EQ(values.Get(at), at + 1);
  }
  EXPECT_EQ(values.Make(20)[0], 81);
}

}  // namespace fileindexd
