// SPDX-License-Identifier: GPL-2.0-or-later
// A comparison in pieces.
#include <fcntl.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <filesystem>
#include <thread>

#include "index/compare.h"
#include "tests/unit/index/fixture.h"

namespace fileindexd {

class ComparerTest : public IndexTest {
 protected:
  // Differences of every sort, and names around the slash.
  void Differ() {
    for (const char* name : {"a/f", "a/b/c/d", "a!b/f", "a b/f", "a.b", "a0", "b/x/y", "a/b!/z",
                             "gone/1", "gone/2", "w/1", "w/2", "w/3", "\xff\xfe"}) {
      MakeFolder(std::filesystem::path(At(name)).parent_path().string());
      WriteFile(At(name), "");
    }
    AddAll();
    RemoveTree(At("gone"));
    RemoveTree(At("a/b"));
    RemoveTree(At("w/2"));
    WriteFile(At("a/b"), "");
    WriteFile(At("a!b/f"), "more");
    MakeFolder(At("new/er"));
    WriteFile(At("new!"), "");
    WriteFile(At("new/er/file"), "");
    WriteFile(At("w/1!"), "");
    ASSERT_TRUE(store->SetFolder(root, {.document = true}));
  }

  Report Collect(Names& names, size_t stop_after = SIZE_MAX) {
    return [this, &names, stop_after](const Found& found) {
      names.push_back(std::string(DifferenceText(found.difference)) + " " +
                      (found.path == root ? "" : found.path.substr(root.size() + 1)));
      return names.size() < stop_after;
    };
  }

  int OpenDescriptors() {
    int count = 0;
    for (int fd = 0; fd < 256; ++fd) {
      count += fcntl(fd, F_GETFD) >= 0 ? 1 : 0;
    }
    return count;
  }
};

TEST_F(ComparerTest, PiecesOfAnyLengthTellWhatOneRunTells) {
  Differ();
  const Names whole = Differences();
  ASSERT_GT(whole.size(), 15U);
  for (uint64_t paths = 1; paths < 12; ++paths) {
    Comparer comparer(*store, "s");
    Names names;
    ASSERT_TRUE(comparer.Start()) << comparer.Error();
    Comparer::Result result = Comparer::Result::STOPPED;
    while (result == Comparer::Result::STOPPED) {
      result = comparer.Run(Collect(names), paths);
    }

    EXPECT_EQ(result, Comparer::Result::DONE) << comparer.Error();
    EXPECT_EQ(names, whole) << paths;
    EXPECT_EQ(comparer.counts.differences, whole.size());
  }
}

TEST_F(ComparerTest, NewComparerGoesOnFromThePositionOfAnother) {
  Differ();
  const Names whole = Differences();
  for (uint64_t paths = 1; paths < 12; ++paths) {
    std::string position;
    Names names;
    Comparer::Result result = Comparer::Result::STOPPED;
    while (result == Comparer::Result::STOPPED) {
      Comparer comparer(*store, "s");
      ASSERT_TRUE(comparer.Start(position)) << comparer.Error();
      result = comparer.Run(Collect(names), paths);
      ASSERT_GE(comparer.Position(), position);
      position = comparer.Position();
    }

    EXPECT_EQ(names, whole) << paths;
  }
}

TEST_F(ComparerTest, StopAfterAnyDifferenceLosesNone) {
  Differ();
  const Names whole = Differences();
  for (size_t k = 1; k <= whole.size(); ++k) {
    std::string position;
    Names names;
    Comparer::Result result = Comparer::Result::STOPPED;
    while (result == Comparer::Result::STOPPED) {
      Comparer comparer(*store, "s");
      ASSERT_TRUE(comparer.Start(position));
      result = comparer.Run(Collect(names, names.size() + k));
      position = comparer.Position();
    }

    EXPECT_EQ(names, whole) << k;
  }
}

TEST_F(ComparerTest, PositionsThatAreNoPathsAnyMoreServeAsWell) {
  Differ();
  const Names whole = Differences();
  for (const char* name : {"a", "a!", "a/", "a/b", "a/b/", "a/b0", "gone/1", "n", "new/er/", "~"}) {
    Names names;
    Comparer comparer(*store, "s");
    ASSERT_TRUE(comparer.Start(root + "/" + name));
    ASSERT_EQ(comparer.Run(Collect(names)), Comparer::Result::DONE);

    Names rest;
    for (const std::string& told : whole) {
      const std::string path = told.substr(told.find(' ') + 1);
      if (root + "/" + path > root + "/" + name) {
        rest.push_back(told);
      }
    }
    EXPECT_EQ(names, rest) << name;
  }
}

TEST_F(ComparerTest, NothingIsHeldBetweenTwoPieces) {
  Differ();
  Comparer comparer(*store, "s");
  ASSERT_TRUE(comparer.Start());
  const int before = OpenDescriptors();
  Names names;
  while (comparer.Run(Collect(names), 1) == Comparer::Result::STOPPED) {
    EXPECT_EQ(OpenDescriptors(), before);
    Add("a0");  // and the writer is not in the way
    Commit();
  }
}

TEST_F(ComparerTest, ProgressNeverPassesItsEstimate) {
  Differ();
  Comparer comparer(*store, "s");
  ASSERT_TRUE(comparer.Start());
  EXPECT_GE(comparer.Estimate(), 14U);
  Names names;
  while (comparer.Run(Collect(names), 1) == Comparer::Result::STOPPED) {
    EXPECT_LE(comparer.counts.compared, comparer.Estimate());
  }
  EXPECT_GE(comparer.counts.compared, comparer.counts.seen);
}

TEST_F(ComparerTest, DeepTreeIsWalkedWithFewDescriptors) {
  std::string name = "d";
  MakeFolder(At(name));
  for (int depth = 1; depth < 500; ++depth) {
    name += "/d";
    ASSERT_EQ(mkdir(At(name).c_str(), 0700), 0) << depth;
  }
  WriteFile(At(name) + "/f", "");
  rlimit limit{};
  ASSERT_EQ(getrlimit(RLIMIT_NOFILE, &limit), 0);
  const rlimit low = {64, limit.rlim_max};
  ASSERT_EQ(setrlimit(RLIMIT_NOFILE, &low), 0);
  Comparer comparer(*store, "s");
  ASSERT_TRUE(comparer.Start());
  Names names;
  EXPECT_EQ(comparer.Run(Collect(names)), Comparer::Result::DONE) << comparer.Error();
  ASSERT_EQ(setrlimit(RLIMIT_NOFILE, &limit), 0);

  EXPECT_EQ(names.size(), 502U);
}

TEST_F(ComparerTest, EmptyFolderOfAnIndexThatIsNotIsRefused) {
  WriteFile(At("f"), "");
  AddAll();
  ASSERT_EQ(unlink(At("f").c_str()), 0);
  Comparer comparer(*store, "s");
  EXPECT_FALSE(comparer.Start());
  EXPECT_NE(comparer.Error().find(root), std::string::npos);
  WriteFile(At("other"), "");
  EXPECT_TRUE(comparer.Start()) << comparer.Error();

  Delete("f");
  Commit();
  ASSERT_EQ(unlink(At("other").c_str()), 0);
  EXPECT_TRUE(comparer.Start()) << comparer.Error();
}

// A new file system makes one of its own.
TEST_F(ComparerTest, NamesThatArePassedOverFillNoFolder) {
  WriteFile(At("f"), "");
  AddAll();
  ASSERT_EQ(unlink(At("f").c_str()), 0);
  ASSERT_EQ(mkdir(At("lost+found").c_str(), 0700), 0);
  Comparer comparer(*store, "s");
  EXPECT_FALSE(comparer.Start());
  EXPECT_NE(comparer.Error().find(root), std::string::npos);
}

TEST_F(ComparerTest, FolderThatIsEmptiedMeanwhileFailsTheComparison) {
  WriteFile(At("f"), "");
  AddAll();
  Comparer comparer(*store, "s");
  ASSERT_TRUE(comparer.Start());
  ASSERT_EQ(unlink(At("f").c_str()), 0);
  Names names;

  EXPECT_EQ(comparer.Run(Collect(names)), Comparer::Result::FAILED);
  EXPECT_EQ(comparer.Run(Collect(names)), Comparer::Result::FAILED);
}

TEST_F(ComparerTest, MissingIndexIsRefusedOrTakenForEmpty) {
  MakeFolder(At("a"));
  WriteFile(At("a/f"), "");
  AddAll();
  writer.reset();
  RemoveTree(state_root + "/shares/s/index");
  Comparer comparer(*store, "s");
  EXPECT_FALSE(comparer.Start());
  EXPECT_NE(comparer.Error().find("there is no index"), std::string::npos);

  comparer.missing_is_empty = true;
  ASSERT_TRUE(comparer.Start()) << comparer.Error();
  EXPECT_FALSE(comparer.has_index);
  Names names;
  EXPECT_EQ(comparer.Run(Collect(names)), Comparer::Result::DONE) << comparer.Error();
  EXPECT_EQ(names, Names({"missing ", "missing a", "missing a/f"}));
}

TEST(WorkAtIdleTest, OnlyTheCallingThreadStepsBack) {
  constexpr int WHO_PROCESS = 1;
  const int before = getpriority(PRIO_PROCESS, 0);
  std::thread idle([] {
    WorkAtIdle();
    EXPECT_EQ(getpriority(PRIO_PROCESS, static_cast<id_t>(gettid())), 19);
    EXPECT_EQ(syscall(SYS_ioprio_get, WHO_PROCESS, gettid()) >> 13, 3);
  });
  idle.join();

  EXPECT_EQ(getpriority(PRIO_PROCESS, 0), before);
}

}  // namespace fileindexd
