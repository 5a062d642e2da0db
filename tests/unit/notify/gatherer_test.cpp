// SPDX-License-Identifier: GPL-2.0-or-later
// Which lines changes become, and when they are due.
#include <unistd.h>

#include <map>

#include "base/event_codes.h"
#include "tests/unit/notify/gatherer_fixture.h"

namespace fileindexd {
namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;

TEST_F(GathererTest, OneLineWithOneBitFitsWhatIsSeen) {
  Make("file");
  MakeDirectory("dir");
  ASSERT_EQ(symlink("/nowhere", Path("link").c_str()), 0);
  ASSERT_EQ(mkfifo(Path("fifo").c_str(), 0600), 0);
  const struct {
    uint32_t what;
    const char* name;
    Texts lines;
  } cases[] = {
      {CREATED, "file", {"CREATE file"}},
      {CREATED | DELETED, "file", {"CREATE file"}},
      {DELETED, "file", {"CREATE file"}},
      {MOVED_TO, "file", {"CREATE file"}},
      {MOVED_FROM, "file", {"CREATE file"}},
      {CREATED | MODIFIED | ATTRIBUTES, "file", {"CREATE file"}},
      {WRITTEN, "file", {"WRITE file"}},
      {CREATED | MODIFIED | WRITTEN | DELETED, "file", {"WRITE file"}},
      {MODIFIED, "file", {"MODIFY file"}},
      {MODIFIED | ATTRIBUTES, "file", {"MODIFY file"}},
      {ATTRIBUTES, "file", {"ATTRIB file"}},
      {CREATED, "link", {"CREATE link"}},
      {CREATED, "dir", {"REINDEX dir"}},
      {MOVED_TO, "dir", {"REINDEX dir"}},
      {DELETED, "dir", {"REINDEX dir"}},
      {ATTRIBUTES, "dir", {"ATTRIB dir"}},
      {CREATED, "gone", {"DELETE gone"}},
      {CREATED | DELETED, "gone", {"DELETE gone"}},
      {ATTRIBUTES, "gone", {"DELETE gone"}},
      {CREATED, "fifo", {}},
      {ATTRIBUTES, "fifo", {}},
      {CREATED | DELETED, "fifo", {"DELETE fifo"}},
      {MOVED_TO, "fifo", {"DELETE fifo"}},
      {MOVED_FROM, "fifo", {"DELETE fifo"}},
  };
  for (const auto& asked : cases) {
    Add(File(asked.what, asked.name));
    EXPECT_EQ(All(), asked.lines) << asked.what << " " << asked.name;
  }
}

TEST_F(GathererTest, WhatDoesNotBelongByItsLettersLeavesNoTrace) {
  Exclude("*.tmp");
  for (const std::string& path :
       {share + "/elsewhere", folder + "/other/x", state_root + "/x", Path("a.tmp"),
        Path(".nfs001"), Path("#snapshot/x"), std::string("/")}) {
    Add({MODIFIED, false, path});
    Add({WRITTEN, false, path});
  }

  EXPECT_EQ(gatherer.Size(), 0U);
  EXPECT_EQ(gatherer.changes, 0U);
}

TEST_F(GathererTest, ANewFileWaitsForItsCloseFiftyMilliseconds) {
  Make("closed");
  Make("open");
  Add(File(CREATED, "closed"));
  Add(File(CREATED, "open"));
  Add(File(ATTRIBUTES, "open"));
  Add(File(MODIFIED, "open"));
  EXPECT_EQ(Due(), Texts());
  now += milliseconds(5);
  Add(File(WRITTEN, "closed"));
  EXPECT_EQ(gatherer.NextDue(), now);
  EXPECT_EQ(Due(), Texts({"WRITE closed"}));
  now += milliseconds(34);
  EXPECT_EQ(Due(), Texts());
  now += milliseconds(11);
  EXPECT_EQ(Due(), Texts({"CREATE open"}));
  EXPECT_EQ(gatherer.NextDue(), std::nullopt);
}

TEST_F(GathererTest, ADirectoryWaitsForNothing) {
  MakeDirectory("dir");
  Add(Directory(CREATED, "dir"));

  EXPECT_EQ(Due(), Texts({"REINDEX dir"}));
}

TEST_F(GathererTest, AFileHeldOpenHasAModifyOnceAMinute) {
  Make("log");
  std::map<int64_t, Texts> told;
  const auto begin = now;
  for (int i = 0; i < 130; ++i, now += seconds(1)) {
    Add(File(MODIFIED, "log"));
    const Texts lines = Due();
    if (!lines.empty()) {
      told[std::chrono::duration_cast<seconds>(now - begin).count()] = lines;
    }
  }

  const Texts line{"MODIFY log"};
  EXPECT_EQ(told, (std::map<int64_t, Texts>{{1, line}, {61, line}, {121, line}}));
}

TEST_F(GathererTest, ACloseEndsTheMinute) {
  Make("log");
  Add(File(MODIFIED, "log"));
  now += seconds(1);
  EXPECT_EQ(Due(), Texts({"MODIFY log"}));
  Add(File(MODIFIED, "log"));
  now += seconds(1);
  EXPECT_EQ(Due(), Texts());
  Add(File(WRITTEN, "log"));
  EXPECT_EQ(Due(), Texts({"WRITE log"}));
  Add(File(MODIFIED, "log"));
  now += seconds(1);
  EXPECT_EQ(Due(), Texts({"MODIFY log"}));
}

TEST_F(GathererTest, UnderLoadLinesAreGatheredForFiftyMilliseconds) {
  MakeBusy();
  now += milliseconds(10);
  const auto first = now;
  for (int i = 0; i < 40; ++i) {
    Add(File(WRITTEN, "a"));
    Add(File(DELETED, "b" + std::to_string(i % 2)));
    EXPECT_EQ(Due(), Texts());
    now += milliseconds(1);
  }
  EXPECT_EQ(gatherer.NextDue(), first + milliseconds(50));
  now = first + milliseconds(50);

  EXPECT_EQ(Due(), Texts({"DELETE a", "DELETE b0", "DELETE b1"}));
  EXPECT_EQ(gatherer.folded, 77U);
}

TEST_F(GathererTest, NineteenLinesAreNoLoadAndFiftyOneMillisecondsEndIt) {
  for (int i = 0; i < 19; ++i) {
    Add(File(WRITTEN, std::to_string(i)));
  }
  EXPECT_EQ(Due().size(), 19U);
  Add(File(WRITTEN, "a"));
  EXPECT_EQ(Due(), Texts({"DELETE a"}));
  Add(File(WRITTEN, "a"));
  EXPECT_EQ(Due(), Texts());
  now += milliseconds(51);
  EXPECT_EQ(Due(), Texts({"DELETE a"}));
  Add(File(WRITTEN, "a"));
  EXPECT_EQ(Due(), Texts({"DELETE a"}));
}

TEST_F(GathererTest, AMebibyteOfPathsIsDueAtOnce) {
  MakeBusy();
  const std::string below = std::string(200, 'd') + "/";
  size_t bytes = 0;
  int files = 0;
  for (; bytes < (1 << 20); ++files) {
    EXPECT_GT(gatherer.NextDue().value_or(Gatherer::Time::max()), now);
    Add(File(WRITTEN, below + std::to_string(files)));
    bytes += Path(below + std::to_string(files)).size();
  }

  EXPECT_EQ(gatherer.NextDue(), now);
  EXPECT_EQ(Due().size(), static_cast<size_t>(files));
  Add(File(WRITTEN, "later"));
  EXPECT_EQ(gatherer.NextDue(), now + milliseconds(50));
}

TEST_F(GathererTest, AChangeAboveIndexedFoldersIsOneOfEach) {
  settings.folders.clear();
  AddFolder(share + "/up/a");
  AddFolder(share + "/up/b");
  AddFolder(share + "/upper");
  std::filesystem::create_directories(share + "/up/a");
  Add({ATTRIBUTES, true, share + "/up"});
  EXPECT_EQ(gatherer.Size(), 0U);

  Add({MOVED_TO, true, share + "/away", share + "/up"});

  EXPECT_EQ(Due(), Texts({"REINDEX /share/up/a", "DELETE /share/up/b"}));
  EXPECT_EQ(gatherer.changes, 1U);
  Add({MOVED_TO, true, share + "/up", share + "/away"});
  EXPECT_EQ(Due(), Texts({"REINDEX /share/up/a", "DELETE /share/up/b"}));
  Add({DELETED, true, share});
  EXPECT_EQ(Due().size(), 3U);
}

TEST_F(GathererTest, AnyBytesAndLongPathsAreTaken) {
  const std::string bytes = "\xff\xfe\x80\n\"\\";
  Make(bytes);
  std::string deep = Path("d");
  while (deep.size() < 3900) {
    deep += "/" + std::string(std::min<size_t>(200, 3999 - deep.size()), 'x');
  }
  std::filesystem::create_directories(deep);
  Add(File(WRITTEN, bytes));
  Add({CREATED, true, deep});

  std::vector<QueueLine> lines;
  gatherer.TakeDue(settings, now, false, lines);

  ASSERT_EQ(lines.size(), 2U);
  EXPECT_EQ(lines[0].path, Path(bytes));
  EXPECT_EQ(lines[0].event, QLIB_NOTIFY_CLOSE_WRITE);
  EXPECT_EQ(lines[1].path, deep);
  EXPECT_EQ(lines[1].event, CUSTOM_EVENT_REINDEX);
}

TEST_F(GathererTest, WhatIsNotLookedAtByTheDeadlineStays) {
  Make("a");
  Make("b");
  Add(File(WRITTEN, "a"));
  Add(File(WRITTEN, "b"));
  const size_t bytes = gatherer.Bytes();

  std::vector<QueueLine> lines;
  gatherer.TakeDue(settings, now, true, lines, std::chrono::steady_clock::now());
  EXPECT_TRUE(lines.empty());
  EXPECT_EQ(gatherer.Size(), 2U);
  EXPECT_EQ(gatherer.Bytes(), bytes);
  EXPECT_EQ(All(), (Texts{"WRITE a", "WRITE b"}));
  EXPECT_EQ(gatherer.Bytes(), 0U);
}

TEST_F(GathererTest, BytesCountWhatIsHeld) {
  Add(Rename("a", "b"));
  Add(Rename("b", "c"));
  Add(File(WRITTEN, "d"));
  EXPECT_EQ(gatherer.Bytes(), 4 * Path("a").size());

  (void)All();  // only the count matters

  EXPECT_EQ(gatherer.Bytes(), 0U);
  EXPECT_EQ(gatherer.Size(), 0U);
}

}  // namespace
}  // namespace fileindexd
