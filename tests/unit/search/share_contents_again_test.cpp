// SPDX-License-Identifier: GPL-2.0-or-later
// What is read once more: what killed a helper, what the disk did not give, what older readers
// read.
#include "tests/unit/search/share_contents_fixture.h"

namespace fileindexd {
namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;
using testing::IsEmpty;
using testing::Not;

TEST_F(ShareContentsTest, WhatKillsHelpersTwiceIsNotTriedAgain) {
  AddFile(1);
  Settle();
  for (int time = 0; time < 2; ++time) {
    const auto ids = GiveOut();
    ASSERT_EQ(ids.size(), 1U) << time;
    End(ids[0], ExtractOutcome::Result::KILLED);
    Pass(milliseconds(500));
  }

  EXPECT_THAT(GiveOut(), IsEmpty());
  EXPECT_EQ(Kept(1).state, ScriptedFile::State::FAILED);
  EXPECT_EQ(Kept(1).text, "the reason");
}

TEST_F(ShareContentsTest, WhatFailedWithAnOlderExtractorIsReadAnew) {
  AddFile(1);
  AddFile(2);
  Scripted().kept = Scripted().entries;
  for (const int64_t row : {1, 2}) {
    Scripted().kept[row].state = ScriptedFile::State::FAILED;
  }
  Scripted().kept[2].extractor = EXTRACTOR_VERSION - 1;
  Settle();

  EXPECT_EQ(GiveOut().size(), 1U);
  EXPECT_EQ(names, std::vector<std::string>{"f2"});
}

TEST_F(ShareContentsTest, WhatTheHostTookCostsNoTryAndIsReadLater) {
  AddFile(1);
  Settle();
  const auto ids = GiveOut();
  ASSERT_EQ(ids.size(), 1U);

  End(ids[0], ExtractOutcome::Result::LOST);
  Pass(milliseconds(500));
  EXPECT_EQ(Kept(1).tries, 0);
  EXPECT_EQ(Kept(1).state, ScriptedFile::State::WAITS);
  (void)GiveOut();
  Pass(seconds(3));

  ReadTheOne();
}

TEST_F(ShareContentsTest, WhatTheDiskDidNotGiveIsSaidAndReadWhenItIsDue) {
  AddFile(1);
  Settle();
  const auto ids = GiveOut();
  ASSERT_EQ(ids.size(), 1U);

  End(ids[0], ExtractOutcome::Result::UNREAD);
  Pass(milliseconds(500));
  EXPECT_EQ(Kept(1).state, ScriptedFile::State::UNREAD);
  EXPECT_EQ(Kept(1).text, "the reason");
  Wait(UNREAD_PAUSE - 10);
  EXPECT_GT(Count("Close"), 0U) << "the databases are not held open for it";
  Pass(seconds(12));

  ReadTheOne();
}

TEST_F(ShareContentsTest, ThoseThatAreDueInOneMomentAreAskedForUntilNoneIsLeft) {
  constexpr int64_t FILES = 3;
  for (int64_t row = 1; row <= FILES; ++row) {
    AddFile(row);
  }
  Settle();
  for (int64_t given = 0; given < FILES;) {
    const auto ids = GiveOut();
    ASSERT_FALSE(ids.empty());
    for (const auto id : ids) {
      End(id, ExtractOutcome::Result::UNREAD);
      ++given;
    }
  }
  Pass(milliseconds(500));
  Scripted().most_again = 1;
  Wait(UNREAD_PAUSE - 10);
  Pass(seconds(9));

  for (int64_t row = 1; row <= FILES; ++row) {
    Pass(seconds(2));
    EXPECT_EQ(GiveOut().size(), 1U) << row;
  }
}

TEST_F(ShareContentsTest, ThousandsThatCannotBeOpenedYetKeepNobodyFromReadingAgain) {
  const std::string path = AddFile(1);
  for (int64_t row = 2; row <= 5000; ++row) {
    AddEntry(row, path);
  }
  std::filesystem::rename(path, path + "x");
  Settle();
  EXPECT_TRUE(contents.IsNewWaiting(now));
  for (int round = 0; round < 1000 && contents.MayHaveJobs(Turn::NEW, now); ++round) {
    EXPECT_THAT(GiveOut(), IsEmpty());
    Settle();
  }

  EXPECT_FALSE(contents.MayHaveJobs(Turn::NEW, now));
  EXPECT_FALSE(contents.IsNewWaiting(now));
}

TEST_F(ShareContentsTest, WhatIsReadAgainDoesNotStandInTheWayOfWhatIsNew) {
  for (int64_t row = 1; row <= 3; ++row) {
    AddFile(row);
    Scripted().entries[row].is_old = true;
  }
  Settle();
  EXPECT_EQ(GiveOut(1).size(), 1U);
  AddFile(4);
  contents.EntriesChanged();
  Pass(seconds(1));

  EXPECT_TRUE(contents.IsNewWaiting(now));
  EXPECT_EQ(GiveOut().size(), 3U);
  EXPECT_EQ(names, (std::vector<std::string>{"f1", "f4", "f2", "f3"}));
}

}  // namespace
}  // namespace fileindexd
