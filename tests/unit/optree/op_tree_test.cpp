// SPDX-License-Identifier: GPL-2.0-or-later
#include "optree/op_tree.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "platform/log.h"
#include "scripted/script.h"
#include "unit/optree/tree_text.h"

namespace fileindexd {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

class OpTreeTest : public ::testing::Test {
 protected:
  OpTreeTest() { scripted::TheScript().Reset(); }
  ~OpTreeTest() override { TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_ERROR; }

  void Insert(int op, const std::string& path, const std::string& data = "null") {
    EXPECT_TRUE(tree.Insert(op, path, Parse(data)));
  }

  OpTree tree{"/v/s"};
};

TEST_F(OpTreeTest, KeepsTheSharePathAndStartsEmpty) {
  EXPECT_EQ(tree.share_path, "/v/s");
  EXPECT_EQ(Render(tree), "empty");
  EXPECT_THAT(Walk(tree), IsEmpty());
}

TEST_F(OpTreeTest, FirstPathBecomesTheRoot) {
  Insert(OP_ADD, "/v/s/a/x", R"({"k":1})");

  EXPECT_EQ(Render(tree), R"(1 /v/s/a/x={"k":1})");
}

TEST_F(OpTreeTest, NeighboursAreGroupedUnderTheirDirectory) {
  Insert(OP_ADD, "/v/s/a/x");
  Insert(OP_ADD, "/v/s/a/y");

  EXPECT_EQ(Render(tree), "7 /v/s/a {1 /v/s/a/x, 1 /v/s/a/y}");
  EXPECT_THAT(Walk(tree), ElementsAre("1 /v/s/a/x", "1 /v/s/a/y"));
}

TEST_F(OpTreeTest, DeleteOfTheGroupingDirectoryDropsWhatWasPendingBelow) {
  Insert(OP_ADD, "/v/s/a/x");
  Insert(OP_ADD, "/v/s/a/y");

  Insert(OP_DELETE, "/v/s/a");

  EXPECT_EQ(Render(tree), "2 /v/s/a");
}

TEST_F(OpTreeTest, NothingIsAddedBelowAPendingReindex) {
  Insert(OP_REINDEX, "/v/s/d");

  Insert(OP_ADD, "/v/s/d/f");

  EXPECT_EQ(Render(tree), "6 /v/s/d");
}

TEST_F(OpTreeTest, NothingIsAddedDeepBelowAPendingReindex) {
  Insert(OP_NOP, "/v/s");
  Insert(OP_REINDEX, "/v/s/d");

  Insert(OP_DELETE, "/v/s/d/e/f");

  EXPECT_EQ(Render(tree), "7 /v/s {6 /v/s/d}");
}

TEST_F(OpTreeTest, ChildrenBelowANewPathMoveUnderItAndKeepTheirOrder) {
  Insert(OP_NOP, "/v/s");
  Insert(OP_ADD, "/v/s/d/f1");
  Insert(OP_ADD, "/v/s/e");
  Insert(OP_ADD, "/v/s/d/f2");

  Insert(OP_ADD_DIR, "/v/s/d");

  EXPECT_EQ(Render(tree), "7 /v/s {1 /v/s/e, 3 /v/s/d {1 /v/s/d/f1, 1 /v/s/d/f2}}");
}

TEST_F(OpTreeTest, APathAboveTheRootGoesBesideItAndComesLater) {
  Insert(OP_ADD, "/v/s/a/b/c");
  Insert(OP_DELETE, "/v/s/a/b");

  EXPECT_EQ(Render(tree), "7 /v/s/a {1 /v/s/a/b/c, 2 /v/s/a/b}");
  EXPECT_THAT(Walk(tree), ElementsAre("1 /v/s/a/b/c", "2 /v/s/a/b"));
}

TEST_F(OpTreeTest, AGroupIsNotMergedWithTheNodeOfTheSameName) {
  Insert(OP_ADD, "/v/s/a/b");
  Insert(OP_ADD, "/v/s/a");  // group /v/s
  Insert(OP_ADD, "/v/s/a/c");

  EXPECT_EQ(Render(tree), "7 /v/s {1 /v/s/a/b, 1 /v/s/a {1 /v/s/a/c}}");
}

TEST_F(OpTreeTest, ANameThatOnlyBeginsAlikeIsNoDirectoryAbove) {
  Insert(OP_ADD, "/v/s/a");
  Insert(OP_ADD, "/v/s/ab");

  EXPECT_EQ(Render(tree), "7 /v/s {1 /v/s/a, 1 /v/s/ab}");
}

TEST_F(OpTreeTest, APathInsertedTwiceIsYieldedOnce) {
  Insert(OP_ADD, "/v/s/a");
  Insert(OP_UPDATE, "/v/s/a");

  EXPECT_THAT(Walk(tree), ElementsAre("4 /v/s/a"));
}

TEST_F(OpTreeTest, ANewDeleteOrReindexKeepsWhatIsPendingBelowAndComesBeforeIt) {
  for (const int op : {OP_DELETE, OP_REINDEX}) {
    OpTree other("/v/s");
    other.Insert(OP_NOP, "/v/s", Json::Value());
    other.Insert(OP_ADD, "/v/s/d/f", Json::Value());
    other.Insert(op, "/v/s/d", Json::Value());

    EXPECT_THAT(Walk(other), ElementsAre(std::to_string(op) + " /v/s/d", "1 /v/s/d/f"));
  }
}

TEST_F(OpTreeTest, ADeleteStillTakesChildren) {
  Insert(OP_DELETE, "/v/s/d");
  Insert(OP_ADD, "/v/s/d/f");

  EXPECT_EQ(Render(tree), "2 /v/s/d {1 /v/s/d/f}");
}

TEST_F(OpTreeTest, EveryCodeButReindexTakesChildren) {
  for (const int op : {0, 1, 2, 3, 4, 5, 7}) {
    OpTree other("/v/s");
    other.Insert(op, "/v/s/d", Json::Value());
    other.Insert(OP_ADD, "/v/s/d/f", Json::Value());
    EXPECT_EQ(Render(other), std::to_string(op) + " /v/s/d {1 /v/s/d/f}");
  }
}

TEST_F(OpTreeTest, BelowACodeOutOfRangeTheNewOperationIsLoggedAndDropped) {
  Insert(8, "/v/s/d");
  Insert(OP_DELETE, "/v/s/d/f");
  Insert(-1, "/v/s/e");  // groups under /v/s
  Insert(OP_ADD, "/v/s/e/f");

  EXPECT_EQ(Render(tree), "7 /v/s {8 /v/s/d, -1 /v/s/e}");
  EXPECT_THAT(scripted::TheScript().Texts(),
              ElementsAre("Unknown OP=2, path=/v/s/d/f", "Unknown OP=1, path=/v/s/e/f"));
}

TEST_F(OpTreeTest, ATreeOfOneNopYieldsNothing) {
  Insert(OP_NOP, "/v/s");

  EXPECT_THAT(Walk(tree), IsEmpty());
  EXPECT_FALSE(tree.begin() != tree.end());
}

TEST_F(OpTreeTest, TheWalkPassesOverNopsAtEveryDepthButNotOverWhatTheyHold) {
  Insert(OP_NOP, "/v/s");
  Insert(OP_NOP, "/v/s/a");
  Insert(OP_NOP, "/v/s/a/b");
  Insert(OP_ADD, "/v/s/a/b/c");
  Insert(OP_NOP, "/v/s/z");
  Insert(OP_UNKNOWN, "/v/s/y");

  EXPECT_THAT(Walk(tree), ElementsAre("1 /v/s/a/b/c", "0 /v/s/y"));
}

TEST_F(OpTreeTest, EachSubtreeIsFinishedBeforeTheNextSibling) {
  Insert(OP_ADD, "/v/s");
  Insert(OP_ADD, "/v/s/a");
  Insert(OP_ADD, "/v/s/b");
  Insert(OP_ADD, "/v/s/a/x");
  Insert(OP_ADD, "/v/s/b/y");
  Insert(OP_ADD, "/v/s/a/x/deep");

  EXPECT_THAT(Walk(tree), ElementsAre("1 /v/s", "1 /v/s/a", "1 /v/s/a/x", "1 /v/s/a/x/deep",
                                      "1 /v/s/b", "1 /v/s/b/y"));
}

TEST_F(OpTreeTest, IteratorsOfTwoTreesDiffer) {
  OpTree other("/v/s");
  Insert(OP_ADD, "/v/s/a");
  other.Insert(OP_ADD, "/v/s/a", Json::Value());

  EXPECT_TRUE(tree.begin() != other.begin());
  EXPECT_TRUE(tree.end() != other.end());
  EXPECT_FALSE(tree.begin() != tree.begin());
}

TEST_F(OpTreeTest, PathsAreBytes) {
  Insert(OP_ADD, "/v/s/A");
  Insert(OP_ADD, "/v/s/a");
  Insert(OP_ADD, "/v/s//a");
  Insert(OP_ADD, "/v/s/./a");

  EXPECT_EQ(Render(tree), "7 /v/s {1 /v/s/A, 1 /v/s/a, 1 /v/s//a, 1 /v/s/./a}");
}

TEST_F(OpTreeTest, PathsWithoutACommonDirectoryMeetAtTheEmptyPath) {
  Insert(OP_ADD, "/vol1/x");
  Insert(OP_ADD, "/vol2/y");
  Insert(OP_ADD, "/vol3");

  EXPECT_EQ(Render(tree), "7  {1 /vol1/x, 1 /vol2/y, 1 /vol3}");
}

TEST_F(OpTreeTest, TheEmptyPathIsAPathThatCoversAllAbsoluteOnes) {
  Insert(OP_REINDEX, "");
  Insert(OP_ADD_DIR, "/v/s/new");

  EXPECT_EQ(Render(tree), "6 ");
}

TEST_F(OpTreeTest, MovesAreToldAtDebugLevelOnly) {
  Insert(OP_ADD, "/v/s/a");
  Insert(OP_ADD, "/v/s/b");
  Insert(OP_ADD, "/v/s/c");
  EXPECT_THAT(scripted::TheScript().Texts(), IsEmpty());

  TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_DEBUG;
  OpTree other("/v/s");
  other.Insert(OP_ADD, "/v/s/a", Json::Value());
  other.Insert(OP_ADD, "/v/s/b", Json::Value());
  other.Insert(OP_ADD, "/v/s/c", Json::Value());

  EXPECT_THAT(scripted::TheScript().Texts(),
              ElementsAre("SplitNode parent(/v/s/a, /v/s/b)=/v/s", "AppendNode /v/s/c to /v/s"));
}

TEST_F(OpTreeTest, DataIsCopied) {
  Json::Value data = Parse(R"({"k":1})");
  tree.Insert(OP_ADD, "/v/s/a", data);

  data["k"] = 2;

  EXPECT_EQ(Render(tree), R"(1 /v/s/a={"k":1})");
}

TEST(CommonParentTest, IsTheLongestSharedDirectory) {
  const struct {
    const char* name;
    const char* path;
    const char* expected;
  } TABLE[] = {
      {"/v/s/a/x", "/v/s/a/y", "/v/s/a"},
      {"/v/s/ab", "/v/s/a/c", "/v/s"},
      {"/vol1/x", "/vol2/y", ""},
      {"/v/s/a/b/c", "/v/s/a/b", "/v/s/a"},
      {"/v", "/w", ""},
      {"rel/a", "rel/b", "rel"},
      {"a", "b", ""},
      {"", "/v/s", ""},
      {"/v/s", "", ""},
      {"abc", "/v/s", ""},
      {"/v/s//a", "/v/s//b", "/v/s/"},
      {"/a/b", "/a/b", "/a"},
  };
  for (const auto& row : TABLE) {
    const OpNode node(OP_ADD, row.name, Json::Value());
    EXPECT_EQ(CommonParent(node, row.path), row.expected) << row.name << " and " << row.path;
  }
}

TEST(CoversTest, IsTrueForThePathItselfAndWhatLiesBelow) {
  const struct {
    const char* name;
    const char* path;
    bool expected;
  } TABLE[] = {
      {"/a/b", "/a/b", true},   {"/a/b", "/a/b/c", true}, {"", "/a", true},
      {"/a/b", "/a/bc", false}, {"/a/b", "/a", false},    {"/a/b", "/A/b", false},
      {"/a/b", "", false},      {"", "a", false},         {"/a/b/", "/a/b", false},
      {"/a", "/b", false},      {"/a/b", "a/b", false},   {"/", "/a", false},
  };
  for (const auto& row : TABLE) {
    const OpNode node(OP_ADD, row.name, Json::Value());
    EXPECT_EQ(Covers(node, row.path), row.expected) << row.name << " over " << row.path;
  }
}

TEST(RemoveChildTest, TakesOutOneChildAndIgnoresAStranger) {
  OpNode parent(OP_NOP, "/v", Json::Value());
  OpNode stranger(OP_ADD, "/x", Json::Value());
  for (const char* name : {"/v/a", "/v/b", "/v/c"}) {
    parent.children.push_back(new OpNode(OP_ADD, name, Json::Value()));
    parent.children.back()->parent = &parent;
  }
  OpNode* middle = parent.children[1];

  RemoveChild(&parent, middle);
  RemoveChild(&parent, &stranger);

  ASSERT_EQ(parent.children.size(), 2U);
  EXPECT_EQ(parent.children[0]->name, "/v/a");
  EXPECT_EQ(parent.children[1]->name, "/v/c");
  EXPECT_EQ(middle->parent, nullptr);
  delete middle;
}

}  // namespace
}  // namespace fileindexd
