// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/alike_files.h"

#include <gmock/gmock.h>

#include <algorithm>

#include "index/schema.h"
#include "state/layout.h"
#include "tests/unit/index/contents_fixture.h"

namespace fileindexd {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;

class AlikeFilesTest : public ContentsTest {
 protected:
  void StoreAlike(const Names& names, uint64_t sample) {
    Content content = TextContent("text");
    content.sample = sample;
    for (const std::string& name : names) {
      File(name);
      Jobs();
      ASSERT_TRUE(contents->Finish(JobOf(name).file, content));
      ASSERT_TRUE(contents->Commit());
    }
  }

  static Names Sorted(Names names) {
    std::sort(names.begin(), names.end());
    return names;
  }

  Statistics Alike() {
    StatisticsWish wish;
    wish.duplicates = true;
    wish.shares = {TheShare()};
    Statistics statistics;
    Gather(wish, statistics);
    return statistics;
  }
};

TEST_F(AlikeFilesTest, AreThoseOfOneSizeAndOneSample) {
  StoreAlike({"b", "a"}, 7);
  StoreAlike({"c"}, 8);

  const Statistics statistics = Alike();

  EXPECT_THAT(statistics.failures, ElementsAre());
  ASSERT_EQ(statistics.duplicates.sets.size(), 1U);
  ASSERT_EQ(statistics.duplicates.sets[0].places.size(), 2U);
  EXPECT_EQ(statistics.duplicates.sets[0].places[0].path, At("a"));
  EXPECT_EQ(statistics.duplicates.sets[0].places[1].path, At("b"));
}

TEST_F(AlikeFilesTest, WhatCouldNotBeReadAnewIsStillAlike) {
  StoreAlike({"a", "b"}, 7);
  OpenContents(2);
  ASSERT_EQ(Jobs().size(), 2U);
  ASSERT_TRUE(contents->Fail(JobOf("a").file, "damaged", {}, false));
  ASSERT_TRUE(contents->Unread(JobOf("b").file, "cannot be read", clock));
  ASSERT_TRUE(contents->Commit());

  EXPECT_EQ(Alike().duplicates.sets.size(), 1U);
  EXPECT_EQ(Sorted(Hits("is:duplicate")), Names({"a", "b"}));
}

TEST_F(AlikeFilesTest, WhatWasWrittenToIsNotUntilItIsReadAgain) {
  StoreAlike({"a", "b"}, 7);
  const int64_t mtime = ContentsTest::Find("a").mtime / 1'000'000'000;
  for (const char* name : {"a", "b"}) {
    SetTime(At(name), mtime);
    File(name);
    SetTime(At(name), mtime);
    Add(name);
    Commit();
    TakeIn();
  }
  ASSERT_EQ(Jobs().size(), 2U);
  ASSERT_TRUE(contents->Unread(JobOf("a").file, "cannot be read", clock));
  ASSERT_TRUE(contents->Commit());

  EXPECT_EQ(Hits("is:duplicate"), Names());
  EXPECT_EQ(Alike().duplicates.sets.size(), 0U);
}

TEST_F(AlikeFilesTest, EntriesThatCannotBeReadFailTheShareOnce) {
  StoreAlike({"a", "b"}, 7);
  StoreAlike({"c", "d"}, 8);
  writer.reset();
  contents.reset();
  DamageTable(IndexPath("s") + "/" + ENTRIES_FILE, "entries_by_inode");

  EXPECT_THAT(Alike().failures, ElementsAre(HasSubstr(IndexErrorText(IndexError::DAMAGED))));
}

}  // namespace
}  // namespace fileindexd
