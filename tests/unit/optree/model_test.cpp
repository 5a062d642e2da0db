// SPDX-License-Identifier: GPL-2.0-or-later
#include "unit/optree/model.h"

#include <gtest/gtest.h>

#include <random>

#include "optree/op_tree.h"
#include "scripted/script.h"
#include "unit/optree/tree_text.h"

namespace fileindexd {
namespace {

constexpr int BATCHES = 4000;

// Few names and little depth, so that batches meet themselves often.
class Batch {
 public:
  explicit Batch(unsigned seed) : random(seed) {}

  int Pick(int below) { return std::uniform_int_distribution<int>(0, below - 1)(random); }

  std::string Path() {
    static const char* const NAMES[] = {"a", "ab", "b", "c"};
    std::string path = Pick(40) == 0 ? "/w" : "/v/s";
    for (int depth = Pick(5); depth > 0; --depth) {
      path += std::string("/") + NAMES[Pick(4)];
    }
    return Pick(60) == 0 ? "" : path;
  }

  Json::Value Data() {
    static const char* const TEXTS[] = {
        "null",
        "{}",
        R"({"document":true})",
        R"({"audio":true,"video":false})",
        R"({"photo":true,"other":[1]})",
        R"({"document":false,"audio":false,"video":true,"photo":false})",
        R"({"document":7,"audio":true,"photo":null})",
    };
    return Parse(TEXTS[Pick(7)]);
  }

 private:
  std::mt19937 random;
};

TEST(RandomBatchTest, TreeAndModelAgreeAfterEveryInsertion) {
  scripted::TheScript().Reset();
  for (unsigned seed = 0; seed < BATCHES; ++seed) {
    Batch batch(seed);
    OpTree tree("/v/s");
    Model model;
    for (int lines = 1 + batch.Pick(30); lines > 0; --lines) {
      const int op = batch.Pick(8);
      const std::string path = batch.Path();
      const Json::Value data = batch.Data();
      tree.Insert(op, path, data);
      model.Insert(op, path, data);
      ASSERT_EQ(Render(tree), model.Render()) << "seed " << seed << ": " << op << " " << path;
    }
    ASSERT_EQ(Walk(tree), model.Walk()) << "seed " << seed;
  }
}

}  // namespace
}  // namespace fileindexd
