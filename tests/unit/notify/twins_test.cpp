// SPDX-License-Identifier: GPL-2.0-or-later
#include "notify/twins.h"

#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <filesystem>

#include "base/event_codes.h"
#include "state/layout.h"
#include "tests/unit/index/fixture.h"

namespace fileindexd {
namespace {

// The share holds `held` and `also`, two names of one file, and `single`.
class TwinsTest : public IndexTest {
 protected:
  void SetUp() override {
    IndexTest::SetUp();
    if (IsSkipped() || HasFatalFailure()) {
      return;
    }
    WriteFile(At("held"), "x");
    WriteFile(At("single"), "x");
    ASSERT_EQ(link(At("held").c_str(), At("also").c_str()), 0);
    AddAll();
    ASSERT_TRUE(store->GetSettings(settings));
    inode = Find("held").inode;
  }

  // The names that are to be looked at, in order.
  Names Pump(bool hurry = false) {
    std::vector<QueueLine> lines;
    twins.Pump(
        *settings, now, hurry, [this] { return is_walked; }, lines);
    Names names;
    for (const QueueLine& line : lines) {
      EXPECT_EQ(line.event, static_cast<uint32_t>(QLIB_NOTIFY_MODIFY));
      names.push_back(line.path.substr(root.size() + 1));
    }
    std::sort(names.begin(), names.end());
    return names;
  }
  void Add(Twins::Asking asking = Twins::Asking::TWICE) { twins.Add(inode, asking); }
  void Change() { ASSERT_EQ(truncate(At("held").c_str(), ++size), 0); }
  // What the daemon does with the lines.
  void Execute() {
    Refresh("held");
    Refresh("also");
    Commit();
  }
  static void Put(const std::string& path) { WriteFile(path, "{}\n"); }

  std::shared_ptr<const Settings> settings;
  uint64_t inode = 0;
  off_t size = 10;
  bool is_walked = false;
  Twins::Clock::time_point now{std::chrono::hours(1)};
  Twins twins{"s"};
};

TEST_F(TwinsTest, NothingIsDoneWhereThereIsNothing) {
  EXPECT_EQ(Pump(), Names());
  EXPECT_TRUE(twins.IsIdle());
  EXPECT_EQ(twins.NextDue(), std::nullopt);
}

TEST_F(TwinsTest, EntriesThatDifferFromTheDiskAreLookedAt) {
  Put(QueuePath("s"));
  Change();
  Add();
  EXPECT_EQ(Pump(), Names({"also", "held"}));
  EXPECT_FALSE(twins.IsIdle());
}

TEST_F(TwinsTest, EntriesThatAreAsTheDiskAreLeftAlone) {
  Add();
  EXPECT_EQ(Pump(), Names());
  EXPECT_TRUE(twins.IsIdle());
}

TEST_F(TwinsTest, EachChangeThatAnEntryShowsCounts) {
  Put(QueuePath("s"));
  const auto sees = [this](const std::string& what) {
    Add();
    EXPECT_EQ(Pump(), Names({"also", "held"})) << what;
    Execute();
    twins.Clear();
  };
  ASSERT_EQ(chmod(At("also").c_str(), 0600), 0);
  sees("mode");
  ASSERT_EQ(chown(At("also").c_str(), 7, static_cast<gid_t>(-1)), 0);
  sees("owner");
  ASSERT_EQ(chown(At("also").c_str(), static_cast<uid_t>(-1), 7), 0);
  sees("group");
  std::filesystem::last_write_time(At("also"), {});
  sees("mtime");
}

TEST_F(TwinsTest, NamesThatShowAnotherThingOrNoneAreLeftToTheirOwnChanges) {
  Put(QueuePath("s"));
  Change();
  ASSERT_EQ(unlink(At("also").c_str()), 0);
  ASSERT_EQ(rename(At("single").c_str(), At("held").c_str()), 0);
  Add();
  EXPECT_EQ(Pump(), Names());
}

TEST_F(TwinsTest, TheyAreAskedAgainWhenTheQueueFilesOfThenAreGone) {
  for (const std::string& file : {QueuePath("s"), DrainedPath("s")}) {
    Put(file);
    Add();
    EXPECT_EQ(Pump(true), Names());
    // A batch that looked at the disk before the change is committed after the first asking.
    Change();
    EXPECT_EQ(Pump(true), Names());
    EXPECT_FALSE(twins.IsIdle());

    ASSERT_EQ(unlink(file.c_str()), 0);
    Put(file);  // a later one does not count

    EXPECT_EQ(Pump(true), Names({"also", "held"})) << file;
    EXPECT_TRUE(twins.IsIdle());
    ASSERT_EQ(unlink(file.c_str()), 0);
    Execute();
  }
}

TEST_F(TwinsTest, AQueueThatIsMovedAsideIsNotGone) {
  Put(QueuePath("s"));
  Add();
  (void)Pump();
  ASSERT_EQ(rename(QueuePath("s").c_str(), DrainedPath("s").c_str()), 0);
  Change();
  EXPECT_EQ(Pump(), Names());
  ASSERT_EQ(unlink(DrainedPath("s").c_str()), 0);
  EXPECT_EQ(Pump(), Names({"also", "held"}));
}

TEST_F(TwinsTest, AWalkIsWaitedForAsWell) {
  is_walked = true;
  Add();
  EXPECT_EQ(Pump(), Names());
  Change();
  EXPECT_EQ(Pump(), Names());
  ASSERT_TRUE(twins.NextDue().has_value());
  EXPECT_GT(*twins.NextDue(), now);
  is_walked = false;
  EXPECT_EQ(Pump(), Names({"also", "held"}));
  EXPECT_TRUE(twins.IsIdle());
}

TEST_F(TwinsTest, AskedLaterIsNotAskedAtOnce) {
  Put(QueuePath("s"));
  Change();
  Add(Twins::Asking::LATER);
  EXPECT_EQ(Pump(), Names());
  ASSERT_EQ(unlink(QueuePath("s").c_str()), 0);
  EXPECT_EQ(Pump(), Names({"also", "held"}));

  Put(QueuePath("s"));
  Add(Twins::Asking::LATER);
  Add();
  EXPECT_EQ(Pump(true), Names({"also", "held"}));
}

TEST_F(TwinsTest, OneThatChangesAllTheTimeIsAskedOnceASecond) {
  Change();
  Add();
  (void)Pump();
  ASSERT_TRUE(twins.IsIdle());
  Add();
  EXPECT_EQ(Pump(), Names({"also", "held"}));
  for (int i = 0; i < 10; ++i) {
    Add();
    EXPECT_EQ(Pump(), Names());
  }
  EXPECT_EQ(twins.NextDue(), now + std::chrono::seconds(1));
  now += std::chrono::seconds(1);
  EXPECT_EQ(Pump(), Names({"also", "held"}));
  EXPECT_TRUE(twins.IsIdle());
}

TEST_F(TwinsTest, WhoeverWaitsIsNotKeptWaiting) {
  Add();
  (void)Pump();
  Add();
  (void)Pump();
  EXPECT_FALSE(twins.IsIdle());
  (void)Pump(true);
  EXPECT_TRUE(twins.IsIdle());
}

TEST_F(TwinsTest, ManyAreAskedInParts) {
  for (uint64_t i = 0; i < 3000; ++i) {
    twins.Add(1'000'000 + i, Twins::Asking::TWICE);
  }
  int rounds = 0;
  for (; !twins.IsIdle() && rounds < 100; ++rounds) {
    EXPECT_TRUE(rounds == 0 || twins.NextDue().has_value());
    EXPECT_EQ(Pump(true), Names());
  }
  EXPECT_GT(rounds, 10);
  EXPECT_LT(rounds, 20);
}

TEST_F(TwinsTest, MoreThanIsKeptIsALoss) {
  for (uint64_t i = 0; i < 50'000; ++i) {
    twins.Add(1'000'000 + i, Twins::Asking::LATER);
  }
  EXPECT_FALSE(twins.TakeLoss());
  Add();
  EXPECT_TRUE(twins.IsIdle());
  EXPECT_TRUE(twins.TakeLoss());
  EXPECT_FALSE(twins.TakeLoss());
}

TEST_F(TwinsTest, AnIndexThatIsNotThereHoldsNothing) {
  writer.reset();
  RemoveTree(IndexPath("s"));
  Add();
  EXPECT_EQ(Pump(), Names());
  EXPECT_TRUE(twins.IsIdle());
  EXPECT_FALSE(twins.TakeLoss());
}

}  // namespace
}  // namespace fileindexd
