// SPDX-License-Identifier: GPL-2.0-or-later
#include "unit/daemon/daemon_fixture.h"

#include <sched.h>
#include <sys/mount.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <csignal>
#include <cstring>
#include <fstream>

namespace fileindexd {

scripted::Script& DaemonFixture::script = scripted::TheScript();

bool HideRun() {
  static const bool hidden = [] {
    const int flags = geteuid() == 0 ? CLONE_NEWNS : CLONE_NEWNS | CLONE_NEWUSER;
    return unshare(flags) == 0 && mount("", "/", nullptr, MS_REC | MS_PRIVATE, nullptr) == 0 &&
           mount("tmpfs", "/run", "tmpfs", 0, nullptr) == 0;
  }();
  return hidden;
}

DaemonFixture::DaemonFixture() {
  if (!HideRun()) {
    throw std::runtime_error("cannot put a file system over /run");
  }
  script.Reset();
  script.removable_below = folder.path;
  for (const std::string name : {"a", "b", "c"}) {
    folder.MakeDir("share-" + name);
    folder.MakeDir("queue-" + name);
    script.shares.push_back({name, SharePath(name), QueuePath(name), folder.Path("db-" + name)});
  }
  stop_requested = 0;
}

DaemonFixture::~DaemonFixture() {
  script.Release();
  daemon.CleanResource();
  EXPECT_TRUE(daemon.workers.empty());
  EXPECT_EQ(script.live_records, 0);
  TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_ERROR;
}

std::string DaemonFixture::QueuePath(const std::string& name) const {
  return folder.path + "/queue-" + name + "/TALO@file_index_queue";
}

int DaemonFixture::Connect(const std::string& bytes, bool gone) {
  const int client = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
  sockaddr_un address = {};
  address.sun_family = AF_UNIX;
  strncpy(address.sun_path, SOCKET_PATH, sizeof(address.sun_path) - 1);
  EXPECT_EQ(connect(client, reinterpret_cast<sockaddr*>(&address), sizeof(address)), 0);
  EXPECT_EQ(write(client, bytes.data(), bytes.size()), static_cast<ssize_t>(bytes.size()));
  if (gone) {
    shutdown(client, SHUT_WR);
  }
  return client;
}

void DaemonFixture::AddFolder(const std::string& share, const std::string& path) {
  TALO::FILEINDEX::Folder added;
  added.share = share;
  added.path = path;
  script.folders.push_back(added);
}

void DaemonFixture::SetUpShares(const std::vector<std::string>& names) {
  for (const std::string& name : names) {
    AddFolder(name, SharePath(name));
  }
  ASSERT_TRUE(daemon.SetupInotify());
  ASSERT_TRUE(daemon.SetupWorkers());
  script.Forget();
}

void DaemonFixture::WriteQueue(const std::string& name, const std::string& path) {
  std::ofstream(QueuePath(name), std::ios::app) << "{\"event\":128,\"path\":\"" << path << "\"}\n";
}

// The debug line is the thread's last but for the state, which follows at once.
void DaemonFixture::AwaitFinished(const std::string& name, size_t times) {
  ASSERT_TRUE(script.AwaitCall("QLIBCExec /bin/rm -rf " + QueuePath(name) + ".tmp", times));
  volatile int& state = daemon.workers.at(name)->state;
  while (state != WORKER_FINISHED) {
    sched_yield();
  }
}

}  // namespace fileindexd
