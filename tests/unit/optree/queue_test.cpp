// SPDX-License-Identifier: GPL-2.0-or-later
#include "optree/queue.h"

#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <new>
#include <optional>
#include <set>
#include <vector>

#include "base/scoped_fd.h"
#include "platform/log.h"
#include "scripted/few_descriptors.h"
#include "scripted/script.h"
#include "scripted/temp_folder.h"
#include "unit/optree/tree_text.h"

namespace fileindexd {
namespace {

using scripted::EVERY_CALL;
using scripted::TheScript;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;

constexpr const char* ADD_A = "{\"event\":64,\"path\":\"/v/s/a\"}\n";
constexpr const char* ADD_B = "{\"event\":64,\"path\":\"/v/s/b\"}\n";
constexpr const char* NO_QUEUE = "no tree";

class QueueTest : public ::testing::Test {
 protected:
  QueueTest() : queue_path(folder.Path("TALO@file_index_queue")) { TheScript().Reset(); }
  ~QueueTest() override { TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_ERROR; }

  void WriteQueue(const std::string& text) { folder.Write("TALO@file_index_queue", text); }
  void WriteDrained(const std::string& text) { folder.Write("TALO@file_index_queue.tmp", text); }
  bool HasQueue() { return folder.Exists("TALO@file_index_queue"); }
  bool HasDrained() { return folder.Exists("TALO@file_index_queue.tmp"); }

  // What one drain yields; leaves no descriptor behind.
  std::string Drain() {
    const int before = scripted::OpenDescriptors();
    const std::unique_ptr<OpTree> tree(ReadQueue("/v/s", queue_path));
    EXPECT_EQ(scripted::OpenDescriptors(), before);
    return tree == nullptr ? NO_QUEUE : Render(*tree);
  }

  static std::string Lost(int error) { return "NoteLostChanges /v/s " + std::to_string(error); }

  scripted::TempFolder folder;
  std::string queue_path;
};

TEST_F(QueueTest, WithoutQueueAndCopyThereIsNothingAndNoLog) {
  TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_DEBUG;

  EXPECT_EQ(Drain(), NO_QUEUE);
  EXPECT_THAT(TheScript().Texts(), IsEmpty());
}

TEST_F(QueueTest, TheQueueIsMovedAsideAndTheCopyStays) {
  WriteQueue(std::string(ADD_A) + ADD_B);

  EXPECT_EQ(Drain(), "7 /v/s {1 /v/s/a, 1 /v/s/b}");
  EXPECT_FALSE(HasQueue());
  EXPECT_EQ(folder.Read("TALO@file_index_queue.tmp"), std::string(ADD_A) + ADD_B);
}

TEST_F(QueueTest, TheTreeKnowsTheShare) {
  WriteQueue(ADD_A);
  const std::unique_ptr<OpTree> tree(ReadQueue("/v/other", queue_path));

  ASSERT_NE(tree, nullptr);
  EXPECT_EQ(tree->share_path, "/v/other");
}

TEST_F(QueueTest, ACopyOfAnEarlierDrainIsReadWithoutLockAndTheQueueWaits) {
  WriteQueue(ADD_A);
  WriteDrained(ADD_B);
  const ScopedFd writer(open(queue_path.c_str(), O_WRONLY));
  ASSERT_EQ(flock(writer.fd, LOCK_EX), 0);

  EXPECT_EQ(Drain(), "1 /v/s/b");
  EXPECT_EQ(folder.Read("TALO@file_index_queue"), ADD_A);
  EXPECT_TRUE(HasDrained());
}

TEST_F(QueueTest, AWriterThatKeepsTheLockKeepsTheQueue) {
  WriteQueue(ADD_A);
  const ScopedFd writer(open(queue_path.c_str(), O_WRONLY));
  ASSERT_EQ(flock(writer.fd, LOCK_EX), 0);
  TheScript().Answer("usleep", EVERY_CALL, 0);

  EXPECT_EQ(Drain(), NO_QUEUE);

  EXPECT_THAT(TheScript().Texts(), ElementsAre("try lock too many times, path=" + queue_path +
                                               ", reason=Resource temporarily unavailable"));
  EXPECT_EQ(TheScript().CallCount("usleep"), 16);
  EXPECT_TRUE(HasQueue());
  EXPECT_FALSE(HasDrained());
}

TEST_F(QueueTest, BetweenTheTriesItSleepsForARandomNumberOfHundredthsOfASecond) {
  WriteQueue(ADD_A);
  TheScript().Answer("flock", EVERY_CALL, EAGAIN);
  TheScript().Answer("usleep", EVERY_CALL, 0);
  for (int drain = 0; drain < 20; ++drain) {
    EXPECT_EQ(Drain(), NO_QUEUE);
  }

  const std::vector<int64_t> times = TheScript().waits["usleep"];
  EXPECT_EQ(std::set<int64_t>(times.begin(), times.end()),
            (std::set<int64_t>{0, 10000, 20000, 30000, 40000, 50000, 60000, 70000, 80000, 90000}));
}

TEST_F(QueueTest, AnotherReadersLockKeepsTheQueueToo) {
  WriteQueue(ADD_A);
  const ScopedFd reader(open(queue_path.c_str(), O_RDONLY));
  ASSERT_EQ(flock(reader.fd, LOCK_SH), 0);
  TheScript().Answer("usleep", EVERY_CALL, 0);

  EXPECT_EQ(Drain(), NO_QUEUE);
  EXPECT_EQ(TheScript().CallCount("usleep"), 16);
}

TEST_F(QueueTest, TheQueueIsLockedWhileItIsMoved) {
  WriteQueue(ADD_A);
  int locked = 0;
  int error = 0;
  TheScript().Run("rename", 1, [&] {
    const ScopedFd writer(open(queue_path.c_str(), O_RDONLY));
    locked = flock(writer.fd, LOCK_EX | LOCK_NB);
    error = errno;
  });

  EXPECT_EQ(Drain(), "1 /v/s/a");
  EXPECT_EQ(locked, -1);
  EXPECT_EQ(error, EWOULDBLOCK);
}

TEST_F(QueueTest, ALockThatIsFreeAtTheLastTryIsTaken) {
  for (const int error : {EAGAIN, EINTR}) {
    TheScript().Reset();
    WriteQueue(ADD_A);
    for (int nth = 1; nth <= 15; ++nth) {
      TheScript().Answer("flock", nth, error);
    }
    TheScript().Answer("usleep", EVERY_CALL, 0);

    EXPECT_EQ(Drain(), "1 /v/s/a");
    EXPECT_EQ(TheScript().CallCount("usleep"), 15);
    EXPECT_THAT(TheScript().Texts(), IsEmpty());
    unlink((queue_path + ".tmp").c_str());
  }
}

TEST_F(QueueTest, SixteenInterruptedTriesEndTheDrain) {
  WriteQueue(ADD_A);
  TheScript().Answer("flock", EVERY_CALL, EINTR);
  TheScript().Answer("usleep", EVERY_CALL, 0);

  EXPECT_EQ(Drain(), NO_QUEUE);
  EXPECT_THAT(TheScript().Texts(), ElementsAre(HasSubstr("reason=Interrupted system call")));
}

TEST_F(QueueTest, ALockThatFailsOtherwiseEndsTheDrainAndIsToldAtDebugLevelOnly) {
  WriteQueue(ADD_A);
  TheScript().Answer("flock", 1, ENOLCK);
  EXPECT_EQ(Drain(), NO_QUEUE);
  EXPECT_THAT(TheScript().Texts(), IsEmpty());

  TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_DEBUG;
  TheScript().Reset();
  TheScript().Answer("flock", 1, ENOLCK);
  EXPECT_EQ(Drain(), NO_QUEUE);
  EXPECT_THAT(TheScript().Texts(),
              ElementsAre("flock fail, path=" + queue_path + ", reason=No locks available"));
  EXPECT_TRUE(HasQueue());
}

TEST_F(QueueTest, AQueueThatCannotBeMovedIsTriedSixteenTimesAndReportedByTheMissingCopyOnly) {
  WriteQueue(ADD_A);
  TheScript().Answer("rename", EVERY_CALL, EACCES);
  TheScript().Answer("sleep", EVERY_CALL, 0);

  EXPECT_EQ(Drain(), NO_QUEUE);

  EXPECT_EQ(TheScript().CallCount("rename"), 16);
  EXPECT_EQ(TheScript().waits["sleep"], std::vector<int64_t>(16, 1));
  EXPECT_THAT(TheScript().Texts(), ElementsAre("Failed to open queue, path=" + queue_path +
                                               ".tmp, reason=No such file or directory"));
  EXPECT_TRUE(HasQueue());
  EXPECT_THAT(TheScript().Calls(), IsEmpty());  // nothing is lost
}

TEST_F(QueueTest, AMoveThatSucceedsAtTheLastTryIsAsGood) {
  WriteQueue(ADD_A);
  for (int nth = 1; nth <= 15; ++nth) {
    TheScript().Answer("rename", nth, EBUSY);
  }
  TheScript().Answer("sleep", EVERY_CALL, 0);

  EXPECT_EQ(Drain(), "1 /v/s/a");
  EXPECT_THAT(TheScript().Texts(), IsEmpty());
}

TEST_F(QueueTest, AnEmptyQueueGivesAnEmptyTree) {
  WriteQueue("");
  EXPECT_EQ(Drain(), "empty");
}

TEST_F(QueueTest, ALastLineWithoutNewlineCounts) {
  WriteQueue(R"({"event":64,"path":"/v/s/a"})");
  EXPECT_EQ(Drain(), "1 /v/s/a");
}

TEST_F(QueueTest, BadLinesAreToldTwiceAndLost) {
  WriteQueue(std::string("\n[1]\n{\"path\":\"/v/s/x\"}\n") + ADD_A);

  EXPECT_EQ(Drain(), "1 /v/s/a");
  EXPECT_THAT(TheScript().Texts(),
              ElementsAre("Malformed event: ", "Failed to insert event: ", "Malformed event: [1]",
                          "Failed to insert event: [1]", R"(Malformed event: {"path":"/v/s/x"})",
                          R"(Failed to insert event: {"path":"/v/s/x"})"));
}

TEST_F(QueueTest, AnObjectOverSeveralLinesIsNotJoined) {
  WriteQueue("{\"event\":64,\n\"path\":\"/v/s/x\"}\n");

  EXPECT_EQ(Drain(), "empty");
  EXPECT_EQ(TheScript().CountLines("Malformed event: "), 2U);
}

TEST_F(QueueTest, ALineThatThrowsCostsThatLineAlone) {
  const std::string old_path = R"({"event":256,"path":"/v/s/n","path_old":{}})";
  const std::string flags = R"({"event":131072,"path":"/v/s/a","data":[1]})";
  WriteQueue(old_path + "\n" + flags + "\n" + flags + "\n" + ADD_B);

  EXPECT_EQ(Drain(), "7 /v/s {5 /v/s/a=[1], 1 /v/s/b}");
  EXPECT_THAT(TheScript().Texts(), ElementsAre("Failed to insert event: " + old_path,
                                               "Failed to insert event: " + flags));
}

TEST_F(QueueTest, NestingBeyondTheParsersLimitCostsOneLine) {
  const std::string deep = std::string(5000, '[') + std::string(5000, ']');
  WriteQueue("{\"event\":64,\"path\":\"/v/s/d\",\"data\":" + deep + "}\n" + ADD_B);

  EXPECT_EQ(Drain(), "1 /v/s/b");
  EXPECT_EQ(TheScript().CountLines("Failed to insert event: "), 1U);
}

TEST_F(QueueTest, BytesThatAreNotUtf8AndVeryLongPathsAreKept) {
  const std::string path = "/v/s/\xff\xfe" + std::string(100000, 'x');
  WriteQueue("{\"event\":64,\"path\":\"" + path + "\"}\n");

  EXPECT_EQ(Drain(), "1 " + path);
}

TEST_F(QueueTest, AQueueThatIsADirectoryIsNoReasonToFail) {
  folder.MakeDir("TALO@file_index_queue");

  EXPECT_EQ(Drain(), "empty");  // it can be locked, moved and opened, but gives no line
  EXPECT_THAT(TheScript().Calls(), ElementsAre(Lost(EINVAL)));
}

TEST_F(QueueTest, AQueueThatIsAPipeIsNotWaitedFor) {
  ASSERT_EQ(mkfifo(queue_path.c_str(), 0600), 0);

  EXPECT_EQ(Drain(), "empty");
  EXPECT_THAT(TheScript().Calls(), ElementsAre(Lost(EINVAL)));
}

TEST_F(QueueTest, ACopyThatIsAPipeIsNotReadHoweverMuchIsWrittenIntoIt) {
  const std::string drained_path = queue_path + ".tmp";
  ASSERT_EQ(mkfifo(drained_path.c_str(), 0600), 0);
  const ScopedFd writer(open(drained_path.c_str(), O_RDWR));
  ASSERT_GT(write(writer.fd, ADD_A, strlen(ADD_A)), 0);

  EXPECT_EQ(Drain(), "empty");
  EXPECT_THAT(TheScript().Calls(), ElementsAre(Lost(EINVAL)));
}

TEST_F(QueueTest, ACopyThatCannotBeOpenedIsToldAsLost) {
  WriteQueue(ADD_A);
  std::optional<scripted::FewDescriptors> none;
  TheScript().Run("rename", 1, [&] { none.emplace(0); });
  TheScript().Run("WriteLog", 1, [&] { none.reset(); });

  EXPECT_EQ(Drain(), NO_QUEUE);

  EXPECT_THAT(TheScript().Texts(), ElementsAre("Failed to open queue, path=" + queue_path +
                                               ".tmp, reason=Too many open files"));
  EXPECT_THAT(TheScript().Calls(), ElementsAre(Lost(EMFILE)));
}

TEST_F(QueueTest, ACopyThatCannotBeReadToItsEndIsToldAsLost) {
  // Reads as a file does, and fails at its first byte.
  ASSERT_EQ(symlink("/proc/self/mem", (queue_path + ".tmp").c_str()), 0);

  EXPECT_EQ(Drain(), "empty");
  EXPECT_THAT(TheScript().Calls(), ElementsAre(Lost(EIO)));
}

TEST_F(QueueTest, ALineForWhichThereIsNoMemoryIsToldAsLostAndTheNextOnesAreRead) {
  WriteQueue(std::string(ADD_A) + ADD_B + "{\"event\":64,\"path\":\"/v/s/c\"}\n");
  TheScript().Run("StringStartWith", 1, [] { throw std::bad_alloc(); });

  EXPECT_EQ(Drain(), "7 /v/s {1 /v/s/a, 1 /v/s/c}");

  EXPECT_THAT(TheScript().Texts(),
              ElementsAre("Failed to insert event: {\"event\":64,\"path\":\"/v/s/b\"}"));
  EXPECT_THAT(TheScript().Calls(), ElementsAre(Lost(ENOMEM)));
}

TEST_F(QueueTest, TheLockDescriptorsNumberIsOursUntilTheEndOfTheDrain) {
  WriteQueue(ADD_A);
  const int number = dup(STDIN_FILENO);
  close(number);
  bool taken = true;
  // The line is read between the two releases of the lock's descriptor, the lowest free number.
  TheScript().Run("WriteLog", 1, [&] {
    const ScopedFd stranger(dup(STDIN_FILENO));
    taken = stranger.fd != number && fcntl(number, F_GETFD) == FD_CLOEXEC;
  });
  WriteQueue("broken\n");

  EXPECT_EQ(Drain(), "empty");
  EXPECT_TRUE(taken);
}

TEST_F(QueueTest, TheQueueIsNotLockedAnyMoreOnceItIsMoved) {
  WriteQueue("broken\n");
  int locked = -1;
  TheScript().Run("WriteLog", 1, [&] {
    const ScopedFd other(open((queue_path + ".tmp").c_str(), O_RDONLY));
    locked = flock(other.fd, LOCK_EX | LOCK_NB);
  });

  Drain();

  EXPECT_EQ(locked, 0);
}

}  // namespace
}  // namespace fileindexd
