// SPDX-License-Identifier: GPL-2.0-or-later
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "optree/op_tree.h"
#include "platform/log.h"
#include "scripted/script.h"
#include "unit/optree/tree_text.h"

namespace fileindexd {
namespace {

using ::testing::ElementsAre;

// The operation after; r: data replaced, m: flags merged, i: data as it was; c: children dropped.
// Rows: the pending operation; columns: the new one, 0 to 7.
const char* const MATRIX[8][8] = {
    {"0r", "1r", "2rc", "3r", "4r", "5r", "6rc", "7r"},
    {"0r", "1r", "2rc", "3r", "4r", "5r", "6rc", "7r"},
    {"0r", "1r", "2rc", "3r", "4r", "5r", "6rc", "7r"},
    {"0r", "1r", "2rc", "3r", "4r", "5r", "6rc", "7r"},
    {"0r", "1r", "2rc", "3r", "4r", "5r", "6rc", "7r"},
    {"5m", "5m", "5mc", "5m", "5m", "5m", "5mc", "5m"},
    {"6i", "6i", "6ic", "6i", "6i", "6i", "6ic", "6i"},
    {"0r", "1r", "2rc", "3r", "4r", "5r", "6rc", "7r"},
};

const char* const OLD_DATA = R"({"document":true,"old":1,"photo":false})";
const char* const NEW_DATA =
    R"({"audio":true,"document":false,"new":2,"photo":false,"video":false})";
const char* const MERGED = R"({"audio":true,"document":true,"old":1,"photo":false,"video":false})";

class AbsorptionMatrixTest : public ::testing::TestWithParam<std::tuple<int, int>> {};

// A node with two children; attached by hand, since a reindex takes none.
std::unique_ptr<OpTree> TreeWith(int op, const std::string& data) {
  auto tree = std::make_unique<OpTree>("/v/s");
  tree->root = new OpNode(op, "/v/s/d", Parse(data));
  for (const char* name : {"/v/s/d/x", "/v/s/d/y"}) {
    tree->root->children.push_back(new OpNode(OP_ADD, name, Json::Value()));
    tree->root->children.back()->parent = tree->root;
  }
  return tree;
}

TEST_P(AbsorptionMatrixTest, GivesTheOperationTheDataAndTheChildrenOfItsCell) {
  const auto [pending, added] = GetParam();
  const std::string cell = MATRIX[pending][added];
  const auto tree = TreeWith(pending, OLD_DATA);

  tree->Insert(added, "/v/s/d", Parse(NEW_DATA));

  const char* data = cell[1] == 'r' ? NEW_DATA : cell[1] == 'm' ? MERGED : OLD_DATA;
  const std::string children = cell.ends_with("c") ? "" : " {1 /v/s/d/x, 1 /v/s/d/y}";
  EXPECT_EQ(Render(*tree), cell.substr(0, 1) + " /v/s/d=" + data + children);
}

INSTANTIATE_TEST_SUITE_P(EveryCell, AbsorptionMatrixTest,
                         ::testing::Combine(::testing::Range(0, 8), ::testing::Range(0, 8)));

class AbsorptionTest : public ::testing::Test {
 protected:
  AbsorptionTest() { scripted::TheScript().Reset(); }
  ~AbsorptionTest() override { TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_ERROR; }

  // What an update of a subtree holds after the new data was merged into the old.
  static std::string Merge(const std::string& old_data, const std::string& new_data) {
    OpNode node(OP_UPDATE_DIR, "/v/s/d", Parse(old_data));
    AbsortOP(&node, OP_UPDATE_DIR, Parse(new_data));
    EXPECT_EQ(node.op, OP_UPDATE_DIR);
    return node.data.toString();
  }
};

TEST_F(AbsorptionTest, FlagsOnceTrueStayTrueAndAllFourArePresentAfterwards) {
  const struct {
    const char* before;
    const char* added;
    const char* after;
  } TABLE[] = {
      {R"({"document":true})", R"({"document":false,"audio":true,"video":false,"photo":false})",
       R"({"audio":true,"document":true,"photo":false,"video":false})"},
      {R"({"photo":true})", R"({"photo":false})",
       R"({"audio":false,"document":false,"photo":true,"video":false})"},
      {"null", "null", R"({"audio":false,"document":false,"photo":false,"video":false})"},
      {R"({"video":null})", R"({})",
       R"({"audio":false,"document":false,"photo":false,"video":false})"},
      {R"({"kept":"k"})", R"({"dropped":"d"})",
       R"({"audio":false,"document":false,"kept":"k","photo":false,"video":false})"},
  };
  for (const auto& row : TABLE) {
    EXPECT_EQ(Merge(row.before, row.added), row.after) << row.before << " + " << row.added;
  }
}

TEST_F(AbsorptionTest, AFlagThatTheNewDataLacksTakesTheValueReadBeforeIt) {
  const struct {
    const char* added;
    const char* after;
  } TABLE[] = {
      {R"({"audio":true})", R"({"audio":true,"document":false,"photo":true,"video":true})"},
      {R"({"document":true})", R"({"audio":true,"document":true,"photo":true,"video":true})"},
      {R"({"document":true,"video":false})",
       R"({"audio":true,"document":true,"photo":false,"video":false})"},
      {R"({"photo":true})", R"({"audio":false,"document":false,"photo":true,"video":false})"},
      {R"({"document":true,"audio":"no boolean","video":1,"photo":null})",
       R"({"audio":true,"document":true,"photo":true,"video":true})"},
      {R"(["document"])", R"({"audio":false,"document":false,"photo":false,"video":false})"},
      {R"("document")", R"({"audio":false,"document":false,"photo":false,"video":false})"},
  };
  for (const auto& row : TABLE) {
    EXPECT_EQ(Merge("{}", row.added), row.after) << row.added;
  }
}

TEST_F(AbsorptionTest, DataThatHasNoMembersCannotTakeFlags) {
  for (const char* data : {"[1]", "\"text\"", "5", "true"}) {
    OpNode node(OP_UPDATE_DIR, "/v/s/d", Parse(data));
    EXPECT_THROW(AbsortOP(&node, OP_ADD, Json::Value()), std::exception) << data;
  }
}

TEST_F(AbsorptionTest, FlagsThatAreNoBooleansStopTheMergeAsAWholeButNotTheDroppingOfChildren) {
  for (const char* data :
       {R"({"document":true,"video":"x"})", R"({"audio":[]})", R"({"photo":{"k":1}})"}) {
    const auto tree = TreeWith(OP_UPDATE_DIR, data);
    const std::string before = Render(*tree);
    EXPECT_THROW(tree->Insert(OP_ADD, "/v/s/d", Parse(R"({"audio":true})")), std::exception);
    EXPECT_EQ(Render(*tree), before);

    EXPECT_THROW(tree->Insert(OP_DELETE, "/v/s/d", Json::Value()), std::exception);
    EXPECT_EQ(Render(*tree), "5 /v/s/d=" + Parse(data).toString());
  }
}

TEST_F(AbsorptionTest, AnAddsDataIsReplacedAsAWhole) {
  OpNode node(OP_ADD, "/v/s/d", Parse(R"({"x":1})"));

  AbsortOP(&node, OP_UPDATE, Json::Value());

  EXPECT_EQ(node.op, OP_UPDATE);
  EXPECT_TRUE(node.data.isNull());
}

TEST_F(AbsorptionTest, ANopOverADeleteHidesItButNotItsChildren) {
  OpTree tree("/v/s");
  tree.Insert(OP_DELETE, "/v/s/d", Json::Value());
  tree.Insert(OP_ADD, "/v/s/d/f", Json::Value());

  tree.Insert(OP_NOP, "/v/s/d", Json::Value());

  EXPECT_THAT(Walk(tree), ElementsAre("1 /v/s/d/f"));
}

TEST_F(AbsorptionTest, TheOutcomeIsToldAtDebugLevelOnly) {
  OpNode update(OP_UPDATE_DIR, "/v/s/u", Json::Value());
  OpNode reindex(OP_REINDEX, "/v/s/r", Json::Value());
  OpNode add(OP_ADD, "/v/s/a", Json::Value());
  AbsortOP(&add, OP_ADD, Json::Value());
  EXPECT_TRUE(scripted::TheScript().Texts().empty());

  TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_DEBUG;
  AbsortOP(&update, OP_DELETE, Json::Value());
  AbsortOP(&reindex, OP_ADD, Json::Value());
  AbsortOP(&add, OP_DELETE, Json::Value());

  EXPECT_THAT(scripted::TheScript().Texts(),
              ElementsAre("AbsortOP /v/s/u: 5, data merged", "AbsortOP /v/s/r: 6, ignored",
                          "AbsortOP /v/s/a: 1 -> 2"));
}

}  // namespace
}  // namespace fileindexd
