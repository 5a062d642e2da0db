// SPDX-License-Identifier: GPL-2.0-or-later
#include "notify/share_feed.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/resource.h>
#include <unistd.h>

#include <csignal>

#include "base/event_codes.h"
#include "base/scoped_fd.h"
#include "index/writer.h"
#include "state/filesystem.h"
#include "state/layout.h"
#include "state/queue_writer.h"
#include "tests/unit/notify/queue_feed_fixture.h"

namespace fileindexd {
namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;

class ShareFeedTest : public QueueFeedTest {
 protected:
  void AddWritten(int files, const std::string& below = "") {
    for (int i = 0; i < files; ++i) {
      Add(File(WRITTEN, below + std::to_string(i)));
    }
  }

  // Instead of the one folder in it.
  void IndexRoot() { settings.folders = {{"s", share, {}}}; }

  // An index that holds what is on disk, below the indexed folder.
  void MakeIndex(const Texts& names) {
    auto store = OpenStore();
    ASSERT_TRUE(store->AddShare({"s", share, FilesystemIdentity(share)})) << store->Error();
    ASSERT_TRUE(store->AddFolder(home, {})) << store->Error();
    ASSERT_TRUE(
        store->UpdateStatus("s", [](ShareStatus& status) { status.rebuild_wanted = true; }));
    EntryWriter writer("s", *store, [] {});
    for (const std::string& name : names) {
      ASSERT_TRUE(writer.Add(Path(name), {}));
    }
    ASSERT_TRUE(writer.Commit());
  }
};

TEST_F(ShareFeedTest, LinesAreSortedByDirectoryAndKeepEveryByte) {
  Make("\xff\xfe");
  MakeDirectory("dir");
  Make("dir/file");
  Make("new");
  Add(File(WRITTEN, "dir/file"));
  Add(File(WRITTEN, "\xff\xfe"));
  Add(Directory(CREATED, "else"));
  Add(Rename("old", "new"));
  Add(Directory(ATTRIBUTES, "dir"));
  Work();

  EXPECT_EQ(Queue(), Texts({Line(QLIB_NOTIFY_ATTRIB, "dir"), Line(QLIB_NOTIFY_DELETE, "else"),
                            EventLine(QLIB_NOTIFY_RENAME, Path("new"), Path("old")),
                            Line(QLIB_NOTIFY_CLOSE_WRITE, "\xff\xfe"),
                            Line(QLIB_NOTIFY_CLOSE_WRITE, "dir/file")}));
  EXPECT_TRUE(feed.IsWrittenOut());
  EXPECT_EQ(feed.NextDue(), std::nullopt);
  EXPECT_EQ(feed.counts.changes, 5U);
  EXPECT_EQ(feed.counts.lines, 5U);
  EXPECT_EQ(feed.counts.folded, 0U);
}

TEST_F(ShareFeedTest, AThousandModifiesAreOne) {
  Make("log");
  for (int i = 0; i < 1000; ++i) {
    Add(File(MODIFIED, "log"));
    Work();
  }
  EXPECT_EQ(feed.counts.lines, 0U);
  EXPECT_FALSE(feed.IsWrittenOut());

  Work(true);

  EXPECT_EQ(Queue(), Texts({Line(QLIB_NOTIFY_MODIFY, "log")}));
  EXPECT_EQ(feed.counts.changes, 1000U);
  EXPECT_EQ(feed.counts.folded, 999U);
}

TEST_F(ShareFeedTest, ALockedQueueIsTriedAgainAfterTenMilliseconds) {
  std::string error;
  ASSERT_TRUE(TouchQueue("s", error)) << error;
  ScopedFd holder(open(queue.c_str(), O_RDONLY | O_CLOEXEC));
  ASSERT_EQ(flock(holder.fd, LOCK_EX), 0);
  Make("a");
  Add(File(WRITTEN, "a"));
  Work();
  EXPECT_EQ(feed.Backlog(), 1U);
  EXPECT_EQ(feed.NextDue(), now + milliseconds(10));

  Add(File(ATTRIBUTES, "a"));
  Add(File(WRITTEN, "a"));
  Work();
  EXPECT_EQ(feed.Backlog(), 1U);
  EXPECT_EQ(Queue(), Texts());

  holder.Close();
  now += milliseconds(10);
  Work();
  EXPECT_EQ(Queue(), Texts({Line(QLIB_NOTIFY_CLOSE_WRITE, "a")}));
  EXPECT_TRUE(feed.IsWrittenOut());
}

TEST_F(ShareFeedTest, LinesGoIntoTheNewFileWhenALockedOneIsMovedAway) {
  std::string error;
  ASSERT_TRUE(TouchQueue("s", error)) << error;
  ScopedFd holder(open(queue.c_str(), O_RDONLY | O_CLOEXEC));
  ASSERT_EQ(flock(holder.fd, LOCK_EX), 0);
  Add(File(WRITTEN, "a"));
  Work();
  TakeQueue();
  holder.Close();

  Work(true);

  EXPECT_EQ(Queue(), Texts({Line(QLIB_NOTIFY_DELETE, "a")}));
  EXPECT_EQ(ReadFile(DrainedPath("s")), "");
}

TEST_F(ShareFeedTest, AFullQueueHasTheRestWaitUntilItIsTaken) {
  AddWritten(static_cast<int>(QUEUE_LINE_LIMIT) + 10);
  Work();
  EXPECT_EQ(Queue().size(), QUEUE_LINE_LIMIT);
  EXPECT_EQ(feed.Backlog(), 10U);
  EXPECT_EQ(feed.NextDue(), now + seconds(1));
  Work();
  EXPECT_EQ(feed.Backlog(), 10U);

  TakeQueue();
  Work();

  EXPECT_EQ(Queue().size(), 10U);
  EXPECT_TRUE(feed.IsWrittenOut());
  EXPECT_EQ(feed.counts.lines, QUEUE_LINE_LIMIT + 10);
}

TEST_F(ShareFeedTest, WhatCannotBeWrittenIsNotLost) {
  const int status = WaitFor(Fork([&] {
    signal(SIGXFSZ, SIG_IGN);
    const rlimit limit = {100, RLIM_INFINITY};
    setrlimit(RLIMIT_FSIZE, &limit);
    AddWritten(10);
    Work();
    const bool kept = feed.Backlog() == 10 && feed.Error().find(queue) != std::string::npos &&
                      feed.NextDue() == now + seconds(1) && ReadFile(queue).empty();
    const rlimit more = {RLIM_INFINITY, RLIM_INFINITY};
    setrlimit(RLIMIT_FSIZE, &more);
    now += seconds(1);
    Work();
    return kept && feed.Error().empty() && feed.IsWrittenOut() ? 0 : 1;
  }));

  EXPECT_EQ(status, 0);
  EXPECT_EQ(Queue().size(), 10U);
}

TEST_F(ShareFeedTest, LinesOfOthersNeedNoLook) {
  feed.AddLines(settings, {{QLIB_NOTIFY_MODIFY, Path("d/a"), {}},
                           {CUSTOM_EVENT_REINDEX, Path("d"), {}},
                           {QLIB_NOTIFY_RENAME, Path("x"), {}, Path("y")},
                           {CUSTOM_EVENT_UPDATE, Path("u"), "{\"photo\":true}"}});
  EXPECT_EQ(feed.Backlog(), 3U);
  EXPECT_LE(feed.NextDue(), now);
  Work();

  EXPECT_EQ(Queue(), Texts({Line(CUSTOM_EVENT_REINDEX, "d"),
                            EventLine(CUSTOM_EVENT_UPDATE, Path("u"), {}, "{\"photo\":true}"),
                            EventLine(QLIB_NOTIFY_RENAME, Path("x"), Path("y"))}));
}

TEST_F(ShareFeedTest, ACrowdBecomesOneReindexIfTheIndexHoldsFew) {
  MakeDirectory("crowd");
  Make("crowd/0");
  MakeIndex({"crowd", "crowd/0"});
  AddWritten(1001, "crowd/");
  Work();

  EXPECT_EQ(Queue(), Texts({Line(CUSTOM_EVENT_REINDEX, "crowd")}));
  EXPECT_EQ(feed.counts.folded, 1000U);
}

TEST_F(ShareFeedTest, ACrowdStaysWhereTheIndexCannotBeRead) {
  AddWritten(1001, "crowd/");
  Work();

  EXPECT_EQ(Queue().size(), 1001U);
}

TEST_F(ShareFeedTest, ACrowdOfDeletesDirectlyInTheRootStays) {
  IndexRoot();
  MakeIndex({});
  for (int i = 0; i < 1001; ++i) {
    Add({DELETED, false, share + "/" + std::to_string(i)});
  }
  Work();

  EXPECT_EQ(Queue().size(), 1001U);
}

TEST_F(ShareFeedTest, OfACrowdDirectlyInTheRootAllButTheDeletesIsCoarsened) {
  IndexRoot();
  MakeIndex({});
  for (int i = 0; i < 1001; ++i) {
    const std::string path = share + "/" + std::to_string(i);
    WriteFile(path, "x");
    Add({WRITTEN, false, path});
  }
  Add({DELETED, false, share + "/gone"});
  Work();
  EXPECT_EQ(Queue(), Texts({EventLine(CUSTOM_EVENT_REINDEX, share)}));
  TakeQueue();
  Work();

  EXPECT_EQ(Queue(), Texts({EventLine(QLIB_NOTIFY_DELETE, share + "/gone")}));
  EXPECT_TRUE(feed.IsWrittenOut());
  EXPECT_EQ(feed.counts.folded, 1000U);
}

TEST_F(ShareFeedTest, AReindexOfTheRootThatWaitsTakesInAllButWhatIsGone) {
  IndexRoot();
  feed.AddLines(settings, {{QLIB_NOTIFY_MODIFY, Path("before"), {}},
                           {QLIB_NOTIFY_DELETE, Path("gone"), {}},
                           {QLIB_NOTIFY_RENAME, Path("to"), {}, Path("from")}});
  feed.AddLines(settings, {{CUSTOM_EVENT_REINDEX, share, {}}});
  feed.AddLines(settings, {{QLIB_NOTIFY_MODIFY, Path("behind"), {}}});
  EXPECT_EQ(feed.Backlog(), 3U);
  Work();
  EXPECT_EQ(Queue(), Texts({EventLine(CUSTOM_EVENT_REINDEX, share)}));
  TakeQueue();
  Work();

  EXPECT_EQ(Queue(), Texts({Line(QLIB_NOTIFY_DELETE, "gone"),
                            EventLine(QLIB_NOTIFY_RENAME, Path("to"), Path("from"))}));
}

TEST_F(ShareFeedTest, WhatIsDeletedInTheRootIsToldBehindItsReindex) {
  IndexRoot();
  Add({DELETED, false, share + "/a"});
  feed.AddLines(settings, {{CUSTOM_EVENT_REINDEX, share, {}}});
  Work();
  Add({DELETED, false, share + "/b"});
  Work();
  EXPECT_EQ(Queue(), Texts({EventLine(CUSTOM_EVENT_REINDEX, share)}));
  EXPECT_EQ(feed.Backlog(), 2U);
  EXPECT_EQ(feed.counts.folded, 0U);
  TakeQueue();
  Work();

  EXPECT_EQ(Queue(), Texts({EventLine(QLIB_NOTIFY_DELETE, share + "/a"),
                            EventLine(QLIB_NOTIFY_DELETE, share + "/b")}));
  EXPECT_TRUE(feed.IsWrittenOut());
}

TEST_F(ShareFeedTest, AReindexOfTheRootWaitsUntilTheLinesBeforeItAreTaken) {
  IndexRoot();
  Add({DELETED, false, share + "/a"});
  Work();
  feed.AddLines(settings, {{CUSTOM_EVENT_REINDEX, share, {}}});
  Work(true);
  EXPECT_EQ(Queue(), Texts({EventLine(QLIB_NOTIFY_DELETE, share + "/a")}));
  EXPECT_EQ(feed.Backlog(), 1U);
  EXPECT_EQ(feed.NextDue(), now + seconds(1));
  TakeQueue();
  Work();

  EXPECT_EQ(Queue(), Texts({EventLine(CUSTOM_EVENT_REINDEX, share)}));
  EXPECT_TRUE(feed.IsWrittenOut());
  EXPECT_EQ(feed.NextDue(), std::nullopt);
}

TEST_F(ShareFeedTest, AReindexOfTheRootWaitsForTheLinesOfOthersToo) {
  const std::string others = EventLine(QLIB_NOTIFY_DELETE, share + "/a");
  std::string error;
  ASSERT_TRUE(AppendToQueue("s", {others}, error)) << error;
  IndexRoot();
  feed.AddLines(settings, {{CUSTOM_EVENT_REINDEX, share, {}}});
  Work();
  EXPECT_EQ(Queue(), Texts({others}));
  EXPECT_EQ(feed.NextDue(), now + seconds(1));
  TakeQueue();
  Work();

  EXPECT_EQ(Queue(), Texts({EventLine(CUSTOM_EVENT_REINDEX, share)}));
  EXPECT_TRUE(feed.IsWrittenOut());
}

TEST_F(ShareFeedTest, AReindexOfTheRootThatWaitsOutlivesItsShare) {
  IndexRoot();
  feed.AddLines(settings, {{CUSTOM_EVENT_REINDEX, share, {}}});
  settings = {};
  Work();

  EXPECT_EQ(Queue(), Texts({EventLine(CUSTOM_EVENT_REINDEX, share)}));
  EXPECT_TRUE(feed.IsWrittenOut());
}

TEST_F(ShareFeedTest, TooMuchGatheredIsALoss) {
  AddWritten(100'000);
  EXPECT_FALSE(feed.TakeLoss());
  Add(File(WRITTEN, "one more"));

  EXPECT_TRUE(feed.IsWrittenOut());
  EXPECT_TRUE(feed.TakeLoss());
  EXPECT_FALSE(feed.TakeLoss());
}

TEST_F(ShareFeedTest, TooLongABacklogIsALoss) {
  const std::string name(4000 - home.size(), 'x');
  std::vector<QueueLine> lines;
  for (int i = 0; i < 8300; ++i) {
    lines.push_back({QLIB_NOTIFY_MODIFY, Path(name) + std::to_string(i), {}, {}});
  }
  feed.AddLines(settings, lines);
  EXPECT_FALSE(feed.TakeLoss());
  feed.AddLines(settings, {{QLIB_NOTIFY_MODIFY, Path(std::string(500'000, 'x')), {}, {}}});

  EXPECT_TRUE(feed.IsWrittenOut());
  EXPECT_TRUE(feed.TakeLoss());
}

TEST_F(ShareFeedTest, WhatIsClearedIsNotWritten) {
  Add(File(WRITTEN, "a"));
  feed.AddLines(settings, {{QLIB_NOTIFY_MODIFY, Path("b"), {}, {}}});
  feed.AddLines(settings, {{CUSTOM_EVENT_REINDEX, share, {}, {}}});
  feed.Clear();
  Work(true);

  EXPECT_FALSE(Exists(queue));
  EXPECT_FALSE(feed.TakeLoss());
}

}  // namespace
}  // namespace fileindexd
