// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/queue_folding.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <random>

#include "base/event_codes.h"
#include "state/layout.h"

namespace fileindexd {
namespace {

using Texts = std::vector<std::string>;

class QueueFoldingTest : public testing::Test {
 protected:
  QueueFolding Folding(size_t kept) {
    return QueueFolding(
        "/s", [this](const std::string&, uint64_t limit) { return std::min(entries, limit); },
        kept);
  }

  // "MODIFY /s/a", in the order of the queue.
  static Texts Shown(QueueFolding& folding, size_t most) { return Shown(folding.Lines(most)); }
  static Texts Shown(const std::vector<QueueLine>& lines) {
    Texts texts;
    for (const QueueLine& line : lines) {
      std::string name = std::to_string(line.event);
      name = line.event == CUSTOM_EVENT_REINDEX ? "reindex" : name;
      name = line.event == CUSTOM_EVENT_UPDATE ? "update" + line.data : name;
      name = line.event == QLIB_NOTIFY_MODIFY ? "modify" : name;
      name = line.event == QLIB_NOTIFY_DELETE ? "delete" : name;
      name = line.event == QLIB_NOTIFY_RENAME ? "rename " + line.path_old : name;
      texts.push_back(name + " " + line.path);
    }
    return texts;
  }

  uint64_t entries = 0;  // below each directory
};

TEST_F(QueueFoldingTest, DirectoryStandsBeforeItsFilesAndFilesStandTogether) {
  QueueFolding folding = Folding(100);
  for (const char* path : {"/s/a/x", "/s/a!/x", "/s/b", "/s/a", "/s/a/x/y", "/s/a.b", "/s/a/z"}) {
    folding.Add(QLIB_NOTIFY_MODIFY, path);
  }

  EXPECT_EQ(Shown(folding, 100),
            Texts({"modify /s/a", "modify /s/a.b", "modify /s/b", "modify /s/a/x", "modify /s/a/z",
                   "modify /s/a/x/y", "modify /s/a!/x"}));
}

TEST_F(QueueFoldingTest, ReindexTakesInWhatStandsBelowIt) {
  QueueFolding folding = Folding(100);
  folding.Add(QLIB_NOTIFY_MODIFY, "/s/a/x");
  folding.Add(QLIB_NOTIFY_MODIFY, "/s/a!");
  folding.Add(CUSTOM_EVENT_REINDEX, "/s/a");
  folding.Add(QLIB_NOTIFY_MODIFY, "/s/a/y");
  folding.Add(CUSTOM_EVENT_UPDATE, "/s/a", "{}");

  EXPECT_EQ(Shown(folding, 100), Texts({"reindex /s/a", "modify /s/a!"}));
}

TEST_F(QueueFoldingTest, WiderOfTwoLinesAtOnePathStays) {
  QueueFolding folding = Folding(100);
  folding.Add(QLIB_NOTIFY_DELETE, "/s/later");
  folding.Add(QLIB_NOTIFY_MODIFY, "/s/later");
  folding.Add(CUSTOM_EVENT_UPDATE, "/s/update", "{1}");
  folding.Add(QLIB_NOTIFY_MODIFY, "/s/update");
  folding.Add(CUSTOM_EVENT_UPDATE, "/s/two", "{1}");
  folding.Add(CUSTOM_EVENT_UPDATE, "/s/two", "{2}");

  EXPECT_EQ(Shown(folding, 100),
            Texts({"modify /s/later", "reindex /s/two", "update{1} /s/update"}));
}

TEST_F(QueueFoldingTest, FullestDirectoryIsFoldedFirst) {
  QueueFolding folding = Folding(100);
  for (const char* path : {"/s/a/1", "/s/a/2", "/s/b/1", "/s/b/2", "/s/b/3", "/s/c/1"}) {
    folding.Add(QLIB_NOTIFY_MODIFY, path);
  }

  EXPECT_EQ(Shown(folding, 4),
            Texts({"reindex /s/b", "modify /s/a/1", "modify /s/a/2", "modify /s/c/1"}));
  EXPECT_EQ(Shown(folding, 1), Texts({"reindex /s"}));
  EXPECT_EQ(Shown(folding, 0), Texts({"reindex /s"}));
}

TEST_F(QueueFoldingTest, LoneLinesAreLiftedUntilTheyMeet) {
  QueueFolding folding = Folding(100);
  for (const char* path : {"/s/a/1/x", "/s/a/2/x", "/s/b/1/x", "/s/b/2/x", "/s/c"}) {
    folding.Add(QLIB_NOTIFY_MODIFY, path);
  }

  EXPECT_EQ(Shown(folding, 3), Texts({"reindex /s/a", "reindex /s/b", "modify /s/c"}));
}

TEST_F(QueueFoldingTest, CrowdedDirectoryBecomesOneReindexIfThatIsCheap) {
  for (const size_t files : {1000, 1001}) {
    for (const uint64_t held : {10 * files, 10 * files + 1}) {
      QueueFolding folding = Folding(5000);
      entries = held;
      for (size_t i = 0; i < files; ++i) {
        folding.Add(QLIB_NOTIFY_MODIFY, "/s/a/" + std::to_string(i));
      }
      const bool folded = files == 1001 && held == 10 * files;
      EXPECT_EQ(folding.Lines(5000).size(), folded ? 1U : files) << files << " of " << held;
    }
  }
}

TEST_F(QueueFoldingTest, RootOfTheFileSystemIsAFoldLikeAnyOther) {
  QueueFolding folding(
      "/", [](const std::string&, uint64_t limit) { return limit; }, 10);
  folding.Add(QLIB_NOTIFY_MODIFY, "/");
  folding.Add(QLIB_NOTIFY_MODIFY, "/a");
  folding.Add(QLIB_NOTIFY_MODIFY, "/b/c");

  EXPECT_EQ(Shown(folding, 10), Texts({"modify /", "modify /a", "modify /b/c"}));
  EXPECT_EQ(Shown(folding, 1), Texts({"reindex /"}));
}

TEST_F(QueueFoldingTest, NothingIsLostWhateverIsAdded) {
  for (unsigned seed = 0; seed < 200; ++seed) {
    std::mt19937 random(seed);
    const size_t kept = 1 + random() % 40;
    QueueFolding folding = Folding(kept);
    entries = random() % 20000;
    Texts added;
    for (auto i = random() % 400; i > 0; --i) {
      std::string path = "/s";
      for (auto depth = random() % 6; depth > 0; --depth) {
        path += "/" + std::string(1, "!/a0"[random() % 4 | 2]) + std::to_string(random() % 5);
      }
      folding.Add(random() % 9 == 0 ? CUSTOM_EVENT_REINDEX : QLIB_NOTIFY_MODIFY, path);
      added.push_back(path);
      ASSERT_LE(folding.Size(), 2 * kept);
    }

    const size_t most = 1 + random() % (2 * kept);
    const std::vector<QueueLine> lines = folding.Lines(most);
    EXPECT_LE(lines.size(), most);
    for (const std::string& path : added) {
      const auto mends = [&path](const QueueLine& line) {
        return line.path == path || (line.event == CUSTOM_EVENT_REINDEX && Covers(line.path, path));
      };
      EXPECT_EQ(std::count_if(lines.begin(), lines.end(), mends), 1) << path << " seed " << seed;
    }
  }
}

TEST_F(QueueFoldingTest, RenameIsOneLineWithBothPaths) {
  QueueFolding folding = Folding(100);
  folding.Add(QLIB_NOTIFY_MODIFY, "/s/b/x");
  folding.Add(QLIB_NOTIFY_MODIFY, "/s/new");
  folding.AddRename("/s/new", "/s/old");
  folding.AddRename("/s/b", "/s/c");
  for (const uint32_t event : {QLIB_NOTIFY_ATTRIB, QLIB_NOTIFY_CREATE, QLIB_NOTIFY_CLOSE_WRITE}) {
    folding.Add(event, "/s/new");
  }

  EXPECT_EQ(Shown(folding, 100),
            Texts({"rename /s/c /s/b", "rename /s/old /s/new", "modify /s/b/x"}));
}

TEST_F(QueueFoldingTest, ReindexOfOneSideOfARenameLeavesTheOther) {
  struct Case {
    Texts reindexed;
    Texts before;  // the reindexes come first
    Texts after;   // the rename comes first
  };
  for (const Case& asked : std::vector<Case>{
           {{"/s/a", "/s/b"}, {"reindex /s/a", "reindex /s/b"}, {"reindex /s/a", "reindex /s/b"}},
           {{"/s"}, {"reindex /s"}, {"reindex /s"}},
           {{"/s/b"}, {"reindex /s/b", "reindex /s/a/x"}, {"reindex /s/b", "reindex /s/a/x"}},
           {{"/s/a"}, {"reindex /s/a", "reindex /s/b/x"}, {"reindex /s/a", "rename /s/a/x /s/b/x"}},
       }) {
    QueueFolding first = Folding(100);
    QueueFolding last = Folding(100);
    last.AddRename("/s/b/x", "/s/a/x");
    for (const std::string& path : asked.reindexed) {
      first.Add(CUSTOM_EVENT_REINDEX, path);
      last.Add(CUSTOM_EVENT_REINDEX, path);
    }
    first.AddRename("/s/b/x", "/s/a/x");

    EXPECT_EQ(Shown(first, 100), asked.before);
    EXPECT_EQ(Shown(last, 100), asked.after);
  }
}

TEST_F(QueueFoldingTest, WhatARenameCannotSayWithItsLineIsAReindexOfItsFormerPath) {
  QueueFolding folding = Folding(100);
  folding.AddRename("/s/gone", "/s/1");
  folding.Add(QLIB_NOTIFY_DELETE, "/s/gone");
  folding.AddRename("/s/twice", "/s/2");
  folding.AddRename("/s/twice", "/s/3");
  folding.AddRename("/s/update", "/s/4");
  folding.Add(CUSTOM_EVENT_UPDATE, "/s/update", "{1}");
  folding.Add(CUSTOM_EVENT_UPDATE, "/s/updated", "{1}");
  folding.AddRename("/s/updated", "/s/5");
  folding.AddRename("/s/modified", "/s/6");
  folding.Add(QLIB_NOTIFY_MODIFY, "/s/modified");  // as it is gone, perhaps

  EXPECT_EQ(Shown(folding, 100),
            Texts({"reindex /s/1", "reindex /s/2", "reindex /s/4", "reindex /s/5", "reindex /s/6",
                   "delete /s/gone", "reindex /s/modified", "rename /s/3 /s/twice",
                   "reindex /s/update", "reindex /s/updated"}));
}

TEST_F(QueueFoldingTest, AFileThatWasWrittenToIsReadAnewWhateverFollows) {
  QueueFolding folding = Folding(100);
  for (const uint32_t write : {QLIB_NOTIFY_CLOSE_WRITE, QLIB_NOTIFY_CREATE}) {
    const std::string name = write == QLIB_NOTIFY_CREATE ? "/s/made" : "/s/written";
    folding.Add(write, name);
    folding.Add(QLIB_NOTIFY_ATTRIB, name);
    folding.Add(write, name + "-and-modified");
    folding.Add(QLIB_NOTIFY_MODIFY, name + "-and-modified");  // as it is gone, perhaps
    folding.Add(write, name + "-and-gone");
    folding.Add(QLIB_NOTIFY_DELETE, name + "-and-gone");
  }

  EXPECT_EQ(
      Shown(folding, 100),
      Texts({"64 /s/made", "delete /s/made-and-gone", "reindex /s/made-and-modified",
             "8 /s/written", "delete /s/written-and-gone", "reindex /s/written-and-modified"}));
}

TEST_F(QueueFoldingTest, ALineFromALookNeverDisplacesAReindex) {
  QueueFolding folding = Folding(100);
  folding.Add(CUSTOM_EVENT_REINDEX, "/s/a");
  folding.Add(QLIB_NOTIFY_ATTRIB, "/s/a");
  folding.Add(QLIB_NOTIFY_DELETE, "/s/a");

  EXPECT_EQ(Shown(folding, 100), Texts({"reindex /s/a"}));
}

TEST_F(QueueFoldingTest, FirstLinesAreTakenAndTheRestStaysAsItIs) {
  QueueFolding folding = Folding(100);
  for (const char* path : {"/s/a/x", "/s/b", "/s/a", "/s/a/x/y", "/s/a/z"}) {
    folding.Add(QLIB_NOTIFY_MODIFY, path);
  }
  EXPECT_EQ(folding.Bytes(), 28U);

  EXPECT_EQ(Shown(folding.Take(3)), Texts({"modify /s/a", "modify /s/b", "modify /s/a/x"}));
  EXPECT_EQ(folding.Size(), 2U);
  EXPECT_EQ(folding.Bytes(), 14U);
  folding.Add(QLIB_NOTIFY_MODIFY, "/s/c");
  EXPECT_EQ(Shown(folding.Take(9)), Texts({"modify /s/c", "modify /s/a/z", "modify /s/a/x/y"}));
  EXPECT_EQ(folding.Bytes(), 0U);
  EXPECT_TRUE(folding.Take(9).empty());
}

// Quadratic, it would take minutes.
TEST_F(QueueFoldingTest, ManyLinesAreTakenInTheOrderOfOneSort) {
  QueueFolding folding = Folding(100000);
  QueueFolding whole = Folding(100000);
  for (int i = 0; i < 100000; ++i) {
    const std::string path = "/s/" + std::to_string(i % 997) + "/" + std::to_string(i);
    folding.Add(QLIB_NOTIFY_MODIFY, path);
    whole.Add(QLIB_NOTIFY_MODIFY, path);
  }
  entries = 1000000000;

  Texts taken;
  while (folding.Size() > 0) {
    for (std::string& text : Shown(folding.Take(10))) {
      taken.push_back(std::move(text));
    }
  }

  EXPECT_EQ(taken, Shown(whole, 100000));
}

TEST_F(QueueFoldingTest, AMillionLinesStayFew) {
  QueueFolding folding = Folding(5000);
  entries = 1000000000;
  for (int i = 0; i < 1000000; ++i) {
    folding.Add(QLIB_NOTIFY_MODIFY, "/s/" + std::to_string(i % 97) + "/" +
                                        std::to_string(i % 9973) + "/" + std::to_string(i));
  }

  EXPECT_LE(folding.Size(), 10000U);
  EXPECT_LE(folding.Lines(5000).size(), 5000U);
}

}  // namespace
}  // namespace fileindexd
