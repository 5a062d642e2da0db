// SPDX-License-Identifier: GPL-2.0-or-later
// When a Worker commits, and what follows.
#include <cerrno>
#include <utility>

#include "platform/log.h"
#include "unit/worker/worker_fixture.h"

namespace fileindexd {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

class WorkerCommitTest : public WorkerFixture {
 protected:
  WorkerCommitTest() {
    Create();
    script.Forget();
  }
};

TEST_F(WorkerCommitTest, ACommitIsFollowedByAFreshIndexer) {
  worker->op_count = 5;
  worker->last_commit = 0;
  worker->CommitIndex();

  EXPECT_THAT(script.Calls(), ElementsAre("Commit", "~Indexer", "Indexer " + db_path + " 0",
                                          "IsShareSpaceEnough s"));
  EXPECT_EQ(worker->op_count, 0);
  EXPECT_GT(worker->last_commit, 0);
  EXPECT_THAT(Log(), IsEmpty());
}

TEST_F(WorkerCommitTest, ACommitIsToldAtDebugLevelOnly) {
  TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_DEBUG;
  worker->CommitIndex();
  script.Fail("Commit", 2);
  worker->CommitIndex();

  EXPECT_THAT(Log(),
              ElementsAre("Worker[s] fileindex db committed", "Worker[s] failed to commit db"));
}

TEST_F(WorkerCommitTest, TheCountAndTheIntervalStartAnewBeforeTheCommit) {
  worker->op_count = 7;
  worker->last_commit = 0;
  script.Run("Commit", 1, [&] {
    EXPECT_EQ(worker->op_count, 0);
    EXPECT_GT(worker->last_commit, 0);
  });

  worker->CommitIndex();

  EXPECT_EQ(script.CallCount("Commit"), 1);
}

TEST_F(WorkerCommitTest, AFailedCommitKeepsTheIndexerAndRestartsTheInterval) {
  const auto* before = worker->indexer;
  script.Fail("Commit");
  worker->op_count = 7;
  worker->last_commit = 0;

  worker->CommitIndex();

  EXPECT_THAT(script.Calls(), ElementsAre("Commit", "IsShareSpaceEnough s"));
  EXPECT_EQ(worker->indexer, before);
  EXPECT_EQ(worker->op_count, 0);
  EXPECT_GT(worker->last_commit, 0);
  EXPECT_THAT(Log(), IsEmpty());
}

TEST_F(WorkerCommitTest, AnIndexerThatDoesNotOpenAgainIsToldOnceAndKept) {
  script.Fail("Indexer", 2);

  worker->CommitIndex();

  ASSERT_NE(worker->indexer, nullptr);
  EXPECT_FALSE(worker->indexer->IsOpen());
  EXPECT_THAT(Log(), ElementsAre("Failed to initiate indexer, dbpath=" + db_path));
  EXPECT_EQ(script.CallCount("Indexer"), 2);
}

TEST_F(WorkerCommitTest, AnIndexerThatGetsNoMemoryIsToldOnceAndIsNone) {
  script.Answer("operator new", script.CallCount("operator new") + 1, ENOMEM);

  worker->CommitIndex();

  EXPECT_EQ(worker->indexer, nullptr);
  EXPECT_EQ(script.live_indexers, indexers_before);
  EXPECT_THAT(Log(), ElementsAre("Failed to initiate indexer, dbpath=" + db_path));
  EXPECT_THAT(script.Calls(), ElementsAre("Commit", "~Indexer", "IsShareSpaceEnough s"));
}

TEST_F(WorkerCommitTest, WithoutAnIndexerACommitDoesNothing) {
  delete std::exchange(worker->indexer, nullptr);
  script.Forget();
  worker->op_count = 9;

  worker->CommitIndex();

  EXPECT_THAT(script.Calls(), IsEmpty());
  EXPECT_EQ(worker->op_count, 9);
}

TEST_F(WorkerCommitTest, ACommitThatFindsNoSpaceSetsTheStateAndTheFlag) {
  for (const char* commit_fails : {"", "Commit"}) {
    script.no_space.clear();
    script.Forget();
    script.Fail("IsShareSpaceEnough");
    script.Fail(commit_fails);
    worker->state = WORKER_RUNNING;

    worker->CommitIndex();

    EXPECT_EQ(worker->state, WORKER_OUT_OF_SPACE);
    EXPECT_TRUE(script.no_space.contains("s"));
    EXPECT_THAT(Log(), ElementsAre("Share[s] is running out space"));
  }
}

TEST_F(WorkerCommitTest, ANoSpaceFlagThatCannotBeStoredIsTold) {
  script.Fail("IsShareSpaceEnough");
  script.Fail("ShareSetNoSpace");

  worker->CommitIndex();

  EXPECT_THAT(Log(), ElementsAre("Share[s] is running out space", "ShareSetNoSpace failed"));
  EXPECT_EQ(worker->state, WORKER_OUT_OF_SPACE);
}

TEST_F(WorkerCommitTest, The2000thChangeCommitsAndThe1999thDoesNot) {
  worker->op_count = 1998;
  worker->CountChange();
  EXPECT_EQ(script.CallCount("Commit"), 0);
  EXPECT_EQ(worker->op_count, 1999);

  worker->CountChange();
  EXPECT_EQ(script.CallCount("Commit"), 1);
  EXPECT_EQ(worker->op_count, 0);
}

TEST_F(WorkerCommitTest, AnyChangeCommitsOnceTheLastCommitIs600SecondsOld) {
  worker->last_commit = time(nullptr) - 595;
  worker->CountChange();
  EXPECT_EQ(script.CallCount("Commit"), 0);

  worker->last_commit = time(nullptr) - 600;
  worker->CountChange();
  EXPECT_EQ(script.CallCount("Commit"), 1);

  worker->last_commit = time(nullptr) + 5000;  // the clock was set back
  worker->CountChange();
  EXPECT_EQ(script.CallCount("Commit"), 1);
}

}  // namespace
}  // namespace fileindexd
