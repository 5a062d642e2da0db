// SPDX-License-Identifier: GPL-2.0-or-later
#include "notify/server.h"

#include <poll.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <cstring>
#include <thread>

#include "base/scoped_fd.h"
#include "state/notifier.h"
#include "tests/unit/state/mounts.h"

namespace fileindexd {
namespace {

constexpr int LIMIT_MS = 60000;

// The sockets' folder is the test's own.
class ServerTest : public MountTest {
 protected:
  void SetUp() override {
    MountTest::SetUp();
    if (IsSkipped()) {
      return;
    }
    MountOwnRun();
    server = std::make_unique<Server>();
    std::string error;
    ASSERT_TRUE(server->Open(error)) << error;
  }
  void TearDown() override { server.reset(); }

  static int Connect() {
    sockaddr_un address = {};
    address.sun_family = AF_UNIX;
    strncpy(address.sun_path, NOTIFIER_SOCKET, sizeof(address.sun_path) - 1);
    const int client = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    EXPECT_EQ(connect(client, reinterpret_cast<sockaddr*>(&address), sizeof(address)), 0);
    return client;
  }
  static void Send(const ScopedFd& client, const std::string& bytes) {
    EXPECT_EQ(send(client.fd, bytes.data(), bytes.size(), MSG_NOSIGNAL),
              static_cast<ssize_t>(bytes.size()));
  }
  // All until the end; reset counts as the end.
  static std::string Receive(const ScopedFd& client) {
    std::string all;
    char buffer[4096];
    for (;;) {
      const ssize_t count = recv(client.fd, buffer, sizeof(buffer), 0);
      if (count <= 0) {
        return all;
      }
      all.append(buffer, static_cast<size_t>(count));
    }
  }

  // Once, when there is something to do.
  std::vector<Request> Serve() {
    pollfd waiting = {server->Descriptor(), POLLIN, 0};
    EXPECT_EQ(poll(&waiting, 1, LIMIT_MS), 1) << "nothing to do";
    return server->Serve();
  }
  Request ServeOne() {
    for (;;) {
      const std::vector<Request> requests = Serve();
      if (!requests.empty() || HasFailure()) {
        EXPECT_EQ(requests.size(), 1U);
        return requests.empty() ? Request() : requests.front();
      }
    }
  }
  bool IsIdle() {
    pollfd waiting = {server->Descriptor(), POLLIN, 0};
    return poll(&waiting, 1, 0) == 0;
  }
  void ServeUntilIdle() {
    while (!IsIdle()) {
      EXPECT_TRUE(server->Serve().empty());
    }
  }

  std::unique_ptr<Server> server;
};

TEST_F(ServerTest, SocketIsForRootAndGoesWithTheServer) {
  struct stat found = {};
  ASSERT_EQ(lstat(NOTIFIER_SOCKET, &found), 0);
  EXPECT_TRUE(S_ISSOCK(found.st_mode));
  EXPECT_EQ(found.st_mode & 07777U, 0600U);

  server.reset();

  EXPECT_FALSE(Exists(NOTIFIER_SOCKET));
}

TEST_F(ServerTest, LeftOverSocketIsReplacedAndAnothersStays) {
  Server second;
  std::string error;
  ASSERT_TRUE(second.Open(error)) << error;

  server.reset();

  EXPECT_TRUE(Exists(NOTIFIER_SOCKET));
  const ScopedFd client(Connect());
  pollfd waiting = {second.Descriptor(), POLLIN, 0};
  EXPECT_EQ(poll(&waiting, 1, LIMIT_MS), 1);
}

TEST_F(ServerTest, SomethingInTheWayIsToldOf) {
  server.reset();
  MakeFolder(std::string(NOTIFIER_SOCKET) + "/x");
  Server other;
  std::string error;

  EXPECT_FALSE(other.Open(error));

  EXPECT_NE(error.find(NOTIFIER_SOCKET), std::string::npos) << error;
}

TEST_F(ServerTest, AskedAndAnswered) {
  std::string reply;
  NotifierReply result = NotifierReply::NOT_RUNNING;
  std::thread asking([&] {
    result = AskNotifier(R"({"type":"sync","shares":["a","b"]})", std::chrono::minutes(1), reply);
  });

  const Request request = ServeOne();
  EXPECT_TRUE(server->IsWaiting(request.client));
  server->Answer(request.client, R"({"ok":true})");
  asking.join();

  EXPECT_EQ(request.type, Request::Type::SYNC);
  EXPECT_EQ(request.shares, (std::vector<std::string>{"a", "b"}));
  EXPECT_EQ(result, NotifierReply::ANSWERED);
  EXPECT_EQ(reply, R"({"ok":true})");
  EXPECT_FALSE(server->IsWaiting(request.client));
}

TEST_F(ServerTest, WhoAsksIsNotKeptLongerThanItsPatience) {
  std::string reply = "as it was";

  EXPECT_EQ(AskNotifier(R"({"type":"status"})", std::chrono::milliseconds(50), reply),
            NotifierReply::NO_ANSWER);
  server.reset();
  EXPECT_EQ(AskNotifier(R"({"type":"status"})", std::chrono::minutes(1), reply),
            NotifierReply::NOT_RUNNING);

  EXPECT_EQ(reply, "as it was");
}

TEST_F(ServerTest, RequestMayComeByteByByte) {
  const ScopedFd client(Connect());
  for (const char byte : std::string(R"({"type":"status"})")) {
    Send(client, std::string(1, byte));
    EXPECT_TRUE(Serve().empty());
    ServeUntilIdle();
  }
  Send(client, "\nand more that nobody wants");

  const Request request = ServeOne();
  server->Answer(request.client, "{}");

  EXPECT_EQ(request.type, Request::Type::STATUS);
  EXPECT_EQ(Receive(client), "{}\n");
}

TEST_F(ServerTest, WhatMakesNoSenseIsAnsweredWithAnError) {
  const std::string deep(5000, '[');
  const std::string nul = std::string(R"({"type":"sync","shares":["a)") + '\0' + "\"]}";
  for (const std::string& line :
       {std::string(), std::string("x"), std::string("[]"), std::string("{}"),
        std::string(R"({"type":"stop"})"), std::string(R"({"type":["sync"]})"),
        std::string(R"({"type":7})"), std::string(R"({"type":"sync","shares":"a"})"),
        std::string(R"({"type":"sync","shares":{"a":1}})"),
        std::string(R"({"type":"sync","shares":[1]})"),
        std::string(R"({"type":"sync","shares":["../x"]})"),
        std::string(R"({"type":"sync","shares":[""]})"), std::string("{\"type\":\"\xff\"}"), deep,
        nul, std::string(70000, 'x')}) {
    const ScopedFd client(Connect());
    Send(client, line + "\n");
    EXPECT_TRUE(Serve().empty());  // takes it in
    ServeUntilIdle();

    const std::string reply = Receive(client);

    EXPECT_EQ(reply.find(R"({"ok":false,"error":")"), 0U) << line.substr(0, 60) << ": " << reply;
    EXPECT_EQ(reply.find('\n'), reply.size() - 1);
  }
}

TEST_F(ServerTest, EndlessRequestIsCutOff) {
  const ScopedFd client(Connect());
  Send(client, std::string(65537, ' '));

  ServeUntilIdle();

  EXPECT_EQ(Receive(client).find(R"({"ok":false)"), 0U);
}

TEST_F(ServerTest, ClientThatHangsUpIsForgotten) {
  ScopedFd early(Connect());
  Send(early, "{\"type\":");
  ServeUntilIdle();
  early.Close();
  ServeUntilIdle();

  ScopedFd late(Connect());
  Send(late, "{\"type\":\"status\"}\n");
  const Request request = ServeOne();
  EXPECT_TRUE(server->IsWaiting(request.client));
  late.Close();
  ServeUntilIdle();

  EXPECT_FALSE(server->IsWaiting(request.client));
  server->Answer(request.client, "{}");  // does nothing
  EXPECT_TRUE(IsIdle());
}

TEST_F(ServerTest, ClientThatHasSaidAllGetsItsAnswer) {
  const ScopedFd client(Connect());
  Send(client, "{\"type\":\"status\"}\n");
  ASSERT_EQ(shutdown(client.fd, SHUT_WR), 0);

  const Request request = ServeOne();
  ServeUntilIdle();
  server->Answer(request.client, "{}");

  EXPECT_EQ(Receive(client), "{}\n");
}

TEST_F(ServerTest, BigReplyWaitsForItsReader) {
  const ScopedFd client(Connect());
  Send(client, "{\"type\":\"status\"}\n");
  const std::string big(5 << 20, 'x');
  server->Answer(ServeOne().client, big);
  EXPECT_TRUE(IsIdle());  // full, and nobody reads

  std::string received;
  std::atomic<bool> is_over = false;
  std::thread reading([&] {
    received = Receive(client);
    is_over = true;
  });
  while (!is_over) {
    pollfd waiting = {server->Descriptor(), POLLIN, 0};
    if (poll(&waiting, 1, 10) == 1) {
      EXPECT_TRUE(server->Serve().empty());
    }
  }
  reading.join();

  EXPECT_EQ(received, big + "\n");
}

TEST_F(ServerTest, ReaderThatHangsUpAmidABigReplyIsForgotten) {
  ScopedFd client(Connect());
  Send(client, "{\"type\":\"status\"}\n");
  server->Answer(ServeOne().client, std::string(5 << 20, 'x'));

  client.Close();
  ServeUntilIdle();

  const ScopedFd next(Connect());
  Send(next, "{\"type\":\"status\"}\n");
  EXPECT_NE(ServeOne().client, 0U);
}

TEST_F(ServerTest, HundredClientsAtOnceAllGetTheirAnswers) {
  std::vector<std::unique_ptr<ScopedFd>> clients;
  for (int i = 0; i < 100; ++i) {
    clients.push_back(std::make_unique<ScopedFd>(Connect()));
    Send(*clients.back(), "{\"type\":\"status\"}\n");
  }

  size_t answered = 0;
  while (answered < clients.size() && !HasFailure()) {
    const std::vector<Request> requests = Serve();
    EXPECT_LE(requests.size(), 64U);
    for (const Request& request : requests) {
      server->Answer(request.client, std::to_string(++answered));
    }
  }

  EXPECT_EQ(answered, clients.size());
  for (const auto& client : clients) {
    EXPECT_NE(Receive(*client), "");
  }
}

TEST_F(ServerTest, SilentClientsMakePlaceForOneThatAsks) {
  std::vector<std::unique_ptr<ScopedFd>> silent;
  for (int i = 0; i < 64; ++i) {
    silent.push_back(std::make_unique<ScopedFd>(Connect()));
  }
  ServeUntilIdle();
  const ScopedFd client(Connect());
  Send(client, "{\"type\":\"status\"}\n");

  const Request request = ServeOne();  // as soon as the silent ones have had their time
  server->Answer(request.client, "{}");

  EXPECT_EQ(Receive(client), "{}\n");
  EXPECT_EQ(Receive(*silent.front()), "");
}

TEST_F(ServerTest, StrangerIsNotHeard) {
  ASSERT_EQ(chmod(NOTIFIER_SOCKET, 0777), 0);  // as if somebody had opened it up
  const int other = 65534;
  const pid_t child = Fork([&] {
    if (setgid(other) != 0 || setuid(other) != 0) {
      return 2;
    }
    const ScopedFd client(Connect());
    const std::string request = "{\"type\":\"status\"}\n";
    (void)!send(client.fd, request.data(), request.size(), MSG_NOSIGNAL);
    return Receive(client).empty() ? 0 : 1;
  });

  EXPECT_TRUE(Serve().empty());

  EXPECT_EQ(WaitFor(child), 0);
}

}  // namespace
}  // namespace fileindexd
