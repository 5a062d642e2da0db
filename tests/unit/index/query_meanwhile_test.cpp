// SPDX-License-Identifier: GPL-2.0-or-later
// Questions while what they are put to is held, written, or made anew.
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <filesystem>
#include <thread>

#include "index/entry_table.h"
#include "state/layout.h"
#include "tests/unit/index/question_fixture.h"

namespace fileindexd {

class QueryMeanwhileTest : public QuestionTest {
 protected:
  static std::string Left(int pair) { return "l" + std::to_string(pair) + ".txt"; }
  static std::string Right(int pair) { return "r" + std::to_string(pair) + ".txt"; }

  // Files that wait to be read.
  void MakePairs(int count) {
    for (int pair = 0; pair < count; ++pair) {
      for (const std::string& name : {Left(pair), Right(pair)}) {
        WriteFile(At(name), name);
        Add(name);
      }
    }
    Commit();
    TakeIn();
    Jobs(static_cast<size_t>(count) * 2);
  }

  // Until a question was put and answered that was not yet put.
  void AwaitQuestion() {
    const int now = answered;
    for (int seen = now; seen < now + 2; seen = answered) {
      answered.wait(seen);
    }
  }

  // One transaction, and a question in the middle of it.
  void WritePair(int pair) {
    EXPECT_TRUE(contents->Finish(JobOf(Left(pair)).file, TextContent("pair")));
    AwaitQuestion();
    Finish(Right(pair), "pair");
  }

  void MergeAll() {
    int steps = 0;
    for (bool more = true; more && !HasFailure(); ++steps) {
      EXPECT_TRUE(contents->Merge(more));
      AwaitQuestion();
      EXPECT_TRUE(contents->Commit());
    }
    EXPECT_GT(steps, 1) << "there was something to merge";
  }

  // The two leave the entries at once; what was read of them goes step by step.
  void RemovePair(int pair) {
    constexpr int64_t DAY = 86400;
    for (const std::string& name : {Left(pair), Right(pair)}) {
      RemoveTree(At(name));
      Delete(name);
    }
    AwaitQuestion();
    Commit();
    contents->LookAtAll();
    TakeIn();
    const int64_t now = time(nullptr);
    Sweep(now);
    for (bool more = true; more && !HasFailure();) {
      EXPECT_TRUE(contents->Sweep(now + 2 * DAY, 1, more));
      AwaitQuestion();
    }
    EXPECT_TRUE(contents->Commit());
  }

  std::atomic<int> answered = 0;  // questions
};

TEST_F(QueryMeanwhileTest, ShareThatTakesTooLongIsNamedBesideOneThatAnswers) {
  Names names;
  for (int i = 0; i < 20000; ++i) {
    names.push_back("x " + std::to_string(i));
  }
  Fill("a", names);
  Fill("b", {"x"});
  question.shares = {"a", "b"};
  // No patience at all: the clock is looked at for the first time when a small share is done.
  question.patience = std::chrono::seconds(0);

  EXPECT_EQ(Paths("name:*x*"), Names({"/b/x"}));
  EXPECT_EQ(answer.failures, Names({"share a: no answer within 0 seconds"}));
  EXPECT_EQ(answer.total, 1U);
  question.patience = Question().patience;
  EXPECT_EQ(Paths("name:*x*").size(), 20U);
  EXPECT_EQ(answer.failures, Names());
}

TEST_F(QueryMeanwhileTest, ShareWhoseDatabaseIsHeldIsNamedBesideOneThatAnswers) {
  Fill("a", {"x"});
  Fill("b", {"x", "whale"});
  sqlite3* holder = nullptr;
  ASSERT_EQ(sqlite3_open((IndexPath("a") + "/entries.db").c_str(), &holder), SQLITE_OK);
  ASSERT_EQ(sqlite3_exec(holder, "PRAGMA locking_mode = EXCLUSIVE; BEGIN EXCLUSIVE", nullptr,
                         nullptr, nullptr),
            SQLITE_OK);
  question.shares = {"a", "b"};
  question.patience = std::chrono::seconds(0);

  EXPECT_EQ(Paths("x"), Names({"/b/x"}));
  EXPECT_EQ(answer.failures, Names({"share a: no answer within 0 seconds"}));
  question.suggests = true;
  EXPECT_EQ(Paths("whaxe"), Names());
  EXPECT_EQ(answer.suggestion, "") << "nobody waits once more for what may be in that share";
  sqlite3_close(holder);
  EXPECT_EQ(Paths("whaxe"), Names());
  EXPECT_EQ(answer.suggestion, "whale");
  EXPECT_EQ(Paths("x"), Names({"/a/x", "/b/x"}));
  EXPECT_EQ(answer.failures, Names());
}

// Each commit leaves two of each number; a reader who saw half a commit would count an odd one.
TEST_F(QueryMeanwhileTest, CommitsInBetweenAreSeenWholeOrNotAtAll) {
  Fill("a", {"pair first", "pair second"});
  std::atomic<bool> going = true;
  std::thread writing([&going] {
    for (int round = 0; round < 60; ++round) {
      IndexDatabase database;
      EntryTable table;
      if (database.OpenForWriting(IndexPath("a"), false) != IndexError::NONE ||
          table.Prepare(database.db) != SQLITE_OK || table.Begin() != SQLITE_OK) {
        ADD_FAILURE() << "round " << round;
        break;
      }
      for (const char* half : {"left ", "right "}) {
        for (int i = 0; i < 30; ++i) {
          Entry entry;
          entry.path = "/a/pair " + std::string(half) + std::to_string(round * 30 + i);
          entry.thing = Thing::FILE;
          EXPECT_EQ(table.Insert(entry), SQLITE_OK);
        }
      }
      EXPECT_EQ(table.Commit(1), SQLITE_OK);
      (void)sqlite3_wal_checkpoint_v2(database.db, nullptr, SQLITE_CHECKPOINT_TRUNCATE, nullptr,
                                      nullptr);  // readers may be in the way
    }
    going = false;
  });
  question.shares = {"a"};
  question.limit = 5;
  uint64_t last = 2;
  while (going) {
    for (const char* text : {"pair", "pair is:file", "name:*air*", "is:file -name:none"}) {
      (void)Paths(text);
      EXPECT_EQ(answer.failures, Names()) << text;
      EXPECT_EQ(answer.total % 2, 0U) << text;
      EXPECT_GE(answer.total, last) << text;
      last = answer.total;
    }
  }
  writing.join();
  (void)Paths("pair");
  EXPECT_EQ(answer.total, 2U + 60 * 60);
}

// By another process, as it always is: within one, SQLite takes a new index for the first to be
// opened, and cuts the shared memory that is read beside it.
TEST_F(QueryMeanwhileTest, IndexesMadeAnewInBetweenAreNoFailure) {
  Fill("a", {"pair first", "pair second"});
  const pid_t writing = fork();
  ASSERT_GE(writing, 0);
  if (writing == 0) {
    bool made = true;
    for (int round = 0; round < 25 && made; ++round) {
      // A reader that still opens the old one can spoil the making: the daemon tries again too.
      made = false;
      for (int tries = 0; tries < 100 && !made; ++tries) {
        std::error_code left;  // a reader may have put its files there meanwhile
        std::filesystem::remove_all(IndexPath("a"), left);
        made = TryToFill("a", {"pair first", "pair second", "pair third", "pair fourth"});
      }
    }
    _exit(made ? 0 : 1);
  }
  question.shares = {"a"};
  int status = 0;
  while (waitpid(writing, &status, WNOHANG) == 0) {
    (void)Paths("pair");
    EXPECT_EQ(answer.failures, Names());
    EXPECT_EQ(answer.total % 2, 0U);
  }
  EXPECT_EQ(status, 0);
  EXPECT_EQ(Paths("pair").size(), 4U);
}

// Two files are written, and removed, in one transaction; a reader who saw half of it would count
// an odd number.
TEST_F(QueryMeanwhileTest, ContentsWrittenInBetweenAreSeenWholeOrNotAtAll) {
  constexpr int PAIRS = 130;  // enough to be merged
  constexpr int REMOVED = 6;
  MakePairs(PAIRS);
  std::atomic<bool> going = true;
  std::atomic<bool> are_removed = false;
  std::thread writing([&] {
    for (int pair = 0; pair < PAIRS; ++pair) {
      WritePair(pair);
    }
    MergeAll();
    are_removed = true;
    for (int pair = 0; pair < REMOVED; ++pair) {
      RemovePair(pair);
    }
    going = false;
  });
  question.shares = {"s"};
  uint64_t last = 0;
  while (going) {
    for (const char* text : {"pair", "text:pair", "has:text", "content:done", "pair kind:document",
                             "pair -name:none"}) {
      const Names paths = Paths(text);
      EXPECT_EQ(answer.failures, Names()) << text;
      EXPECT_EQ(answer.total % 2, 0U) << text << ": " << answer.total;
      if (!are_removed) {
        EXPECT_GE(answer.total, last) << text;
      }
      last = answer.total;
      ++answered;
      answered.notify_all();
    }
  }
  writing.join();
  EXPECT_EQ(Paths("pair").size(), 20U);
  EXPECT_EQ(answer.total, static_cast<uint64_t>(PAIRS - REMOVED) * 2);
}

}  // namespace fileindexd
