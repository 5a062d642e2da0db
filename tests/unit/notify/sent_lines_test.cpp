// SPDX-License-Identifier: GPL-2.0-or-later
// Lines that wait in the file that more are written to.
#include "notify/sent_lines.h"

#include "base/event_codes.h"
#include "tests/unit/notify/queue_feed_fixture.h"

namespace fileindexd {
namespace {

using SentLinesTest = QueueFeedTest;

TEST_F(SentLinesTest, AnUpdateOfWhatWasRenamedHasItWalkedUntilTheQueueIsTaken) {
  MakeDirectory("attributes");
  for (const char* name : {"attributes", "modified", "written", "twice"}) {
    feed.AddLines(settings, {{QLIB_NOTIFY_RENAME, Path(name), {}, Path("from")}});
  }
  Work();
  const Texts renames = Queue();
  ASSERT_EQ(renames.size(), 4U);
  Make("written");
  Add(Directory(ATTRIBUTES, "attributes"));
  Add(File(WRITTEN, "written"));
  feed.AddLines(settings, {{QLIB_NOTIFY_MODIFY, Path("modified"), {}},
                           {QLIB_NOTIFY_RENAME, Path("twice"), {}, Path("elsewhere")},
                           {QLIB_NOTIFY_ATTRIB, Path("other"), {}}});
  Work();
  Texts all = renames;
  all.insert(all.end(), {Line(CUSTOM_EVENT_REINDEX, "attributes"),
                         Line(CUSTOM_EVENT_REINDEX, "modified"), Line(QLIB_NOTIFY_ATTRIB, "other"),
                         EventLine(QLIB_NOTIFY_RENAME, Path("twice"), Path("elsewhere")),
                         Line(QLIB_NOTIFY_CLOSE_WRITE, "written")});
  EXPECT_EQ(Queue(), all);

  TakeQueue();
  feed.AddLines(settings, {{QLIB_NOTIFY_MODIFY, Path("twice"), {}}});
  Work();
  EXPECT_EQ(Queue(), Texts({Line(QLIB_NOTIFY_MODIFY, "twice")}));
}

TEST_F(SentLinesTest, AFileThatWasWrittenToIsReadAnewWhateverFollowsInTheSameFile) {
  Make("a");
  Make("m");
  Add(File(WRITTEN, "a"));
  Add(File(WRITTEN, "m"));
  Work();
  Texts lines = Queue();
  ASSERT_EQ(lines.size(), 2U);
  Add(File(ATTRIBUTES, "a"));
  feed.AddLines(settings, {{QLIB_NOTIFY_MODIFY, Path("m"), {}}});
  Work();

  lines.insert(lines.end(), {Line(QLIB_NOTIFY_CLOSE_WRITE, "a"), Line(CUSTOM_EVENT_REINDEX, "m")});
  EXPECT_EQ(Queue(), lines);

  TakeQueue();
  Add(File(ATTRIBUTES, "a"));
  Work();
  EXPECT_EQ(Queue(), Texts({Line(QLIB_NOTIFY_ATTRIB, "a")}));
}

TEST_F(SentLinesTest, NoReindexIsSwallowedByAnUpdateOfTheSameFolder) {
  const Texts others = {EventLine(CUSTOM_EVENT_UPDATE, Path("d"), {}, "{\"photo\":true}")};
  std::string error;
  ASSERT_TRUE(AppendToQueue("s", others, error)) << error;
  feed.AddLines(settings, {{CUSTOM_EVENT_REINDEX, Path("d"), {}}});
  Work();
  feed.AddLines(settings, {{QLIB_NOTIFY_RENAME, Path("d"), {}, Path("from")}});
  Work();
  feed.AddLines(settings, {{QLIB_NOTIFY_RENAME, Path("to"), {}, Path("d")}});
  Work();
  Texts all = others;
  all.insert(all.end(), {Line(CUSTOM_EVENT_REINDEX, "d/"), Line(CUSTOM_EVENT_REINDEX, "d/"),
                         Line(CUSTOM_EVENT_REINDEX, "from"), Line(CUSTOM_EVENT_REINDEX, "to"),
                         Line(CUSTOM_EVENT_REINDEX, "d/")});
  EXPECT_EQ(Queue(), all);

  TakeQueue();
  feed.AddLines(settings, {{CUSTOM_EVENT_REINDEX, Path("d"), {}}});
  Work();
  EXPECT_EQ(Queue(), Texts({Line(CUSTOM_EVENT_REINDEX, "d")}));
}

// As one that was stopped meanwhile has left it.
TEST_F(SentLinesTest, ADeleteOfAnotherWriterThatWaitsIsLookedAtAgainBehindAReindexAboveIt) {
  MakeDirectory("d/again");
  const Texts others = {Line(QLIB_NOTIFY_DELETE, "d/again"),
                        Line(QLIB_NOTIFY_DELETE, "d/gone"),
                        "no event",
                        EventLine(QLIB_NOTIFY_RENAME, Path("to"), Path("from")),
                        Line(QLIB_NOTIFY_ATTRIB, "to"),
                        "{\"path\":\"" + Path("d/again") + "\"}"};
  std::string error;
  ASSERT_TRUE(AppendToQueue("s", others, error)) << error;
  feed.AddLines(settings,
                {{CUSTOM_EVENT_REINDEX, Path("d"), {}}, {QLIB_NOTIFY_MODIFY, Path("to"), {}}});
  Work();

  Texts all = others;
  all.insert(all.end(), {Line(CUSTOM_EVENT_REINDEX, "d"), Line(CUSTOM_EVENT_REINDEX, "to"),
                         Line(CUSTOM_EVENT_REINDEX, "d/again")});
  EXPECT_EQ(Queue(), all);
}

}  // namespace
}  // namespace fileindexd
