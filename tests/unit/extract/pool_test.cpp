// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/pool.h"

#include <sys/stat.h>
#include <sys/wait.h>

#include <csignal>
#include <cstdlib>
#include <filesystem>
#include <set>
#include <string>

#include "scripted_pool_fixture.h"

namespace fileindexd {

namespace {

class PoolTest : public ScriptedPoolFixture {};

// Folders of this process's threads below /proc.
std::set<std::filesystem::path> Threads() {
  const std::filesystem::directory_iterator tasks("/proc/self/task");
  return {begin(tasks), end(tasks)};
}

// Else each child would close a copy of it at its start, which is asking its file system.
TEST_F(PoolTest, AFileThatIsOpenedLaterIsNoneOfWhoStartsHelpers) {
  const std::set<std::filesystem::path> before = Threads();  // an earlier one may be about to end
  OpenWith(1, LIMIT);
  std::set<std::filesystem::path> made = Threads();
  std::erase_if(made, [&](const auto& thread) { return before.contains(thread); });
  ASSERT_EQ(made.size(), 1U);

  const ScopedFd file = FileOf("of a file system that hangs");
  struct stat of_file {};
  ASSERT_EQ(fstat(file.fd, &of_file), 0);
  size_t descriptors = 0;
  for (const auto& descriptor : std::filesystem::directory_iterator(*made.begin() / "fd")) {
    struct stat of_descriptor {};
    const bool is_file = stat(descriptor.path().c_str(), &of_descriptor) == 0 &&
                         of_descriptor.st_dev == of_file.st_dev &&
                         of_descriptor.st_ino == of_file.st_ino;
    EXPECT_FALSE(is_file) << descriptor.path();
    ++descriptors;
  }
  EXPECT_GT(descriptors, 0U);

  EXPECT_EQ(Told(Run("text words")), "done");
}

TEST_F(PoolTest, AnAnswerComesBackUnderItsId) {
  Submit(77, "text some words");
  const auto ended = Await(1);
  ASSERT_TRUE(ended.contains(77));
  EXPECT_EQ(Told(ended.at(77)), "done");
  EXPECT_EQ(ended.at(77).content.text, "some words");
  EXPECT_EQ(ended.at(77).content.kind, Kind::DOCUMENT);
  EXPECT_EQ(pool->LeftOut(), "nothing much");
  EXPECT_EQ(pool->Running(), 0u);
}

TEST_F(PoolTest, AFailureKeepsItsReasonAndWhatWasFound) {
  const ExtractOutcome outcome = Run("fail it is damaged");
  EXPECT_EQ(Told(outcome), "failed: it is damaged");
  EXPECT_EQ(outcome.content.text, "it is damaged");
}

TEST_F(PoolTest, WhatTheDiskDoesNotGiveIsNoFailureAndCostsNoHelper) {
  const ExtractOutcome outcome = Run("unread the disk is gone");
  EXPECT_EQ(Told(outcome), "unread: the disk is gone");
  EXPECT_TRUE(outcome.content.text.empty());
  EXPECT_EQ(Run("count").content.text, "2");
}

TEST_F(PoolTest, AHelperServesOneJobAfterTheOther) {
  EXPECT_EQ(Run("count").content.text, "1");
  EXPECT_EQ(Run("count").content.text, "2");
}

TEST_F(PoolTest, WhoeverMisbehavesIsKilledAndReplaced) {
  const struct {
    const char* name;
    const char* told;
  } rows[] = {{"crash", "killed: the helper ended with SIGSEGV"},
              {"exit", "killed: the helper ended with code 7"},
              {"memory", "killed: needs more memory than is allowed"},
              {"close", "killed: the helper talked nonsense: it closed its connection"},
              {"grow", "killed: the helper talked nonsense: an answer too long"},
              {"nonsense", "killed: the helper talked nonsense: half a record"},
              {"twice", "killed: the helper talked nonsense: an answer that was not asked for"},
              {"convert sh", "killed: the helper talked nonsense: a converter that there is not"}};
  for (const auto& row : rows) {
    EXPECT_EQ(Told(Run(row.name)), row.told);
    EXPECT_EQ(Told(Run("text next")), "done") << "after " << row.name;
  }
}

TEST_F(PoolTest, WhatIsSaidBeforeTheEndCounts) {
  const ExtractOutcome outcome = Run("last");
  EXPECT_EQ(Told(outcome), "done");
  EXPECT_EQ(outcome.content.text, "said and gone");
  EXPECT_EQ(Run("count").content.text, "1");
}

TEST_F(PoolTest, ADocumentThatUsesItsTimeIsKilledAtTheFirstDeadline) {
  OpenWith(1, std::chrono::milliseconds(300));
  Begin("spin");
  const pid_t helper = AwaitStop();
  EXPECT_TRUE(pool->Work().empty());  // takes that it has begun
  ASSERT_EQ(kill(helper, SIGCONT), 0);
  ASSERT_EQ(AwaitStop(), helper);  // with more time used than it has
  const auto ended = pool->Work();
  ASSERT_EQ(ended.size(), 1u);
  EXPECT_EQ(Told(ended[0]), "killed: took longer than 300 ms");
}

TEST_F(PoolTest, ADocumentThatWaitsForEverIsKilledInTheEnd) {
  OpenWith(1, std::chrono::milliseconds(300));
  EXPECT_EQ(Told(Run("loop")), "killed: took longer than 300 ms");
  EXPECT_EQ(Told(Run("half")), "killed: took longer than 300 ms");
}

TEST_F(PoolTest, ADocumentThatWaitsForEverHasThreeDeadlines) {
  OpenWith(1, LIMIT);
  Begin("stop");
  EXPECT_EQ(ToldAfterThreeDeadlines(), "killed: took longer than 1200 s");
}

TEST_F(PoolTest, ADocumentThatGotNoProcessorTimeIsBegunAgain) {
  OpenWith(1, LIMIT);
  Begin("starve", "");
  (void)AwaitStop();
  EXPECT_TRUE(PassDeadline().empty());
  EXPECT_EQ(Told(Await(1)[1]), "done");
}

TEST_F(PoolTest, AnIdleHelperThatSaysAnythingIsReplaced) {
  const ExtractOutcome outcome = Run("more");
  EXPECT_EQ(Told(outcome), "done");
  const pid_t helper = std::stoi(outcome.content.text);
  int status = 0;
  ASSERT_EQ(waitpid(helper, &status, WUNTRACED), helper);
  ASSERT_TRUE(WIFSTOPPED(status));
  ASSERT_EQ(kill(helper, SIGCONT), 0);
  Wait(std::chrono::steady_clock::now() + LIMIT);
  EXPECT_TRUE(pool->Work().empty());
  EXPECT_NE(std::stoi(Run("pid").content.text), helper);
}

TEST_F(PoolTest, ASlowDocumentHoldsNobodyUp) {
  OpenWith(2, PoolFixture::LIMIT);
  Submit(1, "loop");
  for (uint64_t id = 2; id < 20; ++id) {
    Submit(id, "text quick");
  }
  const auto ended = Await(18);
  EXPECT_FALSE(ended.contains(1));
  EXPECT_EQ(pool->Running(), 1u);
}

TEST_F(PoolTest, AKillFromOutsideIsNotTheFilesFault) {
  const ExtractOutcome outcome = Run("killed", "");
  EXPECT_EQ(Told(outcome), "done");
}

TEST_F(PoolTest, AnIdleHelperThatIsGoneIsReplacedUnseen) {
  const pid_t helper = std::stoi(Run("pid").content.text);
  ASSERT_EQ(kill(helper, SIGUSR1), 0);
  const ExtractOutcome next = Run("pid");
  EXPECT_EQ(Told(next), "done");
  EXPECT_NE(std::stoi(next.content.text), helper);
}

TEST_F(PoolTest, AHelperThatEndsBeforeItBeginsIsNotTheFilesFault) {
  EXPECT_EQ(Told(Run("text a")), "done");
  EXPECT_EQ(Told(Run("refuse")), "done");
}

TEST_F(PoolTest, AFileThatNoHelperHasBegunIsNeverToBlame) {
  EXPECT_EQ(Told(Run("never")), "lost: the helper ended before it began, with code 5");
  EXPECT_EQ(Told(Run("text next")), "done");
}

TEST_F(PoolTest, ManyJobsAtOnceAllEnd) {
  OpenWith(4, PoolFixture::LIMIT);
  const char* names[] = {"text a", "crash", "fail b", "text c", "nonsense"};
  constexpr const char* TOLD[] = {"done", "killed", "failed", "done", "killed"};
  for (uint64_t id = 0; id < 200; ++id) {
    Submit(id, names[id % 5]);
  }
  const auto ended = Await(200);
  for (const auto& [id, outcome] : ended) {
    EXPECT_TRUE(Told(outcome).starts_with(TOLD[id % 5])) << id << " " << Told(outcome);
  }
}

TEST_F(PoolTest, RoomIsForIdleHelpersAndOneWaitingJobEach) {
  OpenWith(2, PoolFixture::LIMIT);
  EXPECT_EQ(pool->Room(), 4u);
  for (uint64_t id = 0; id < 3; ++id) {
    Submit(id, "loop");
  }
  EXPECT_EQ(pool->Room(), 1u);
  EXPECT_EQ(pool->Running(), 3u);
}

TEST_F(PoolTest, AbortEndsAllWithoutOutcome) {
  OpenWith(2, PoolFixture::LIMIT);
  for (uint64_t id = 0; id < 4; ++id) {
    Submit(id, "loop");
  }
  pool->Abort();
  EXPECT_EQ(pool->Running(), 0u);
  EXPECT_EQ(pool->Due(), std::chrono::steady_clock::time_point::max());
  EXPECT_TRUE(pool->Work().empty());
  EXPECT_EQ(Told(Run("text on")), "done");
}

TEST_F(PoolTest, AFileIsLetGoWhenItsJobHasEnded) {
  const auto file = std::make_shared<ScopedFd>(FileOf("x").Release());
  pool->Submit({.id = 1, .file = file, .name = "text a"});
  EXPECT_GT(file.use_count(), 1);
  (void)Await(1);
  EXPECT_EQ(file.use_count(), 1);

  for (uint64_t id = 2; id < 4; ++id) {
    pool->Submit({.id = id, .file = file, .name = "loop"});
  }
  pool->Abort();
  EXPECT_EQ(file.use_count(), 1);
}

TEST_F(PoolTest, NoHelperIsLeftBehind) {
  const pid_t helper = std::stoi(Run("pid").content.text);
  EXPECT_EQ(kill(helper, 0), 0);
  pool.reset();
  EXPECT_NE(kill(helper, 0), 0);
}

TEST_F(PoolTest, HelpersAreStartedClean) {
  setenv("EXTRACT_TEST_SECRET", "1", 1);
  signal(SIGPIPE, SIG_IGN);
  sigset_t blocked;
  sigset_t before;
  sigemptyset(&blocked);
  sigaddset(&blocked, SIGTERM);
  sigprocmask(SIG_BLOCK, &blocked, &before);
  const ScopedFd open_here(dup2(STDERR_FILENO, 40));  // not close-on-exec

  const std::string state = Run("state").content.text;
  sigprocmask(SIG_SETMASK, &before, nullptr);
  signal(SIGPIPE, SIG_DFL);
  // The job's own file is the one above the socket.
  EXPECT_EQ(state, "0 1 3 4 / own-session");
}

TEST_F(PoolTest, AProgramThatDoesNotStartLosesTheJob) {
  PoolOptions options;
  options.program = "/bin/false";
  OpenPool(options);
  EXPECT_EQ(Told(Run("text a")), "lost: /bin/false: does not start: code 1");
}

TEST_F(PoolTest, AProgramThatIsNotThereIsToldAtOnce) {
  PoolOptions options;
  options.program = "/nonexistent/program";
  std::string error;
  EXPECT_FALSE(ExtractPool::Open(options, error));
  EXPECT_EQ(error, "/nonexistent/program: No such file or directory");
}

}  // namespace

}  // namespace fileindexd
