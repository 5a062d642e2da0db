// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/alike_files.h"

#include <gmock/gmock.h>

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

  Statistics Ask() {
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

  const Statistics statistics = Ask();

  EXPECT_THAT(statistics.failures, ElementsAre());
  ASSERT_EQ(statistics.duplicates.sets.size(), 1U);
  ASSERT_EQ(statistics.duplicates.sets[0].places.size(), 2U);
  EXPECT_EQ(statistics.duplicates.sets[0].places[0].path, At("a"));
  EXPECT_EQ(statistics.duplicates.sets[0].places[1].path, At("b"));
}

TEST_F(AlikeFilesTest, EntriesThatCannotBeReadFailTheShareOnce) {
  StoreAlike({"a", "b"}, 7);
  StoreAlike({"c", "d"}, 8);
  writer.reset();
  contents.reset();
  DamageTable(IndexPath("s") + "/" + ENTRIES_FILE, "entries_by_inode");

  EXPECT_THAT(Ask().failures, ElementsAre(HasSubstr(IndexErrorText(IndexError::DAMAGED))));
}

}  // namespace
}  // namespace fileindexd
