// SPDX-License-Identifier: GPL-2.0-or-later
#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstring>
#include <thread>

#include "base/scoped_fd.h"
#include "unit/daemon/daemon_fixture.h"

namespace fileindexd {
namespace {

using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;

constexpr int NO_REPLY = -99;

std::string Frame(uint32_t length, const std::string& body) {
  std::string frame(sizeof(length), '\0');
  memcpy(frame.data(), &length, sizeof(length));
  return frame + body;
}

std::string Request(const std::string& body) {
  return Frame(static_cast<uint32_t>(body.size() + 1), body + '\0');
}

class ControlTest : public DaemonFixture {
 protected:
  ControlTest() {
    EXPECT_TRUE(daemon.SetupDomainSocket());
    SetUpShares({"a"});
  }

  // The reply, which is four bytes and then the end of the connection.
  static int Reply(int client) {
    char bytes[16];
    const ssize_t size = read(client, bytes, sizeof(bytes));
    if (size != 4) {
      return NO_REPLY;
    }
    EXPECT_EQ(read(client, bytes + 4, 1), 0);
    int32_t reply = 0;
    memcpy(&reply, bytes, sizeof(reply));
    return reply;
  }

  int Exchange(const std::string& bytes) {
    const ScopedFd client(Connect(bytes));
    daemon.HandleCommand();
    return Reply(client.fd);
  }

  int Command(const std::string& body) {
    script.Forget();
    return Exchange(Request(body));
  }
};

TEST_F(ControlTest, ResumeInItsShortestFormIsAnswered) {
  EXPECT_EQ(Exchange(Frame(28, std::string(R"({"type":"resume","data":{}})") + '\0')), 0);
  EXPECT_THAT(Log(), ElementsAre("SetPaused: false"));
}

TEST_F(ControlTest, ABodyEndsAtItsFirstNulOrWithItsLength) {
  const std::string body = R"({"type":"resume","data":{}})";
  EXPECT_EQ(Exchange(Frame(27, body)), 0);
  EXPECT_EQ(Exchange(Frame(31, body + std::string(1, '\0') + "}}}")), 0);
}

TEST_F(ControlTest, MalformedCommandsAreToldAndRefused) {
  const char* const BODIES[] = {
      "",
      "text",
      "[]",
      "5",
      "null",
      "{}",
      R"({"type":"resume"})",
      R"({"data":{}})",
      R"({"type":"resume","data":[]})",
      R"({"type":"resume","data":"text"})",
      R"({"type":"resume","data":null})",
      R"({"type":"resume","data":{}})x)",
      R"({"type":"resume","data":{})",
      R"({"Type":"resume","data":{}})",
  };
  const int before = scripted::OpenDescriptors();
  for (const char* body : BODIES) {
    EXPECT_EQ(Command(body), -1) << body;
    EXPECT_THAT(Log(), ElementsAre(std::string("Malformed command: ") + body));
  }
  EXPECT_EQ(scripted::OpenDescriptors(), before);
}

TEST_F(ControlTest, UnknownTypesAreToldAndRefused) {
  for (const std::string type : {"Pause", "PAUSE", "pause ", "", "resume2", "stop"}) {
    EXPECT_EQ(Command(R"({"type":")" + type + R"(","data":{}})"), -1) << type;
    EXPECT_THAT(Log(), ElementsAre("Unknown command type: " + type));
  }
}

TEST_F(ControlTest, TheLogLevelIsSet) {
  EXPECT_EQ(Command(R"({"type":"set_log_level","data":{"log_level":"debug"}})"), 0);
  EXPECT_EQ(TALO::FILEINDEX::LOG_LEVEL, 7);
  EXPECT_THAT(Log(), ElementsAre("Replying socket: 0"));
  EXPECT_EQ(Command(R"({"type":"set_log_level","data":{"log_level":"error"}})"), 0);
  EXPECT_EQ(TALO::FILEINDEX::LOG_LEVEL, 3);
  EXPECT_THAT(Log(),
              ElementsAre(R"(Got command: {"data":{"log_level":"error"},"type":"set_log_level"})"));
}

TEST_F(ControlTest, AnyOtherLogLevelIsRefusedAndChangesNothing) {
  for (const std::string level : {"Debug", "info", "7", ""}) {
    EXPECT_EQ(Command(R"({"type":"set_log_level","data":{"log_level":")" + level + "\"}}"), -1);
    EXPECT_THAT(Log(), ElementsAre("Unknown log level: " + level));
  }
  EXPECT_EQ(Command(R"({"type":"set_log_level","data":{}})"), -1);
  EXPECT_EQ(TALO::FILEINDEX::LOG_LEVEL, 3);
}

TEST_F(ControlTest, PauseTakesATimeAndMeansWithoutEndWhenThereIsNone) {
  EXPECT_EQ(Command(R"({"type":"pause","data":{}})"), 0);
  EXPECT_EQ(daemon.resume_time, 0);
  EXPECT_THAT(Log(), ElementsAre("SetPaused: true"));

  EXPECT_EQ(Command(R"({"type":"pause","data":{"resume_time":99999999999}})"), 0);
  EXPECT_EQ(daemon.resume_time, 99999999999);
  EXPECT_TRUE(daemon.IsPaused());

  EXPECT_EQ(Command(R"({"type":"pause","data":{"resume_time":5}})"), 0);
  EXPECT_FALSE(daemon.IsPaused());
  EXPECT_THAT(Log(), ElementsAre("SetPaused: false"));
}

TEST_F(ControlTest, FolderCommandsReachTheRegistry) {
  AddFolder("b", SharePath("b"));
  const std::string b = R"({"folder_path":")" + SharePath("b") + "\"}";
  EXPECT_EQ(Command(R"({"type":"upsert_folder_setting","data":)" + b + "}"), 0);
  EXPECT_TRUE(daemon.workers.contains("b"));

  script.folders.clear();
  EXPECT_EQ(Command(R"({"type":"delete_folder_setting","data":)" + b + "}"), 0);
  EXPECT_FALSE(daemon.workers.contains("b"));

  EXPECT_EQ(Command(R"({"type":"upsert_folder_setting","data":{}})"), -1);
  EXPECT_THAT(Log(), ElementsAre("GetShareNameByPath failed, path="));
  EXPECT_EQ(Command(R"({"type":"delete_folder_setting","data":{}})"), -1);
}

TEST_F(ControlTest, AShareWorkerIsDroppedAndRevived) {
  EXPECT_EQ(Command(R"({"type":"delete_share_worker","data":{"share_name":"a"}})"), 0);
  EXPECT_TRUE(daemon.workers.empty());
  EXPECT_EQ(Command(R"({"type":"delete_share_worker","data":{"share_name":"a"}})"), 0);
  EXPECT_EQ(Command(R"({"type":"delete_share_worker","data":{}})"), 0);
  EXPECT_THAT(Log(), IsEmpty());

  EXPECT_EQ(Command(R"({"type":"revive_share_worker","data":{"share_name":"a"}})"), 0);
  EXPECT_TRUE(daemon.workers.contains("a"));
  AwaitFinished("a");

  EXPECT_EQ(Command(R"({"type":"revive_share_worker","data":{"share_name":"x"}})"), -1);
  EXPECT_THAT(Log(), ElementsAre("TALOShareGet failed, share=x", "CreateWorker failed, share=x"));
}

TEST_F(ControlTest, ANameWithANulIsThatOfNoShare) {
  EXPECT_EQ(Command(R"({"type":"delete_share_worker","data":{"share_name":"a\u0000x"}})"), 0);
  EXPECT_EQ(Command(R"({"type":"revive_share_worker","data":{"share_name":"a\u0000x"}})"), -1);

  EXPECT_EQ(daemon.workers.size(), 1U);
  EXPECT_THAT(Log(), ElementsAre("TALOShareGet failed, share=a", "CreateWorker failed, share=a"));
}

TEST_F(ControlTest, AReadThatIsInterruptedThreeTimesGoesOn) {
  for (int call = 1; call <= 3; ++call) {
    script.Answer("poll", call, EINTR);
  }
  EXPECT_EQ(Command(R"({"type":"resume","data":{}})"), 0);
  EXPECT_EQ(script.CallCount("poll"), 5);
}

TEST_F(ControlTest, AFourthInterruptionFailsTheRead) {
  for (int call = 1; call <= 4; ++call) {
    script.Answer("poll", call, EINTR);
  }
  EXPECT_EQ(Exchange(""), -1);
  EXPECT_THAT(Log(),
              ElementsAre("Failed to read from domain socket, reason=Interrupted system call",
                          "Receive command length failed"));
}

TEST_F(ControlTest, InterruptionsAreCountedOverAllPartsOfABody) {
  for (int call = 2; call <= 8; call += 2) {  // the first is the length's, the odd ones read a part
    script.Answer("poll", call, EINTR);
  }
  EXPECT_EQ(Exchange(Frame(5000, std::string(3 * 1024, ' '))), -1);
  EXPECT_THAT(Log(),
              ElementsAre("Failed to read from domain socket, reason=Interrupted system call",
                          "Receive command body failed"));
}

TEST_F(ControlTest, AConnectionThatCannotBeAcceptedIsTold) {
  const ScopedFd client(Connect(""));
  script.Answer("accept4", 1, EMFILE);

  daemon.HandleCommand();

  EXPECT_THAT(Log(), ElementsAre("accept failed, reason=Too many open files"));
}

TEST_F(ControlTest, AShortRequestIsReadFailed) {
  const std::string reset = "Failed to read from domain socket, reason=Connection reset by peer";
  for (const std::string& bytes : {std::string(), std::string(3, '\1')}) {
    script.Forget();
    EXPECT_EQ(Exchange(bytes), -1);
    EXPECT_THAT(Log(), ElementsAre(reset, "Receive command length failed"));
  }
  script.Forget();
  EXPECT_EQ(Exchange(Frame(28, "{}")), -1);
  EXPECT_THAT(Log(), ElementsAre(reset, "Receive command body failed"));
}

TEST_F(ControlTest, ALengthOfNothingOrOfTooMuchIsRefusedUnread) {
  for (const uint32_t length : {0U, (64U << 20) + 1, 0x7fffffffU, 0xffffffffU}) {
    script.Forget();
    EXPECT_EQ(Exchange(Frame(length, "")), -1) << length;
    EXPECT_THAT(Log(), ElementsAre("Receive command body failed")) << length;
  }
}

TEST_F(ControlTest, ALongCommandIsReadInPieces) {
  const std::string body = R"({"type":"resume","data":{"x":")" + std::string(100000, 'x') + "\"}}";
  const std::string request = Request(body);
  std::thread slow;
  const ScopedFd client(Connect(request.substr(0, 2), false));
  slow = std::thread([&] {
    for (size_t at = 2; at < request.size(); at += 777) {
      const std::string piece = request.substr(at, 777);
      EXPECT_EQ(send(client.fd, piece.data(), piece.size(), MSG_NOSIGNAL),
                static_cast<ssize_t>(piece.size()));
    }
  });
  daemon.HandleCommand();
  slow.join();
  EXPECT_EQ(Reply(client.fd), 0);
}

TEST_F(ControlTest, AClientThatIsGoneBeforeTheReplyDoesNoHarm) {
  signal(SIGPIPE, SIG_IGN);
  close(Connect(Request(R"({"type":"resume","data":{}})")));
  daemon.HandleCommand();
  EXPECT_THAT(Log(), ElementsAre("SetPaused: false"));
}

TEST_F(ControlTest, DataThatCannotBeReadThrowsAndTheConnectionIsClosed) {
  const char* const BODIES[] = {
      R"({"type":{},"data":{}})",
      R"({"type":[1],"data":{}})",
      R"({"type":"pause","data":{"resume_time":"soon"}})",
      R"({"type":"pause","data":{"resume_time":1e300}})",
      R"({"type":"set_log_level","data":{"log_level":{}}})",
      R"({"type":"delete_share_worker","data":{"share_name":[]}})",
  };
  for (const char* body : BODIES) {
    const ScopedFd client(Connect(Request(body)));
    const int before = scripted::OpenDescriptors();
    EXPECT_THROW(daemon.HandleCommand(), std::exception) << body;
    EXPECT_EQ(scripted::OpenDescriptors(), before);
    EXPECT_EQ(Reply(client.fd), NO_REPLY) << body;
  }
  EXPECT_EQ(Command(R"({"type":"resume","data":{}})"), 0);
}

TEST_F(ControlTest, TheLoopSurvivesAHandlerThatThrows) {
  const ScopedFd client(Connect(Request(R"({"type":{},"data":{}})")));
  daemon.LoopOnce();
  EXPECT_THAT(Log(), ElementsAre("MainLoop exception ..."));

  script.Forget();
  const ScopedFd next(Connect(Request(R"({"type":"resume","data":{}})")));
  daemon.LoopOnce();
  EXPECT_EQ(Reply(next.fd), 0);
}

// The one test that waits out the limit of ten seconds.
TEST_F(ControlTest, ASilentClientIsGivenUpAfterTenSeconds) {
  const ScopedFd client(Connect("", false));
  const auto begin = std::chrono::steady_clock::now();

  daemon.HandleCommand();

  EXPECT_GE(std::chrono::steady_clock::now() - begin, std::chrono::seconds(9));
  EXPECT_THAT(Log(), ElementsAre("Failed to read from domain socket, reason=Connection timed out",
                                 "Receive command length failed"));
  EXPECT_EQ(Reply(client.fd), -1);
}

}  // namespace
}  // namespace fileindexd
