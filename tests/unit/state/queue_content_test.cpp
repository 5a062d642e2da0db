// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/queue_content.h"

#include <gmock/gmock.h>

#include "base/event_codes.h"
#include "state/layout.h"
#include "state/queue_writer.h"
#include "tests/unit/state/fixture.h"

namespace fileindexd {
namespace {

using testing::ElementsAre;

class QueueContentTest : public StateTest {
 protected:
  void Append(const std::vector<std::string>& lines) {
    std::string error;
    ASSERT_TRUE(AppendToQueue("s", lines, error)) << error;
  }
  // What a reindex is queued as.
  static std::string Named(const std::string& path) {
    return ReadQueueContent("s").updates.PathInFile(CUSTOM_EVENT_REINDEX, path);
  }
  void Drain() const { ASSERT_EQ(rename(QueuePath("s").c_str(), DrainedPath("s").c_str()), 0); }
};

TEST_F(QueueContentTest, AReindexIsNamedSoThatNoUpdateThatWaitsSwallowsIt) {
  EXPECT_EQ(Named("/s/f"), "/s/f");

  Append({EventLine(CUSTOM_EVENT_UPDATE, "/s/f"), EventLine(CUSTOM_EVENT_UPDATE, "/s/g/"),
          EventLine(CUSTOM_EVENT_UPDATE | QLIB_NOTIFY_RENAME, "/s/h"),
          EventLine(CUSTOM_EVENT_REINDEX, "/s/i"), "no event"});
  EXPECT_EQ(Named("/s/f"), "/s/f/");
  EXPECT_EQ(Named("/s/g"), "/s/g");
  EXPECT_EQ(Named("/s/h"), "/s/h");
  EXPECT_EQ(Named("/s/i"), "/s/i");

  Append({EventLine(CUSTOM_EVENT_UPDATE, "/s/f/")});
  EXPECT_EQ(Named("/s/f"), "/s/f//");
  Drain();
  EXPECT_EQ(Named("/s/f"), "/s/f");
}

TEST_F(QueueContentTest, OneLineIsAppendedByWhatWaitsThen) {
  std::string error;
  Append({EventLine(CUSTOM_EVENT_UPDATE, "/s/f")});
  for (const uint32_t event : {CUSTOM_EVENT_UPDATE, CUSTOM_EVENT_REINDEX}) {
    EXPECT_TRUE(AppendEvent("s", event, "/s/f", "{}", Durability::SYNCED, error)) << error;
  }

  EXPECT_EQ(ReadFile(QueuePath("s")), EventLine(CUSTOM_EVENT_UPDATE, "/s/f") + "\n" +
                                          EventLine(CUSTOM_EVENT_UPDATE, "/s/f", {}, "{}") + "\n" +
                                          EventLine(CUSTOM_EVENT_REINDEX, "/s/f/", {}, "{}") +
                                          "\n");
}

TEST_F(QueueContentTest, DeletesOfBothFilesAreMetByTheirNormalPaths) {
  Append({EventLine(QLIB_NOTIFY_DELETE, "/s/b"), EventLine(QLIB_NOTIFY_CREATE, "/s/c"),
          EventLine(QLIB_NOTIFY_DELETE, "relative"), "{\"path\":\"/s/x\"}"});
  Drain();
  Append({EventLine(QLIB_NOTIFY_DELETE, "/s//a/"),
          EventLine(QLIB_NOTIFY_DELETE | QLIB_NOTIFY_MODIFY, "/s/b")});

  const QueueContent queued = ReadQueueContent("s");

  EXPECT_THAT(queued.deletes, ElementsAre("/s/a", "/s/b"));
  EXPECT_EQ(queued.lines, 2U);
}

TEST_F(QueueContentTest, WhatTheDaemonTakesForAnEventIsOne) {
  const QueueLineReader reader;
  LineInFile line;
  EXPECT_TRUE(reader.Read(R"({"event":256,"path":"/s/a//b","path_old":"/s/c"})", line));
  EXPECT_EQ(line.event, QLIB_NOTIFY_RENAME);
  EXPECT_EQ(line.path, "/s/a//b");
  EXPECT_EQ(line.path_old, "/s/c");
  EXPECT_TRUE(reader.Read(R"({"event":128.0,"path":"/s","path_old":7})", line));
  EXPECT_EQ(line.event, QLIB_NOTIFY_DELETE);
  EXPECT_EQ(line.path_old, "");

  for (const std::string& text :
       {std::string(R"({"path":"/s"})"), std::string(R"({"event":"128","path":"/s"})"),
        std::string(R"({"event":128,"path":7})"), std::string(R"({"event":128})"),
        std::string("[]"), std::string("x"), std::string(), std::string(100000, '[')}) {
    EXPECT_FALSE(reader.Read(text, line)) << text.substr(0, 40);
  }
}

}  // namespace
}  // namespace fileindexd
