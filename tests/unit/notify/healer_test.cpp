// SPDX-License-Identifier: GPL-2.0-or-later
#include "notify/healer.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/mount.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <filesystem>

#include "base/event_codes.h"
#include "base/scoped_fd.h"
#include "notify/share_comparison.h"
#include "state/filesystem.h"
#include "state/layout.h"
#include "state/progress.h"
#include "state/queue_writer.h"
#include "state/sqlite.h"
#include "tests/unit/index/fixture.h"

namespace fileindexd {

namespace {

constexpr int GENEROUS = 600000;  // milliseconds
// More than are compared in one piece.
constexpr int MANY_FILES = 2000;

}  // namespace

class HealerTest : public IndexTest {
 protected:
  void Start() { ASSERT_TRUE(healer.Start()); }

  bool IsReadable(int limit_ms) {
    pollfd watched = {healer.Descriptor(), POLLIN, 0};
    return poll(&watched, 1, limit_ms) == 1;
  }

  // The next outcomes, in the order in which they came.
  std::vector<Healing> Await(size_t count) {
    std::vector<Healing> all;
    while (all.size() < count && IsReadable(GENEROUS)) {
      for (Healing& healing : healer.Take()) {
        all.push_back(std::move(healing));
      }
    }
    EXPECT_EQ(all.size(), count);
    all.resize(count);
    return all;
  }

  // "8 new" for each line.
  Names Lines(const Healing& healing) {
    Names lines;
    for (const QueueLine& line : healing.lines) {
      lines.push_back(std::to_string(line.event) + " " + line.path.substr(root.size() + 1));
    }
    return lines;
  }

  void MakeManyFiles() {
    for (int i = 0; i < MANY_FILES; ++i) {
      WriteFile(At(std::to_string(i)), "");
    }
    AddAll();
  }

  // Until the share's comparison is known to have begun; by then it may have ended.
  void AwaitBegin(const std::string& share) {
    while (!Exists(ComparisonProgressPath(share)) && !IsReadable(1)) {
    }
  }

  void SayPressure(const std::string& percent) {
    WriteFile(folder + "/io", "some avg10=" + percent + " avg60=0.00\n");
  }

  // A second share, without an index: comparing it fails at once.
  void AddShareWithoutIndex() {
    MakeFolder(folder + "/other");
    const std::string path = folder + "/other";
    ASSERT_TRUE(store->AddShare({"other", path, FilesystemIdentity(path)}));
    ASSERT_TRUE(store->AddFolder(path, {}));
  }

  // The store stands paused: what runs waits before its first piece.
  void Pause() { ASSERT_TRUE(store->SetPause(0)); }
  void Resume() { ASSERT_TRUE(store->SetPause(-1)); }

  Healer healer{folder};  // goes first: its threads use the rest
};

TEST_F(HealerTest, DifferencesComeAsLinesThatMendThem) {
  WriteFile(At("gone"), "");
  WriteFile(At("stale"), "");
  AddAll();
  ASSERT_EQ(unlink(At("gone").c_str()), 0);
  WriteFile(At("stale"), "more");
  WriteFile(At("new"), "");
  Start();
  healer.Request("s", Urgency::NOW);
  EXPECT_TRUE(healer.IsPending("s"));

  const Healing healing = std::move(Await(1)[0]);
  EXPECT_FALSE(healer.IsPending("s"));
  EXPECT_EQ(healing.share, "s");
  EXPECT_TRUE(healing.done) << healing.error;
  EXPECT_EQ(healing.counts.differences, 3U);
  EXPECT_EQ(Lines(healing), (Names{std::to_string(QLIB_NOTIFY_MODIFY) + " gone",
                                   std::to_string(QLIB_NOTIFY_MODIFY) + " new",
                                   std::to_string(QLIB_NOTIFY_MODIFY) + " stale"}));
  EXPECT_GT(healing.began, 0);
  EXPECT_GE(healing.ended, healing.began);
}

TEST_F(HealerTest, ShareThatAgreesNeedsNoLines) {
  WriteFile(At("a"), "");
  AddAll();
  Start();
  healer.Request("s", Urgency::IDLE);

  const Healing healing = std::move(Await(1)[0]);
  EXPECT_TRUE(healing.done) << healing.error;
  EXPECT_EQ(healing.counts.compared, 2U);
  EXPECT_TRUE(healing.lines.empty());
  EXPECT_FALSE(IsReadable(0));
}

TEST_F(HealerTest, ComparisonsOfEveryUrgencyReadTheWholeShare) {
  MakeManyFiles();
  WriteFile(At("zzz"), "");
  Start();
  for (const Urgency urgency : {Urgency::NOW, Urgency::IDLE, Urgency::APART}) {
    healer.Request("s", urgency);
    const Healing healing = std::move(Await(1)[0]);
    EXPECT_TRUE(healing.done) << healing.error;
    EXPECT_EQ(healing.counts.compared, MANY_FILES + 2U);
    EXPECT_EQ(Lines(healing), Names{std::to_string(QLIB_NOTIFY_MODIFY) + " zzz"});
  }
}

TEST_F(HealerTest, PressureSlowsAComparisonAndDoesNotEndIt) {
  MakeManyFiles();
  SayPressure("100.00");
  Start();
  healer.Request("s", Urgency::NOW);
  EXPECT_EQ(Await(1)[0].counts.compared, MANY_FILES + 1U);

  healer.Request("s", Urgency::IDLE);
  AwaitBegin("s");
  healer.Request("s", Urgency::NOW);
  EXPECT_EQ(Await(1)[0].counts.compared, MANY_FILES + 1U);
}

TEST_F(HealerTest, ShareWithoutIndexAndWithoutLinesGetsItsFirst) {
  AddShareWithoutIndex();
  Start();
  healer.Request("other", Urgency::NOW);

  const Healing healing = std::move(Await(1)[0]);
  EXPECT_TRUE(healing.done) << healing.error;
  ASSERT_EQ(healing.lines.size(), 1U);
  EXPECT_EQ(healing.lines[0].event, CUSTOM_EVENT_REINDEX);
  EXPECT_EQ(healing.lines[0].path, folder + "/other");
}

TEST_F(HealerTest, FailureIsToldWithItsReasonAndWithoutLines) {
  WriteFile(At("a"), "");
  AddAll();
  std::filesystem::rename(root, root + "_away");
  AddShareWithoutIndex();
  std::string error;
  ASSERT_TRUE(AppendToQueue("other", {EventLine(CUSTOM_EVENT_REINDEX, folder + "/other")}, error));
  Start();
  for (const char* share : {"s", "other", "unknown"}) {
    healer.Request(share, Urgency::NOW);
    const Healing healing = std::move(Await(1)[0]);
    EXPECT_EQ(healing.share, share);
    EXPECT_FALSE(healing.done);
    EXPECT_NE(healing.error, "");
    EXPECT_TRUE(healing.lines.empty());
  }
}

TEST_F(HealerTest, RequestForWhatWaitsChangesNothing) {
  Pause();
  Start();
  healer.Request("other", Urgency::NOW);
  healer.Request("s", Urgency::NOW);
  healer.Request("s", Urgency::IDLE);
  healer.Request("s", Urgency::NOW);
  Resume();

  EXPECT_EQ(Await(2)[1].share, "s");
  EXPECT_FALSE(healer.IsPending("s"));
}

TEST_F(HealerTest, RequestForWhatRunsIsFollowedByAnother) {
  MakeManyFiles();
  Start();
  healer.Request("s", Urgency::NOW);
  AwaitBegin("s");
  healer.Request("s", Urgency::NOW);

  for (const Healing& healing : Await(2)) {
    EXPECT_EQ(healing.counts.compared, MANY_FILES + 1U);
  }
  EXPECT_FALSE(healer.IsPending("s"));
}

TEST_F(HealerTest, IdleComparisonThatGaveWayGoesOnWhereItWas) {
  MakeManyFiles();
  AddShareWithoutIndex();
  WriteFile(At("zzz"), "");
  Start();
  healer.Request("s", Urgency::IDLE);
  AwaitBegin("s");
  healer.Request("other", Urgency::NOW);

  for (const Healing& healing : Await(2)) {
    if (healing.share == "s") {
      EXPECT_TRUE(healing.done) << healing.error;
      EXPECT_EQ(healing.counts.compared, MANY_FILES + 2U);
      EXPECT_EQ(Lines(healing), Names{std::to_string(QLIB_NOTIFY_MODIFY) + " zzz"});
    }
  }
}

TEST_F(HealerTest, RunningComparisonCanBeForgottenAndAskedForAgain) {
  MakeManyFiles();
  Start();
  healer.Request("s", Urgency::IDLE);
  AwaitBegin("s");
  healer.Forget("s");
  EXPECT_FALSE(healer.IsPending("s"));
  healer.Request("s", Urgency::IDLE);

  EXPECT_EQ(Await(1)[0].counts.compared, MANY_FILES + 1U);
  EXPECT_FALSE(healer.IsPending("s"));
}

TEST_F(HealerTest, ProgressIsShownWhileAComparisonRuns) {
  MakeManyFiles();
  ShareComparison comparison(*store, "s");
  ASSERT_TRUE(comparison.GoOn());
  ProgressRecord record;
  ASSERT_TRUE(ReadProgress(ComparisonProgressPath("s"), record));
  EXPECT_EQ(record.what, Work::COMPARISON);
  EXPECT_GE(record.total.value_or(0), MANY_FILES + 1U);
  while (comparison.GoOn()) {
  }

  EXPECT_TRUE(comparison.healing.done) << comparison.healing.error;
  EXPECT_FALSE(Exists(ComparisonProgressPath("s")));
}

TEST_F(HealerTest, PausedComparisonWaitsAndCanBeForgotten) {
  Pause();
  Start();
  healer.Request("s", Urgency::IDLE);
  healer.Request("other", Urgency::IDLE);
  healer.Forget("s");
  healer.Forget("other");
  EXPECT_FALSE(healer.IsPending("s"));
  EXPECT_FALSE(healer.IsPending("other"));
  healer.Request("unknown", Urgency::IDLE);
  Resume();

  EXPECT_EQ(Await(1)[0].share, "unknown");
}

TEST_F(HealerTest, ForgottenOutcomeIsNotTaken) {
  Start();
  healer.Request("s", Urgency::NOW);
  ASSERT_TRUE(IsReadable(GENEROUS));
  healer.Forget("s");

  EXPECT_FALSE(IsReadable(0));
  EXPECT_TRUE(healer.Take().empty());
  EXPECT_FALSE(healer.IsPending("s"));
}

TEST_F(HealerTest, UrgentComparisonOfAnotherShareGoesFirst) {
  AddShareWithoutIndex();
  Pause();
  Start();
  healer.Request("s", Urgency::IDLE);
  healer.Request("unknown", Urgency::IDLE);
  healer.Request("other", Urgency::NOW);
  Resume();

  const std::vector<Healing> all = Await(3);
  EXPECT_EQ(all[0].share, "other");
  EXPECT_EQ(all[1].share, "s");
  EXPECT_EQ(all[2].share, "unknown");
}

TEST_F(HealerTest, UrgentComparisonOfTheSameShareTakesTheIdleOnesPlace) {
  AddAll();
  WriteFile(At("a"), "");
  Pause();
  Start();
  healer.Request("s", Urgency::IDLE);
  healer.Request("s", Urgency::NOW);
  Resume();

  EXPECT_EQ(Lines(Await(1)[0]), Names{std::to_string(QLIB_NOTIFY_MODIFY) + " a"});
  EXPECT_FALSE(healer.IsPending("s"));
  EXPECT_FALSE(IsReadable(0));
}

TEST_F(HealerTest, StopEndsWhatWaitsAndWhatRuns) {
  Pause();
  Start();
  healer.Request("s", Urgency::NOW);
  healer.Request("other", Urgency::IDLE);
  healer.Stop();
  Resume();

  EXPECT_FALSE(IsReadable(0));
  EXPECT_TRUE(healer.Take().empty());
}

// Somebody writes, who has taken "a" away because it was gone for a moment; it is back since.
class WrittenMeanwhileTest : public HealerTest {
 protected:
  void SetUp() override {
    HealerTest::SetUp();
    if (IsSkipped()) {
      return;
    }
    WriteFile(At("a"), "");
    AddAll();
    writer.reset();
    const std::string file = IndexPath("s") + "/entries.db";
    ASSERT_EQ(sqlite3_open(file.c_str(), &other), SQLITE_OK);
    int keep = 1;
    sqlite3_file_control(other, "main", SQLITE_FCNTL_PERSIST_WAL, &keep);
    const std::string sql = "BEGIN IMMEDIATE; DELETE FROM entries WHERE path = CAST('" + At("a") +
                            "' AS BLOB); UPDATE meta SET last_written = last_written + 1";
    ASSERT_EQ(Execute(other, sql.c_str()), SQLITE_OK);
  }
  ~WrittenMeanwhileTest() override { sqlite3_close(other); }

  Names Compare(ShareComparison& comparison) {
    while (comparison.GoOn()) {
    }
    EXPECT_TRUE(comparison.healing.done) << comparison.healing.error;
    return Lines(comparison.healing);
  }

  const Names missing{std::to_string(QLIB_NOTIFY_MODIFY) + " a"};
  sqlite3* other = nullptr;
};

TEST_F(WrittenMeanwhileTest, ComparisonBeginsWhenThatIsCommitted) {
  ShareComparison comparison(*store, "s");
  for (int i = 0; i < 3; ++i) {
    ASSERT_TRUE(comparison.GoOn());
  }
  ASSERT_EQ(Execute(other, "COMMIT"), SQLITE_OK);

  EXPECT_EQ(Compare(comparison), missing);
}

TEST_F(WrittenMeanwhileTest, ComparisonBeginsWhenThatIsCommittedThoughMoreIsWrittenSince) {
  ShareComparison comparison(*store, "s");
  ASSERT_TRUE(comparison.GoOn());
  ASSERT_EQ(Execute(other, "COMMIT; BEGIN IMMEDIATE"), SQLITE_OK);

  EXPECT_EQ(Compare(comparison), missing);
}

TEST_F(WrittenMeanwhileTest, ComparisonBeginsWhenThatIsGivenUp) {
  ShareComparison comparison(*store, "s");
  ASSERT_TRUE(comparison.GoOn());
  ASSERT_EQ(Execute(other, "ROLLBACK"), SQLITE_OK);

  EXPECT_EQ(Compare(comparison), Names());
}

TEST_F(WrittenMeanwhileTest, ComparisonThatWaitsNoLongerSaysSo) {
  ShareComparison comparison(*store, "s", std::chrono::milliseconds(200));
  ASSERT_TRUE(comparison.GoOn());

  EXPECT_EQ(Compare(comparison), Names());
  EXPECT_TRUE(comparison.healing.early);

  ShareComparison later(*store, "s");
  ASSERT_TRUE(later.GoOn());
  ASSERT_EQ(Execute(other, "COMMIT"), SQLITE_OK);
  EXPECT_EQ(Compare(later), missing);
  EXPECT_FALSE(later.healing.early);
}

// A FUSE file system of which nobody answers.
TEST_F(HealerTest, OneThatHangsKeepsNobodyElseWaiting) {
  WriteFile(At("a"), "");
  AddAll();
  AddShareWithoutIndex();
  ScopedFd nobody(open("/dev/fuse", O_RDWR | O_CLOEXEC));
  ASSERT_GE(nobody.fd, 0) << strerror(errno);
  const std::string options =
      "fd=" + std::to_string(nobody.fd) + ",rootmode=40000,user_id=0,group_id=0";
  ASSERT_EQ(mount("nobody", root.c_str(), "fuse", 0, options.c_str()), 0) << strerror(errno);
  Start();

  healer.Request("s", Urgency::APART);
  healer.Request("other", Urgency::NOW);
  EXPECT_EQ(Await(1)[0].share, "other");
  healer.Request("other", Urgency::IDLE);
  EXPECT_EQ(Await(1)[0].share, "other");
  EXPECT_TRUE(healer.IsPending("s"));

  ScopedFd none;
  nobody.Swap(none);
  none.Close();  // what hangs fails
  const Healing healing = std::move(Await(1)[0]);
  EXPECT_EQ(healing.share, "s");
  EXPECT_FALSE(healing.done);
  EXPECT_EQ(umount2(root.c_str(), MNT_DETACH), 0);
}

}  // namespace fileindexd
