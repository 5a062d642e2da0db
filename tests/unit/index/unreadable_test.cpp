// SPDX-License-Identifier: GPL-2.0-or-later
// A comparison that meets what cannot be read.
#include <cerrno>
#include <cstring>
#include <filesystem>

#include "index/compare.h"
#include "index/disk_walk.h"
#include "tests/unit/index/broken_paths.h"
#include "tests/unit/index/fixture.h"

namespace fileindexd {

class UnreadableTest : public IndexTest {
 protected:
  // Differences of every sort in "a", in "b", and between the names of the two.
  void Differ() {
    for (const char* name :
         {"a/f", "a/gone", "a/sub/f", "a!b", "a!gone", "a0", "b/f", "b/gone", "z"}) {
      MakeFolder(std::filesystem::path(At(name)).parent_path().string());
      WriteFile(At(name), "");
    }
    AddAll();
    for (const char* name : {"a/gone", "a!gone", "b/gone"}) {
      RemoveTree(At(name));
    }
    for (const char* name : {"a/f", "a/new", "a!b", "a!new", "b/f", "b/new", "z"}) {
      WriteFile(At(name), "more");
    }
  }

  // All differences, told in pieces of so many paths. `anew`: each by a comparer of its own.
  Names Compare(uint64_t paths, bool anew) {
    Names names;
    auto comparer = std::make_unique<Comparer>(*store, "s");
    EXPECT_TRUE(comparer->Start()) << comparer->Error();
    const auto collect = [&](const Found& found) {
      names.push_back(std::string(DifferenceText(found.difference)) + " " +
                      found.path.substr(root.size() + 1));
      return true;
    };
    Comparer::Result result = comparer->Run(collect, paths);
    while (result == Comparer::Result::STOPPED) {
      if (anew) {
        const std::string position = comparer->Position();
        comparer = std::make_unique<Comparer>(*store, "s");
        EXPECT_TRUE(comparer->Start(position)) << comparer->Error();
      }
      result = comparer->Run(collect, paths);
    }
    EXPECT_EQ(result, Comparer::Result::DONE) << comparer->Error();
    counts = comparer->counts;
    return names;
  }

  void ExpectInPieces(const Names& names) {
    for (const bool anew : {false, true}) {
      for (uint64_t paths = 1; paths < 15; ++paths) {
        EXPECT_EQ(Compare(paths, anew), names) << paths << (anew ? " anew" : "");
      }
    }
  }

  void TearDown() override {
    MendAll();
    IndexTest::TearDown();
  }

  Comparison counts;
};

TEST_F(UnreadableTest, NothingIsToldOfWhatADirectoryHolds) {
  Differ();
  BreakReading(At("a"), EACCES);
  const Names told = {"stale a!b",        "left-over a!gone", "missing a!new", "stale b/f",
                      "left-over b/gone", "missing b/new",    "stale z"};

  EXPECT_EQ(Compare(UINT64_MAX, false), told);
  EXPECT_EQ(counts.unreadable, 1U);
  EXPECT_EQ(counts.first_unreadable, At("a"));
  EXPECT_EQ(counts.unreadable_reason, strerror(EACCES));
  EXPECT_EQ(counts.differences, told.size());
  ExpectInPieces(told);
}

TEST_F(UnreadableTest, NothingIsToldOfAThingAndWhatLiesBelowIt) {
  Differ();
  BreakLooks(At("a"), EIO);
  BreakLooks(At("a!b"), EIO);
  BreakLooks(At("z"), EUCLEAN);
  const Names told = {"left-over a!gone", "missing a!new", "stale b/f", "left-over b/gone",
                      "missing b/new"};

  EXPECT_EQ(Compare(UINT64_MAX, false), told);
  EXPECT_EQ(counts.unreadable, 3U);
  EXPECT_EQ(counts.first_unreadable, At("a"));
  ExpectInPieces(told);
}

TEST_F(UnreadableTest, DirectoryThatFailsMidwayLeavesOutItsRest) {
  MakeFolder(At("w"));
  for (int i = 100; i < 400; ++i) {
    WriteFile(At("w/" + std::to_string(i)), "");
  }
  WriteFile(At("x"), "");
  AddAll();
  for (const char* name : {"w/110", "w/390", "x"}) {
    RemoveTree(At(name));
  }
  Comparer comparer(*store, "s");
  ASSERT_TRUE(comparer.Start());
  Names names;
  const auto collect = [&](const Found& found) {
    names.push_back(found.path.substr(root.size() + 1));
    return true;
  };
  ASSERT_EQ(comparer.Run(collect, 20), Comparer::Result::STOPPED);
  BreakLooks(At("w"), EIO);

  EXPECT_EQ(comparer.Run(collect), Comparer::Result::DONE) << comparer.Error();
  EXPECT_EQ(names, Names({"w/110", "x"}));
  EXPECT_EQ(comparer.counts.unreadable, 1U);
  EXPECT_EQ(comparer.counts.first_unreadable, At("w"));
  EXPECT_LT(comparer.counts.seen, 150U);
}

TEST_F(UnreadableTest, WhatTheIndexDoesNotHoldIsCountedToo) {
  Differ();
  MakeFolder(At("new"));
  BreakReading(At("new"), EIO);
  BreakLooks(At("b/new"), EIO);

  const Names told = Compare(UINT64_MAX, false);
  EXPECT_EQ(counts.unreadable, 2U);
  EXPECT_EQ(std::count(told.begin(), told.end(), "missing new"), 1);
  EXPECT_EQ(std::count(told.begin(), told.end(), "missing b/new"), 0);
}

TEST_F(UnreadableTest, CleanComparisonCountsNothing) {
  Differ();
  (void)Compare(UINT64_MAX, false);

  EXPECT_EQ(counts.unreadable, 0U);
  EXPECT_EQ(counts.first_unreadable, "");
}

TEST_F(UnreadableTest, RootThatCannotBeReadFailsTheComparison) {
  Differ();
  Comparer comparer(*store, "s");
  BreakReading(root, EIO);
  const auto nothing = [](const Found&) { return true; };

  const bool failed = !comparer.Start() || comparer.Run(nothing) == Comparer::Result::FAILED;
  EXPECT_TRUE(failed);
  EXPECT_NE(comparer.Error().find(root), std::string::npos);
  MendAll();
  BreakLooks(root, EIO);
  EXPECT_FALSE(comparer.Start());
}

// It is not the disk that lacks them, and everything that follows would seem unreadable.
TEST_F(UnreadableTest, WantOfDescriptorsFailsTheComparison) {
  Differ();
  BreakReading(At("a"), EMFILE);
  Comparer comparer(*store, "s");
  ASSERT_TRUE(comparer.Start());

  EXPECT_EQ(comparer.Run([](const Found&) { return true; }), Comparer::Result::FAILED);
  EXPECT_NE(comparer.Error().find(At("a")), std::string::npos);
}

TEST_F(UnreadableTest, WalkThatFailedAddsNothingTwice) {
  Differ();
  BreakReading(At("a"), EIO);
  std::shared_ptr<const Settings> in_force;
  ASSERT_TRUE(store->GetSettings(in_force));
  DiskWalk walk(*in_force);
  walk.StartAtFolders(*in_force->ShareByName("s"));
  Names found;
  Names failed;
  std::string path;
  Look look;
  for (auto step = walk.Next(path, look); step != DiskWalk::Step::END;
       step = walk.Next(path, look)) {
    (step == DiskWalk::Step::FOUND ? found : failed).push_back(path);
  }

  EXPECT_EQ(failed, Names({At("a")}));
  EXPECT_EQ(found, Names({root, At("a"), At("a!b"), At("a!new"), At("a0"), At("b"), At("b/f"),
                          At("b/new"), At("z")}));
}

}  // namespace fileindexd
