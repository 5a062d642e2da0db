// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/queue_content.h"

#include <gmock/gmock.h>

#include <filesystem>

#include "base/event_codes.h"
#include "state/layout.h"
#include "state/queue_writer.h"
#include "tests/unit/state/fixture.h"

namespace fileindexd {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

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
  const std::vector<std::string> modify = {EventLine(QLIB_NOTIFY_MODIFY, "/s/f")};
  EXPECT_EQ(ReadQueueContent("s").TextsOf({QLIB_NOTIFY_MODIFY, "/s/f", {}, {}}, {"/s/f"}), modify);

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

// The second one drops the deletes below it.
TEST_F(QueueContentTest, AReindexIsQueuedTwiceAboveADeleteOfWhatIsThereAgain) {
  const auto path = [this](const std::string& name) { return folder + "/s/" + name; };
  std::filesystem::create_directories(path("d/again"));
  WriteFile(path("da"), "");
  std::vector<std::string> lines;
  for (const char* name : {"d//again/", "d/gone", "da", "e/gone"}) {
    lines.push_back(EventLine(QLIB_NOTIFY_DELETE, path(name)));
  }
  Append(lines);

  const auto append = [&](uint32_t event, const std::string& name,
                          const std::vector<std::string>& reindexed) {
    std::string error;
    EXPECT_TRUE(AppendEvent("s", event, path(name), {}, Durability::NONE, error)) << error;
    if (event != CUSTOM_EVENT_REINDEX) {
      lines.push_back(EventLine(event, path(name)));
    }
    for (const std::string& each : reindexed) {
      lines.push_back(EventLine(CUSTOM_EVENT_REINDEX, path(each)));
    }
    EXPECT_EQ(ReadLines(QueuePath("s")), lines);
  };
  append(CUSTOM_EVENT_REINDEX, "e", {"e"});
  append(CUSTOM_EVENT_UPDATE, "e", {});
  append(QLIB_NOTIFY_MODIFY, "d", {});
  append(CUSTOM_EVENT_REINDEX, "d/", {"d/", "d/"});
  append(CUSTOM_EVENT_UPDATE, "d", {"d", "d", "d/"});
  append(CUSTOM_EVENT_REINDEX, "d", {"d", "d", "d/"});
  append(QLIB_NOTIFY_CREATE, "d/again", {});
  append(CUSTOM_EVENT_REINDEX, "d", {"d/"});
}

// Which passes over one further down.
TEST_F(QueueContentTest, AReindexThatWaitsAboveIsQueuedTwiceInstead) {
  const auto path = [this](const std::string& name) { return folder + "/s/" + name; };
  std::filesystem::create_directories(path("a/b/c/again"));
  const auto reindexed = [&] {
    std::string error;
    const size_t before = ReadLines(QueuePath("s")).size();
    EXPECT_TRUE(AppendEvent("s", CUSTOM_EVENT_REINDEX, path("a/b/c"), {}, Durability::NONE, error));
    std::vector<std::string> lines = ReadLines(QueuePath("s"));
    lines.erase(lines.begin(), lines.begin() + static_cast<ptrdiff_t>(before));
    return lines;
  };
  const auto texts = [&](const std::vector<std::string>& names) {
    std::vector<std::string> lines;
    for (const std::string& name : names) {
      lines.push_back(EventLine(CUSTOM_EVENT_REINDEX, path(name)));
    }
    return lines;
  };

  Append({EventLine(CUSTOM_EVENT_REINDEX, path("a"))});
  Drain();
  Append({EventLine(CUSTOM_EVENT_REINDEX, path("a/b/c/again")),
          EventLine(CUSTOM_EVENT_REINDEX, path("a/b/cc")),
          EventLine(CUSTOM_EVENT_REINDEX | CUSTOM_EVENT_UPDATE, path("a")),
          EventLine(CUSTOM_EVENT_REINDEX | QLIB_NOTIFY_RENAME_FULL, path("a")),
          EventLine(QLIB_NOTIFY_RENAME, path("a"), path("e"))});
  EXPECT_EQ(reindexed(), texts({"a/b/c"}));
  Append({EventLine(QLIB_NOTIFY_DELETE, path("a/b/c/again"))});
  EXPECT_EQ(reindexed(), texts({"a/b/c", "a/b/c"}));
  Append({EventLine(QLIB_NOTIFY_RENAME, path("e"), path("a/b"))});
  EXPECT_EQ(reindexed(), texts({"a/b", "a/b"}));
  Append({EventLine(CUSTOM_EVENT_REINDEX, path("a"))});
  EXPECT_EQ(reindexed(), texts({"a", "a", "a/"}));
}

TEST_F(QueueContentTest, WhatCannotBeLookedAtMayBeThereAgain) {
  const std::string directory = folder + "/s/d";
  std::filesystem::create_directories(directory);
  std::filesystem::create_symlink("loop", directory + "/loop");
  WriteFile(directory + "/file", "");
  std::vector<std::string> lines;
  const auto append = [&](const std::string& deleted, size_t reindexes) {
    lines.push_back(EventLine(QLIB_NOTIFY_DELETE, directory + deleted));
    Append({lines.back()});
    std::string error;
    EXPECT_TRUE(AppendEvent("s", CUSTOM_EVENT_REINDEX, directory, {}, Durability::NONE, error));
    lines.insert(lines.end(), reindexes, EventLine(CUSTOM_EVENT_REINDEX, directory));
    EXPECT_EQ(ReadLines(QueuePath("s")), lines) << deleted;
  };
  append("/gone", 1);
  append("/file/below", 1);
  append("/loop/below", 2);
}

TEST_F(QueueContentTest, TheLastLineCountsThoughItHasNoNewline) {
  Append({EventLine(QLIB_NOTIFY_CREATE, "/s/c")});
  WriteFile(QueuePath("s"), ReadFile(QueuePath("s")) + EventLine(CUSTOM_EVENT_UPDATE, "/s/f"));
  EXPECT_EQ(ReadQueueContent("s").lines, 2U);
  EXPECT_EQ(Named("/s/f"), "/s/f/");

  const std::string last = EventLine(QLIB_NOTIFY_DELETE, "/s/b");
  WriteFile(QueuePath("s"), last);
  EXPECT_THAT(ReadQueueContent("s").deletes, ElementsAre("/s/b"));
  WriteFile(QueuePath("s"), last.substr(0, last.size() - 1));
  EXPECT_THAT(ReadQueueContent("s").deletes, IsEmpty());
}

TEST_F(QueueContentTest, DeletesOfBothFilesAreMetByTheirNormalPathsUntilALaterLineIsAboutThem) {
  Append({EventLine(QLIB_NOTIFY_DELETE, "/s/c"), EventLine(QLIB_NOTIFY_CREATE, "/s/e"),
          EventLine(QLIB_NOTIFY_DELETE, "relative"), EventLine(QLIB_NOTIFY_DELETE, "/s/f"),
          EventLine(QLIB_NOTIFY_DELETE, "/s/g"), EventLine(QLIB_NOTIFY_ATTRIB, "/s/g"),
          "{\"path\":\"/s/x\"}"});
  Drain();
  Append({EventLine(QLIB_NOTIFY_DELETE, "/s//a/"),
          EventLine(QLIB_NOTIFY_DELETE | QLIB_NOTIFY_MODIFY, "/s/b"),
          EventLine(QLIB_NOTIFY_CREATE, "/s//f"), "{\"event\":64}"});

  const QueueContent queued = ReadQueueContent("s");

  EXPECT_THAT(queued.deletes, ElementsAre("/s/a", "/s/b", "/s/c"));
  EXPECT_EQ(queued.lines, 4U);
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
