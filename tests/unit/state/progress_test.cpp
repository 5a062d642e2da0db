// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/progress.h"

#include <signal.h>
#include <unistd.h>

#include <chrono>
#include <ctime>
#include <filesystem>

#include "tests/unit/state/fixture.h"

namespace fileindexd {
namespace {

class ProgressTest : public StateTest {
 protected:
  ProgressTest() : path(folder + "/progress"), writer(path) {}

  // Runs `body` in a child that stays alive until `End` is called with it.
  pid_t Elsewhere(const std::function<void()>& body) {
    int ends[2];
    EXPECT_EQ(pipe(ends), 0);
    const pid_t child = Fork([&] {
      body();
      EXPECT_EQ(write(ends[1], "x", 1), 1);
      pause();
      return 0;
    });
    char done = 0;
    EXPECT_EQ(read(ends[0], &done, 1), 1);
    close(ends[0]);
    close(ends[1]);
    return child;
  }
  static void End(pid_t child) {
    kill(child, SIGKILL);
    EXPECT_EQ(WaitFor(child), -1);
  }

  const std::string path;
  ProgressWriter writer;
  ProgressRecord record;
};

TEST_F(ProgressTest, WhatIsWrittenIsRead) {
  const int64_t before = time(nullptr);
  writer.Begin(Work::FIRST_INDEX, 5000);
  writer.Count(12);
  writer.Write();

  ASSERT_TRUE(ReadProgress(path, record));
  EXPECT_EQ(record.what, Work::FIRST_INDEX);
  EXPECT_EQ(record.done, 12U);
  EXPECT_EQ(record.total, 5000U);
  EXPECT_GE(record.began, before * 1000);
  EXPECT_GE(record.updated, record.began);
  EXPECT_EQ(ModeOf(path), 0600U);
}

TEST_F(ProgressTest, EveryKindOfWorkIsReadWithAndWithoutATotal) {
  for (const Work work : {Work::FIRST_INDEX, Work::REINDEX, Work::UPDATE, Work::COMPARISON}) {
    for (const std::optional<uint64_t> total : {std::optional<uint64_t>(), {UINT64_MAX}}) {
      writer.Begin(work, total);
      writer.Count(UINT64_MAX);
      writer.Write();

      ASSERT_TRUE(ReadProgress(path, record)) << WorkText(work);
      EXPECT_EQ(record.what, work);
      EXPECT_EQ(record.total, total);
      EXPECT_EQ(record.done, UINT64_MAX);
    }
  }
}

TEST_F(ProgressTest, ShorterLineLeavesNothingOfALongerOne) {
  writer.Begin(Work::FIRST_INDEX, 1000000);
  writer.Count(1000000);
  writer.Write();
  writer.record.done = 1;
  writer.record.total.reset();
  writer.Write();

  ASSERT_TRUE(ReadProgress(path, record));
  EXPECT_EQ(record.done, 1U);
  EXPECT_FALSE(record.total.has_value());
}

TEST_F(ProgressTest, EndRemovesTheFileAndShortWorkHasNone) {
  writer.Begin(Work::UPDATE, std::nullopt);
  writer.Count(100);
  EXPECT_FALSE(Exists(path));

  writer.Write();
  EXPECT_TRUE(Exists(path));
  writer.End();
  EXPECT_FALSE(Exists(path));
  EXPECT_FALSE(writer.IsRunning());
  writer.Write();
  EXPECT_FALSE(Exists(path));
}

TEST_F(ProgressTest, CountingWritesWhenASecondIsOver) {
  const auto began = std::chrono::steady_clock::now();
  writer.Begin(Work::UPDATE, std::nullopt);
  while (!Exists(path)) {
    writer.Count();
  }

  ASSERT_TRUE(ReadProgress(path, record));
  EXPECT_EQ(record.done % 256, 0U);
  EXPECT_GE(std::chrono::steady_clock::now() - began, std::chrono::milliseconds(900));
}

TEST_F(ProgressTest, TornFilesAreNoWork) {
  writer.Begin(Work::REINDEX, 7);
  writer.Write();
  const std::string whole = ReadFile(path);
  ASSERT_TRUE(ReadProgress(path, record));

  for (size_t length = 0; length < whole.size(); ++length) {
    WriteFile(path, whole.substr(0, length));
    ASSERT_FALSE(ReadProgress(path, record)) << length;
  }
  std::string mixed = whole;
  mixed[mixed.find("total") + 1] = '\0';
  for (const std::string& bad : {std::string(256, '\0'), std::string(256, ' '), whole + whole,
                                 whole + "x", mixed, "x" + whole.substr(1)}) {
    WriteFile(path, bad);
    EXPECT_FALSE(ReadProgress(path, record)) << bad;
  }
  WriteFile(path, whole);
  EXPECT_TRUE(ReadProgress(path, record));
}

TEST_F(ProgressTest, FileOfADeadProcessIsNoWork) {
  const pid_t child = Elsewhere([this] {
    writer.Begin(Work::COMPARISON, 3);
    writer.Write();
  });
  EXPECT_TRUE(ReadProgress(path, record));

  kill(child, SIGKILL);
  siginfo_t info;
  ASSERT_EQ(waitid(P_PID, static_cast<id_t>(child), &info, WEXITED | WNOWAIT), 0);
  EXPECT_FALSE(ReadProgress(path, record));  // ended, not collected
  EXPECT_EQ(WaitFor(child), -1);
  EXPECT_TRUE(Exists(path));
  EXPECT_FALSE(ReadProgress(path, record));
}

TEST_F(ProgressTest, FileOfAnEarlierProcessOfThatNumberIsNoWork) {
  writer.Begin(Work::REINDEX, 3);
  writer.Write();
  std::string text = ReadFile(path);
  const size_t digit = text.rfind('}') - 1;
  text[digit] = text[digit] == '1' ? '2' : '1';
  WriteFile(path, text);

  EXPECT_FALSE(ReadProgress(path, record));
}

TEST_F(ProgressTest, DeadWritersFileIsReplaced) {
  const pid_t child = Elsewhere([this] {
    writer.Begin(Work::COMPARISON, 3);
    writer.Write();
  });
  End(child);

  writer.Begin(Work::COMPARISON, 4);
  writer.Write();

  ASSERT_TRUE(ReadProgress(path, record));
  EXPECT_EQ(record.total, 4U);
}

TEST_F(ProgressTest, LivingWritersFileIsLeftAlone) {
  const pid_t child = Elsewhere([this] {
    writer.Begin(Work::COMPARISON, 3);
    writer.Write();
  });
  writer.Begin(Work::COMPARISON, 4);
  writer.Write();
  EXPECT_TRUE(ReadProgress(path, record));
  EXPECT_EQ(record.total, 3U);

  writer.End();
  EXPECT_TRUE(ReadProgress(path, record));
  End(child);
}

TEST_F(ProgressTest, AnotherWritersFileSurvivesTheEnd) {
  writer.Begin(Work::COMPARISON, 3);
  writer.Write();
  std::filesystem::remove(path);
  WriteFile(path, "of somebody else");

  writer.End();
  EXPECT_EQ(ReadFile(path), "of somebody else");
}

TEST_F(ProgressTest, NothingComesOfAFolderThatIsMissing) {
  ProgressWriter nowhere(folder + "/none/progress");
  nowhere.Begin(Work::REINDEX, 1);
  nowhere.Write();
  nowhere.Count(1000);
  nowhere.End();

  EXPECT_FALSE(ReadProgress(folder + "/none/progress", record));
}

}  // namespace
}  // namespace fileindexd
