// SPDX-License-Identifier: GPL-2.0-or-later
#include "optree/event.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "platform/log.h"
#include "scripted/script.h"
#include "unit/optree/tree_text.h"

namespace fileindexd {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

class EventTest : public ::testing::Test {
 protected:
  EventTest() { scripted::TheScript().Reset(); }
  ~EventTest() override { TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_ERROR; }

  static std::vector<std::string> Log() { return scripted::TheScript().Texts(); }

  // The tree that one line alone gives.
  static std::string TreeOf(const std::string& line) {
    OpTree tree("/v/s");
    EXPECT_TRUE(AddEvent(tree, line)) << line;
    return Render(tree);
  }
};

TEST_F(EventTest, EachCodeGivesItsOperations) {
  const struct {
    const char* line;
    const char* tree;
  } TABLE[] = {
      {R"({"event":2,"path":"/v/s/a"})", "4 /v/s/a"},
      {R"({"event":4,"path":"/v/s/a","data":{"k":1}})", R"(4 /v/s/a={"k":1})"},
      {R"({"event":8,"path":"/v/s/a"})", "1 /v/s/a"},
      {R"({"event":64,"path":"/v/s/a.txt"})", "1 /v/s/a.txt"},
      {R"({"event":128,"path":"/v/s/a","data":[1]})", "2 /v/s/a=[1]"},
      {R"({"event":1024,"path":"/v/s/a"})", "7 /v/s/a"},
      {R"({"event":65536,"path":"/v/s/a"})", "6 /v/s/a"},
      {R"({"event":131072,"path":"/v/s/a","data":{"audio":true}})", R"(5 /v/s/a={"audio":true})"},
      {R"({"event":256,"path":"/v/s/new","path_old":"/v/s/old","data":1})",
       "7 /v/s {6 /v/s/old=1, 3 /v/s/new=1}"},
      {R"({"event":512,"path":"/elsewhere","data":{"k":1}})", "6 /v/s"},
      {R"({"event":192,"path":"/v/s/a"})", "2 /v/s/a"},
      {R"({"event":131200,"path":"/v/s/a"})", "5 /v/s/a"},
      {R"({"event":1026,"path":"/v/s/a"})", "7 /v/s/a"},
      {R"({"event":66560,"path":"/v/s/a"})", "6 /v/s/a"},
      {R"({"event":72,"path":"/v/s/a"})", "1 /v/s/a"},
      {R"({"event":64.0,"path":"/v/s/a"})", "1 /v/s/a"},
      {R"({"event":64.7,"path":"/v/s/a"})", "1 /v/s/a"},
      {R"({"event":64,"path":""})", "1 "},
      {"  {\"event\":64,\"path\":\"/v/s/a\"}\r", "1 /v/s/a"},
  };
  for (const auto& row : TABLE) {
    EXPECT_EQ(TreeOf(row.line), row.tree) << row.line;
  }
  EXPECT_THAT(Log(), IsEmpty());
}

TEST_F(EventTest, ACodeMayBeWhateverConvertsToANumber) {
  EXPECT_EQ(TreeOf(R"({"event":true,"path":"/v/s/a"})"), "0 /v/s/a");
  EXPECT_EQ(TreeOf(R"({"event":null,"path":"/v/s/a"})"), "0 /v/s/a");
  EXPECT_THAT(Log(), ElementsAre("Unknown event: 1, path=/v/s/a", "Unknown event: 0, path=/v/s/a"));
}

TEST_F(EventTest, ARenameHidesAllOtherBits) {
  EXPECT_EQ(TreeOf(R"({"event":131968,"path":"/v/s/n","path_old":"/v/s/o"})"),
            "7 /v/s {6 /v/s/o, 3 /v/s/n}");  // 0x20000 | 0x200 | 0x100 | 0x80
  EXPECT_EQ(TreeOf(R"({"event":640,"path":"/v/s/n"})"), "6 /v/s");  // 0x200 | 0x80
}

TEST_F(EventTest, ARenameWithoutAnOldPathReindexesTheEmptyPath) {
  EXPECT_EQ(TreeOf(R"({"event":256,"path":"/v/s/new"})"), "6 ");
}

TEST_F(EventTest, AnUnknownCodeIsLoggedAndTakesTheNodeOfAnEarlierOperation) {
  OpTree tree("/v/s");
  AddEvent(tree, R"({"event":64,"path":"/v/s/a"})");
  EXPECT_TRUE(AddEvent(tree, R"({"event":1,"path":"/v/s/a"})"));

  EXPECT_EQ(Render(tree), "0 /v/s/a");
  EXPECT_THAT(Log(), ElementsAre("Unknown event: 1, path=/v/s/a"));
}

TEST_F(EventTest, AMalformedLineIsRefusedAndLogged) {
  const char* const LINES[] = {
      "",
      " ",
      "text",
      "[]",
      "[{\"event\":64,\"path\":\"/v/s/a\"}]",
      "64",
      "null",
      "\"/v/s/a\"",
      "{",
      "}",
      "{}",
      "{\"event\":64,",
      "\"path\":\"/v/s/a\"}",
      R"({"path":"/v/s/a"})",
      R"({"event":64})",
      R"({"event":64,"Path":"/v/s/a"})",
      R"({"event":-1,"path":"/v/s/a"})",
      R"({"event":"64","path":"/v/s/a"})",
      R"({"event":4294967296,"path":"/v/s/a"})",
      R"({"event":1e20,"path":"/v/s/a"})",
      R"({"event":{},"path":"/v/s/a"} )",
      R"({"event":[64],"path":"/v/s/a"})",
      R"({"event":64,"path":5})",
      R"({"event":64,"path":null})",
      R"({"event":64,"path":["/v/s/a"]})",
      R"({"event":64,"path":"/v/s/a"} trailing)",
      R"({"event":64,"path":"/v/s/a"}{})",
      R"({"event":64,"path":"/v/s/a",})",
      R"(// {"event":64,"path":"/v/s/a"})",
      R"({'event':64,'path':'/v/s/a'})",
  };
  for (const char* line : LINES) {
    scripted::TheScript().Reset();
    OpTree tree("/v/s");
    EXPECT_FALSE(AddEvent(tree, line)) << line;
    EXPECT_EQ(Render(tree), "empty") << line;
    EXPECT_THAT(Log(), ElementsAre(std::string("Malformed event: ") + line));
  }
}

TEST_F(EventTest, AnOldPathThatIsNoTextThrows) {
  OpTree tree("/v/s");
  EXPECT_THROW(AddEvent(tree, R"({"event":256,"path":"/v/s/n","path_old":{}})"), std::exception);
  EXPECT_THROW(AddEvent(tree, R"({"event":64,"path":"/v/s/n","path_old":[1]})"), std::exception);
}

TEST_F(EventTest, EveryKnownBitIsToldAtDebugLevelInItsOrder) {
  TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_DEBUG;

  EXPECT_EQ(EventToOp(0x304CE, "/p"), OP_UPDATE_DIR);

  EXPECT_THAT(Log(), ElementsAre("QLIB_NOTIFY_MODIFY: /p", "QLIB_NOTIFY_ATTRIB: /p",
                                 "QLIB_NOTIFY_CLOSE_WRITE: /p", "QLIB_NOTIFY_CREATE: /p",
                                 "QLIB_NOTIFY_DELETE: /p", "QLIB_NOTIFY_QUEUE_RESET: /p",
                                 "CUSTOM_EVENT_REINDEX: /p", "CUSTOM_EVENT_UPDATE: /p"));
}

TEST_F(EventTest, ARenameOfEitherKindIsToldInTheSameWords) {
  TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_DEBUG;
  OpTree tree("/v/s");
  AddEvent(tree, R"({"event":512,"path":"/v/s/b"})");
  AddEvent(tree, R"({"event":256,"path":"/v/s/a","path_old":"/v/s/c"})");

  EXPECT_THAT(Log(), ElementsAre("QLIB_NOTIFY_RENAME: /v/s/b", "QLIB_NOTIFY_RENAME: /v/s/a",
                                 "AppendNode /v/s/c to /v/s", "AppendNode /v/s/a to /v/s"));
}

TEST_F(EventTest, CodesWithoutAKnownBitAreUnknown) {
  for (const uint32_t code : {0x0U, 0x1U, 0x10U, 0x20U, 0x800U, 0x8000U, 0x40000U, 0x80000000U}) {
    EXPECT_EQ(EventToOp(code, "/p"), OP_UNKNOWN) << code;
  }
  EXPECT_EQ(Log().size(), 8U);
  EXPECT_EQ(Log().back(), "Unknown event: 2147483648, path=/p");
}

}  // namespace
}  // namespace fileindexd
