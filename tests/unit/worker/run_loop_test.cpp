// SPDX-License-Identifier: GPL-2.0-or-later
#include <cerrno>
#include <new>
#include <stdexcept>

#include "base/mutex_guard.h"
#include "platform/log.h"
#include "unit/worker/worker_fixture.h"

namespace fileindexd {
namespace {

using scripted::EVERY_CALL;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;

class WorkerRunLoopTest : public WorkerFixture {
 protected:
  WorkerRunLoopTest() {
    Create();
    script.Forget();
  }

  // One pass on this thread, as the Worker's own would run it.
  int Pass() {
    worker->state = WORKER_RUNNING;
    return worker->ProcessQueue();
  }

  bool HasQueue() { return folder.Exists("queue/TALO@file_index_queue"); }
  bool HasDrained() { return folder.Exists("queue/TALO@file_index_queue.tmp"); }
  std::string File(const std::string& name) { return folder.Write("share/" + name, ""); }
  std::string RemoveDrained() const { return "QLIBCExec /bin/rm -rf " + queue_path + ".tmp"; }
};

TEST_F(WorkerRunLoopTest, EachCodeDoesItsAction) {
  const std::string d = folder.MakeDir("share/d");
  const std::string f = File("d/f");
  const std::string cfg = " {\"document\":false}";
  const struct {
    std::string line;
    std::vector<std::string> changes;
  } TABLE[] = {
      {Event(64, f), {"AddFSDocument " + f + cfg}},
      {Event(128, f), {"DelFSDocument " + f + " 0"}},
      {Event(2, f, R"("data":{"photo":true})"), {"UpdateFSDocument " + f + cfg + " null"}},
      {Event(131072, d, R"("data":{"photo":true})"),
       {"UpdateFSDocument " + d + cfg + " {\"photo\":true}",
        "UpdateFSDocument " + f + cfg + " {\"photo\":true}"}},
      {Event(65536, d),
       {"DelFSDocument " + d + " 1", "AddFSDocument " + d + cfg, "AddFSDocument " + f + cfg}},
      {Event(256, d, "\"path_old\":\"" + In("old") + "\""),
       {"DelFSDocument " + In("old") + " 1", "AddFSDocument " + d + cfg,
        "AddFSDocument " + f + cfg}},
      {Event(1024, f), {}},
      {Event(1, f), {}},
  };
  for (auto row : TABLE) {
    script.Forget();
    Queue({row.line});
    EXPECT_EQ(Pass(), PASS_DONE) << row.line;
    row.changes.emplace_back("Commit");
    EXPECT_EQ(Changes(), row.changes) << row.line;
  }
}

TEST_F(WorkerRunLoopTest, AnUpdateOfASubtreeIsFollowedByACleanOfIt) {
  const std::string d = folder.MakeDir("share/d");
  script.Say("IsFullPathIndexed", d, 0);
  Queue({Event(131072, d)});

  Pass();

  EXPECT_THAT(Changes(), ElementsAre(HasSubstr("UpdateFSDocument " + d),
                                     "DelFSDocument " + d + " 0", "Commit"));
}

TEST_F(WorkerRunLoopTest, APassWithoutQueueReadsNothingAndStillRemovesTheCopy) {
  EXPECT_EQ(Pass(), PASS_NOTHING);

  EXPECT_THAT(script.Calls(), ElementsAre("ShareIsNeedReindex s", RemoveDrained()));
}

TEST_F(WorkerRunLoopTest, ACopyOfAnEarlierDrainIsExecutedFirst) {
  folder.Write("queue/TALO@file_index_queue.tmp", Event(128, In("old")) + "\n");
  Queue({Event(128, In("new"))});

  EXPECT_EQ(Pass(), PASS_DONE);

  EXPECT_THAT(Changes(), ElementsAre("DelFSDocument " + In("old") + " 0", "Commit"));
  EXPECT_TRUE(HasQueue());
  EXPECT_FALSE(HasDrained());
}

TEST_F(WorkerRunLoopTest, APassThatStartsStoppedTouchesNothing) {
  for (const int state : {WORKER_IDLE, WORKER_OUT_OF_SPACE}) {
    Queue({Event(64, In("x"))});
    worker->state = state;
    EXPECT_EQ(worker->ProcessQueue(), PASS_STOPPED);
  }
  EXPECT_TRUE(HasQueue());
  EXPECT_THAT(script.Calls(), IsEmpty());
}

TEST_F(WorkerRunLoopTest, AStopEndsThePassAfterTheNodeWithoutCommitAndKeepsTheCopy) {
  for (const int state : {WORKER_IDLE, WORKER_OUT_OF_SPACE}) {
    Queue({Event(128, In("a")), Event(128, In("b"))});
    script.Run("DelFSDocument", script.CallCount("DelFSDocument") + 1,
               [&, state] { worker->state = state; });
    script.Forget();

    EXPECT_EQ(Pass(), PASS_STOPPED);

    EXPECT_THAT(script.Calls(),
                ElementsAre("ShareIsNeedReindex s", "DelFSDocument " + In("a") + " 0"));
    EXPECT_TRUE(HasDrained());
  }
}

TEST_F(WorkerRunLoopTest, NeedsReindexThrowsTheQueueAwayAndIndexesTheShare) {
  const std::string f = File("f");
  folder.Write("queue/TALO@file_index_queue.tmp", "rest");
  Queue({Event(128, In("x"))});
  script.need_reindex.insert("s");

  EXPECT_EQ(Pass(), INDEX_CHANGED);

  EXPECT_THAT(script.CallsOf(
                  {"ShareSetNeedReindex", "QLIBCExec", "AddFSDocument", "DelFSDocument", "Commit"}),
              ElementsAre("ShareSetNeedReindex s false", "QLIBCExec /bin/rm -rf " + queue_path,
                          "DelFSDocument " + share_path + " 1",
                          HasSubstr("AddFSDocument " + share_path + " "),
                          HasSubstr("AddFSDocument " + f), "Commit", RemoveDrained()));
  EXPECT_FALSE(HasQueue());
  EXPECT_FALSE(HasDrained());
  EXPECT_FALSE(script.need_reindex.contains("s"));
}

TEST_F(WorkerRunLoopTest, APauseHoldsTheReindexOfAShareOnceItsQueueIsThrownAway) {
  Queue({Event(128, In("x"))});
  script.need_reindex.insert("s");
  daemon.resume_time = 0;
  script.Run("pthread_cond_wait", EVERY_CALL, [] {});
  ASSERT_TRUE(worker->Run());
  running = true;
  ASSERT_TRUE(script.AwaitCount("pthread_cond_wait", 1));
  {
    const MutexGuard guard(&daemon.pause_mutex);  // free: the thread waits
    EXPECT_THAT(script.Calls(), ElementsAre("ShareIsNeedReindex s", "ShareSetNeedReindex s false",
                                            "QLIBCExec /bin/rm -rf " + queue_path));
    EXPECT_FALSE(HasQueue());
    daemon.resume_time = -1;
    pthread_cond_broadcast(&daemon.pause_cond);
  }

  pthread_join(worker->thread, nullptr);
  running = false;

  EXPECT_EQ(Changes().front(), "DelFSDocument " + share_path + " 1");
  EXPECT_EQ(script.CallCount("ShareSetNeedReindex"), 1);
}

TEST_F(WorkerRunLoopTest, AStoppedReindexStillCommitsAndKeepsTheCopy) {
  folder.Write("queue/TALO@file_index_queue.tmp", "rest");
  script.need_reindex.insert("s");
  script.Run("DelFSDocument", 1, [&] { worker->state = WORKER_IDLE; });

  EXPECT_EQ(Pass(), PASS_STOPPED);

  EXPECT_EQ(script.CallCount("Commit"), 1);
  EXPECT_TRUE(HasDrained());
}

TEST_F(WorkerRunLoopTest, AReindexOfAShareThatCannotBeOpenedEndsThePassAsDone) {
  script.need_reindex.insert("s");
  script.Answer("opendir", 1, EACCES);

  EXPECT_EQ(Pass(), INDEX_UNCHANGED);
  EXPECT_EQ(script.CallCount("Commit"), 1);
}

TEST_F(WorkerRunLoopTest, AReindexOfTheShareThatThrowsIsToldAndCommitted) {
  script.need_reindex.insert("s");
  script.Run("DelFSDocument", 1, [] { throw std::bad_alloc(); });

  EXPECT_EQ(Pass(), PASS_DONE);

  EXPECT_THAT(Log(), ElementsAre("Failed to execute op 6, path=" + share_path));
  EXPECT_THAT(script.Calls(),
              Contains("NoteLostChanges " + share_path + " " + std::to_string(ENOMEM)));
  EXPECT_EQ(script.CallCount("Commit"), 1);
}

TEST_F(WorkerRunLoopTest, AReindexOfTheShareThatThrowsWhileAStopIsAskedForKeepsTheCopy) {
  folder.Write("queue/TALO@file_index_queue.tmp", "rest");
  script.need_reindex.insert("s");
  script.Run("DelFSDocument", 1, [&] {
    worker->state = WORKER_IDLE;
    throw std::runtime_error("host");
  });

  EXPECT_EQ(Pass(), PASS_STOPPED);
  EXPECT_TRUE(HasDrained());
}

TEST_F(WorkerRunLoopTest, ABatchOfNothingToDoIsCommittedToo) {
  Queue({Event(1024, In("a")), Event(1, In("b"))});

  EXPECT_EQ(Pass(), PASS_DONE);
  EXPECT_THAT(Changes(), ElementsAre("Commit"));
}

TEST_F(WorkerRunLoopTest, EachNodeIsToldAtDebugLevelOnly) {
  TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_DEBUG;
  Queue({Event(128, In("a"), R"("data":{"k":1})"), Event(1024, In("b")), Event(1, In("c"))});

  Pass();

  EXPECT_THAT(Log(), Contains("TREE COMMAND 2: path=" + In("a") + ", data={\"k\":1}"));
  EXPECT_THAT(Log(), Contains("TREE COMMAND 0: path=" + In("c") + ", data=null"));
  EXPECT_EQ(script.CountLines("TREE COMMAND"), 2U);
}

TEST_F(WorkerRunLoopTest, ANodeThatThrowsIsToldAndTheNextOneIsExecuted) {
  Queue({Event(128, In("a")), Event(128, In("b"))});
  script.Run("DelFSDocument", 1, [] { throw std::runtime_error("host"); });

  EXPECT_EQ(Pass(), PASS_DONE);

  EXPECT_THAT(Log(), ElementsAre("Failed to execute op 2, path=" + In("a")));
  EXPECT_EQ(script.CallCount("DelFSDocument"), 2);
}

TEST_F(WorkerRunLoopTest, ANodeForWhichThereIsNoMemoryIsToldAsLost) {
  Queue({Event(128, In("a")), Event(128, In("b"))});
  script.Run("DelFSDocument", 1, [] { throw std::bad_alloc(); });

  EXPECT_EQ(Pass(), PASS_DONE);

  EXPECT_THAT(Log(), ElementsAre("Failed to execute op 2, path=" + In("a")));
  EXPECT_THAT(script.Calls(),
              Contains("NoteLostChanges " + share_path + " " + std::to_string(ENOMEM)));
}

TEST_F(WorkerRunLoopTest, ANodeThatThrowsWhileAStopIsAskedForEndsThePass) {
  Queue({Event(128, In("a")), Event(128, In("b"))});
  script.Run("DelFSDocument", 1, [&] {
    worker->state = WORKER_IDLE;
    throw std::runtime_error("host");
  });

  EXPECT_EQ(Pass(), PASS_STOPPED);
  EXPECT_EQ(script.CallCount("DelFSDocument"), 1);
}

TEST_F(WorkerRunLoopTest, NoSpaceInTheMiddleOfABatchKeepsTheCopy) {
  Queue({Event(128, In("a")), Event(128, In("b"))});
  worker->op_count = 1999;
  script.Fail("IsShareSpaceEnough");

  RunThread();

  EXPECT_EQ(script.CallCount("DelFSDocument"), 1);
  EXPECT_TRUE(HasDrained());
  EXPECT_EQ(worker->state, WORKER_FINISHED);
  EXPECT_EQ(Log().back(), "Worker[s] stopped while processing command queue");
}

TEST_F(WorkerRunLoopTest, NoSpaceAtTheEndOfABatchRemovesTheCopyAndStopsTheNextPass) {
  Queue({Event(128, In("a"))});
  script.Fail("IsShareSpaceEnough");
  script.Run("Commit", 1, [&] { Queue({Event(128, In("b"))}); });

  RunThread();

  EXPECT_FALSE(HasDrained());
  EXPECT_TRUE(HasQueue());
  EXPECT_EQ(worker->state, WORKER_FINISHED);
  EXPECT_EQ(Log().back(), "Worker[s] stopped while processing command queue");
}

TEST_F(WorkerRunLoopTest, TheThreadEndsWhenAPassLeavesNoQueue) {
  TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_DEBUG;
  Queue({Event(128, In("a"))});

  RunThread();

  EXPECT_EQ(worker->state, WORKER_FINISHED);
  EXPECT_EQ(Log().back(), "Worker[s] finished all task, stopping");
  EXPECT_FALSE(HasDrained());
  ExpectMutexesFree();
}

TEST_F(WorkerRunLoopTest, EventsThatArriveDuringAPassAreTakenByTheNextOne) {
  Queue({Event(128, In("a"))});
  script.Run("DelFSDocument", 1, [&] { Queue({Event(128, In("b"))}); });

  RunThread();

  EXPECT_THAT(Changes(), ElementsAre("DelFSDocument " + In("a") + " 0", "Commit",
                                     "DelFSDocument " + In("b") + " 0", "Commit"));
}

TEST_F(WorkerRunLoopTest, AStopAskedForBeforeTheFirstPassLeavesTheQueueUnread) {
  // Between two passes: the first ends with state 0 set by the last question about the queue.
  Queue({Event(128, In("a"))});
  script.Run("IsFileExist", 1, [&] {
    worker->state = WORKER_IDLE;
    Queue({Event(128, In("b"))});
  });

  RunThread();

  EXPECT_TRUE(HasQueue());
  EXPECT_EQ(worker->state, WORKER_FINISHED);
  EXPECT_THAT(Log(), ElementsAre("Worker[s] stopped while processing command queue"));
}

}  // namespace
}  // namespace fileindexd
