// SPDX-License-Identifier: GPL-2.0-or-later
// The keeper's thread, with a daemon that is only a process of that name and a socket.
#include "notify/keeper.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <unistd.h>

#include <csignal>
#include <cstring>
#include <filesystem>

#include "base/scoped_fd.h"
#include "state/daemon_socket.h"
#include "state/filesystem.h"
#include "state/layout.h"
#include "tests/unit/state/mounts.h"

namespace fileindexd {

class KeeperTest : public MountTest {
 protected:
  ~KeeperTest() override {
    if (daemon > 0) {
      kill(daemon, SIGKILL);
      WaitFor(daemon);
    }
  }

  void SetUp() override {
    MountTest::SetUp();
    if (IsSkipped()) {
      return;
    }
    MountTmpfs("/run");
    store = OpenStore();
    ASSERT_NE(store, nullptr);
    ASSERT_TRUE(store->AddShare({"s", root, FilesystemIdentity(root)})) << store->Error();
    ASSERT_TRUE(store->AddFolder(root, {})) << store->Error();
    std::string error;
    ASSERT_TRUE(MakeShareFolder("s", error)) << error;
  }

  void StartDaemon() {
    const std::string program = folder + "/" + DAEMON_PROGRAM;
    std::filesystem::copy_file("/bin/sleep", program);
    int ready[2];
    ASSERT_EQ(pipe2(ready, O_CLOEXEC), 0);
    daemon = fork();
    if (daemon == 0) {
      prctl(PR_SET_PDEATHSIG, SIGKILL);
      execl(program.c_str(), program.c_str(), "infinity", nullptr);
      _exit(1);
    }
    close(ready[1]);
    char byte = 0;
    ASSERT_EQ(read(ready[0], &byte, 1), 0);  // closed: the program is there
    close(ready[0]);
    WriteFile(DAEMON_PID_FILE, std::to_string(daemon) + "\n");

    ScopedFd opened(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
    listening.Swap(opened);
    sockaddr_un address = {};
    address.sun_family = AF_UNIX;
    strncpy(address.sun_path, CONTROL_SOCKET, sizeof(address.sun_path) - 1);
    ASSERT_EQ(bind(listening.fd, reinterpret_cast<sockaddr*>(&address), sizeof(address)), 0);
    ASSERT_EQ(listen(listening.fd, 10), 0);
  }

  // The next command, whose client waits on `client`.
  std::string Accept(ScopedFd& client) {
    ScopedFd accepted(accept4(listening.fd, nullptr, nullptr, SOCK_CLOEXEC));
    uint32_t length = 0;
    EXPECT_EQ(recv(accepted.fd, &length, sizeof(length), MSG_WAITALL), 4);
    std::string body(length, '\0');
    EXPECT_EQ(recv(accepted.fd, body.data(), length, MSG_WAITALL), static_cast<ssize_t>(length));
    client.Swap(accepted);
    return body.c_str();
  }
  void Answer(const ScopedFd& client, int32_t reply) {
    EXPECT_EQ(send(client.fd, &reply, sizeof(reply), MSG_NOSIGNAL), 4);
  }

  std::string Upsert() {
    return R"({"type":"upsert_folder_setting","data":{"folder_path":")" + root + "\"}}";
  }

  pid_t daemon = 0;
  ScopedFd listening;
  std::unique_ptr<StateStore> store;
  Keeper keeper{std::chrono::milliseconds(1)};
};

TEST_F(KeeperTest, ShareThatAppearsIsToldToTheDaemonAndTouched) {
  StartDaemon();
  ASSERT_TRUE(keeper.Start());
  keeper.Appeared("s");
  ScopedFd client;
  EXPECT_EQ(Accept(client), Upsert());
  EXPECT_FALSE(Exists(QueuePath("s")));
  Answer(client, 0);

  while (!Exists(QueuePath("s"))) {
    poll(nullptr, 0, 1);
  }
  keeper.Stop();
}

TEST_F(KeeperTest, RoundsGoOnByThemselves) {
  ASSERT_TRUE(keeper.Start());
  for (int i = 0; i < 3; ++i) {
    ASSERT_TRUE(store->UpdateStatus("s", [](ShareStatus& status) { status.needs_reindex = true; }));
    while (!Exists(QueuePath("s"))) {
      poll(nullptr, 0, 1);
    }
    ASSERT_EQ(unlink(QueuePath("s").c_str()), 0);
  }
  keeper.Stop();
}

// A daemon that does not answer is waited for 70 s; the limit of a test is beyond that.
TEST_F(KeeperTest, StopDoesNotWaitForADaemonThatIsBusy) {
  StartDaemon();
  ASSERT_TRUE(keeper.Start());
  keeper.Appeared("s");
  ScopedFd client;
  EXPECT_EQ(Accept(client), Upsert());
  keeper.Stop();

  char byte = 0;
  EXPECT_EQ(recv(client.fd, &byte, 1, MSG_DONTWAIT), 0) << "the keeper has not hung up";
}

TEST_F(KeeperTest, PassedPauseIsEndedAtTheDaemon) {
  ASSERT_TRUE(store->SetPause(1));
  StartDaemon();
  ASSERT_TRUE(keeper.Start());
  for (int i = 0; i < 2; ++i) {
    ScopedFd client;
    EXPECT_EQ(Accept(client), R"({"type":"resume","data":{}})");
    Answer(client, 0);
  }

  int64_t resume_time = 1;
  while (resume_time == 1) {
    ASSERT_TRUE(store->GetPause(resume_time));
  }
  EXPECT_EQ(resume_time, -1);
  keeper.Stop();
}

TEST_F(KeeperTest, ReplyOfTheDaemonIsPassedOn) {
  EXPECT_EQ(SendToDaemon("{}"), Reply::NOT_RUNNING);
  StartDaemon();
  const pid_t client = Fork([] {
    const bool good = SendToDaemon("{\"a\":1}") == Reply::DONE &&
                      SendToDaemon("{}") == Reply::REFUSED &&
                      SendToDaemon("{}") == Reply::NO_ANSWER;
    return good ? 0 : 1;
  });
  ScopedFd served;
  EXPECT_EQ(Accept(served), "{\"a\":1}");
  Answer(served, 0);
  EXPECT_EQ(Accept(served), "{}");
  Answer(served, -1);
  EXPECT_EQ(Accept(served), "{}");
  served.Close();
  EXPECT_EQ(WaitFor(client), 0);
}

}  // namespace fileindexd
