// SPDX-License-Identifier: GPL-2.0-or-later
#include "notify/gatherer.h"

#include <unistd.h>

#include <fstream>
#include <map>
#include <utility>

#include "base/event_codes.h"
#include "state/event_codes.h"
#include "tests/unit/notify/feed_fixture.h"

namespace fileindexd {
namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;
using Texts = std::vector<std::string>;

class GathererTest : public FeedTest {
 protected:
  void Add(const Change& change) { gatherer.Add(settings, change, now); }

  // "CREATE a", "RENAME a b": by path, with the indexed folder's own taken off.
  Texts Due(bool everything = false) {
    std::vector<QueueLine> lines;
    gatherer.TakeDue(settings, now, everything, lines);
    Texts texts;
    for (const QueueLine& line : lines) {
      std::string text = EventNames(line.event);
      text = text.substr(text.rfind('_') + 1) + " ";
      text += line.path_old.empty() ? "" : Name(line.path_old) + " ";
      texts.push_back(text + Name(line.path));
    }
    return texts;
  }
  Texts All() { return Due(true); }
  std::string Name(const std::string& path) const {
    return path.starts_with(home + "/") ? path.substr(home.size() + 1) : path.substr(folder.size());
  }

  void MakeBusy() {
    for (int i = 0; i < 20; ++i) {
      Add(File(WRITTEN, "busy" + std::to_string(i)));
    }
    ASSERT_EQ(Due().size(), 20U);
  }

  Gatherer gatherer{"s"};
};

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

TEST_F(GathererTest, RenameInsideIsOneLine) {
  Make("new");
  Add(File(CREATED, "old"));
  Add(Rename("old", "new"));
  Add(File(ATTRIBUTES, "new"));

  EXPECT_EQ(Due(), Texts({"RENAME old new"}));
}

TEST_F(GathererTest, RenameInIsACreateAndOutADelete) {
  Exclude("*.tmp");
  Make("file");
  MakeDirectory("dir");
  Add({MOVED_TO, false, Path("file"), folder + "/other/file"});
  Add({MOVED_TO, true, Path("dir"), Path("dir.tmp")});
  Add({MOVED_TO, false, folder + "/other/out", Path("out")});
  Add({MOVED_TO, false, Path("a.tmp"), Path("a")});

  EXPECT_EQ(Due(), Texts({"DELETE a", "REINDEX dir", "CREATE file", "DELETE out"}));
}

TEST_F(GathererTest, RenamesGoOnFromEachOther) {
  Make("c");
  Add(Rename("a", "b"));
  Add(Rename("b", "c"));

  EXPECT_EQ(Due(), Texts({"DELETE b", "RENAME a c"}));
}

TEST_F(GathererTest, RenameThereAndBackIsALookAtBoth) {
  MakeDirectory("a");
  Add(Rename("a", "b", true));
  Add(Rename("b", "a", true));

  EXPECT_EQ(Due(), Texts({"REINDEX a", "DELETE b"}));
}

TEST_F(GathererTest, RenameBackOverAnotherRenameLosesNoPath) {
  Make("o");
  Add(Rename("o", "x"));
  Add(Rename("q", "o"));
  Add(Rename("x", "o"));

  EXPECT_EQ(Due(), Texts({"CREATE o", "DELETE q", "DELETE x"}));
}

TEST_F(GathererTest, ASwapIsTwoRenames) {
  Make("a");
  Make("b");
  Add(Rename("a", "t"));
  Add(Rename("b", "a"));
  Add(Rename("t", "b"));

  EXPECT_EQ(Due(), Texts({"RENAME b a", "RENAME a b", "DELETE t"}));
}

TEST_F(GathererTest, TwoRenamesToOnePathLoseNoFormerOne) {
  Make("p");
  Add(Rename("a", "p"));
  Add(Rename("b", "p"));

  EXPECT_EQ(Due(), Texts({"DELETE a", "RENAME b p"}));
}

TEST_F(GathererTest, ATargetThatIsGoneAgainIsALookAtBoth) {
  Make("old");
  Add(Rename("old", "new"));
  Add(File(DELETED, "new"));

  EXPECT_EQ(Due(), Texts({"DELETE new", "CREATE old"}));
}

TEST_F(GathererTest, APipeRenamedOverAFileTakesItAway) {
  ASSERT_EQ(mkfifo(Path("file").c_str(), 0600), 0);
  Add(Rename("pipe", "file"));

  EXPECT_EQ(Due(), Texts({"DELETE file", "DELETE pipe"}));
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

TEST_F(GathererTest, WhatIsGatheredBelowARenamedDirectoryIsLookedAtByItsOldName) {
  MakeDirectory("new");
  Make("new/file");
  Add(File(CREATED, "old/file"));
  Add(Rename("old", "new", true));
  Add(File(WRITTEN, "new/file"));
  now += milliseconds(50);

  EXPECT_EQ(Due(), Texts({"RENAME old new", "WRITE new/file", "DELETE old/file"}));
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

// "2 links: t1 t2": what was found of changed files, with an inode, or "gone: t1".
class ChangedFileTest : public GathererTest {
 protected:
  Change Changed(uint32_t what, const std::string& name, const std::string& target) const {
    Change change = File(what, name);
    change.target = target;
    return change;
  }
  Texts Found() {
    (void)All();
    Texts found;
    for (const ChangedFile& file : std::exchange(gatherer.changed, {})) {
      std::string text = file.inode == 0 ? "gone:" : std::to_string(file.links) + " links:";
      for (const std::string& target : file.targets) {
        text += " " + target;
      }
      found.push_back(text);
    }
    return found;
  }
  void Link(const std::string& name, const std::string& other) const {
    ASSERT_EQ(link(Path(name).c_str(), Path(other).c_str()), 0);
  }
};

TEST_F(ChangedFileTest, OneThatWasChangedAndHasOtherNamesIsFound) {
  Make("file");
  Link("file", "other");
  for (const uint32_t what : {MODIFIED | 0U, ATTRIBUTES | 0U, WRITTEN | 0U, CREATED | WRITTEN}) {
    Add(Changed(what, "file", "t"));
    EXPECT_EQ(Found(), Texts{"2 links: t"}) << what;
    Add(File(what, "file"));  // the watch cannot tell
    EXPECT_EQ(Found(), Texts{"2 links:"}) << what;
  }
}

TEST_F(ChangedFileTest, OneWhoseNamesChangedAloneIsNot) {
  Make("file");
  Link("file", "other");
  Add(File(CREATED, "file"));
  Add(File(DELETED, "gone"));
  Add(Rename("before", "other"));
  EXPECT_EQ(Found(), Texts());
}

TEST_F(ChangedFileTest, OneOfASingleNameIsOnlyWhereItsHandleMayTellOfAnother) {
  Make("file");
  MakeDirectory("dir");
  Add(File(WRITTEN, "file"));
  Add(File(WRITTEN, "gone"));
  Add(Directory(ATTRIBUTES, "dir"));
  EXPECT_EQ(Found(), Texts());
  Add(Changed(WRITTEN, "file", "t"));
  Add(Changed(WRITTEN, "gone", "u"));
  EXPECT_EQ(Found(), (Texts{"1 links: t", "gone: u"}));
}

TEST_F(ChangedFileTest, ItsHandleStaysWhenItsNameGoes) {
  Make("new");
  Add(Changed(WRITTEN, "removed", "t"));
  Add(File(DELETED, "removed"));
  EXPECT_EQ(Found(), Texts{"gone: t"});
  Add(Changed(WRITTEN, "old", "t"));
  Add(Rename("old", "new"));
  EXPECT_EQ(Found(), Texts{"1 links: t"});
  Add(Changed(WRITTEN, "old", "t"));
  Add({MOVED_TO, false, folder + "/other/x", Path("old")});
  EXPECT_EQ(Found(), Texts{"gone: t"});
}

TEST_F(ChangedFileTest, OneThingAfterTheOtherAtAPathIsEachFoundOnce) {
  Make("file");
  for (const char* target : {"a", "b", "a", "c", "d", "e", "f", "f"}) {
    Add(Changed(MODIFIED, "file", target));
  }
  EXPECT_EQ(Found(), (Texts{"gone: a", "gone: b", "1 links: c d e f"}));
  EXPECT_EQ(gatherer.Bytes(), 0U);
}

TEST_F(ChangedFileTest, HandlesCountIntoTheBytes) {
  Add(File(MODIFIED, "a"));
  const size_t before = gatherer.Bytes();
  Add(Changed(MODIFIED, "a", std::string(30, 't')));
  Add(Changed(MODIFIED, "a", std::string(30, 't')));
  EXPECT_EQ(gatherer.Bytes(), before + 30);
  Add(Rename("a", "b"));  // both paths are kept
  EXPECT_EQ(gatherer.Bytes(), before + before + 30);
  gatherer.Clear();
  EXPECT_EQ(Found(), Texts());
}

}  // namespace
}  // namespace fileindexd
