// SPDX-License-Identifier: GPL-2.0-or-later
#include "tests/unit/state/mounts.h"

#include <sched.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>

namespace fileindexd {

namespace {

// Once for the whole program: mounts vanish with it, however it ends.
bool EnterOwnNamespace() {
  static const bool entered =
      unshare(CLONE_NEWNS) == 0 && mount("", "/", nullptr, MS_REC | MS_PRIVATE, nullptr) == 0;
  return entered;
}

}  // namespace

MountTest::MountTest() : root(folder + "/share") {
  settings.shares = {{"s", root, ""}};
  settings.folders = {{"s", root, {}}};
  settings.state_root = state_root;
  std::filesystem::create_directories(root);
}

MountTest::~MountTest() {
  while (!mounted.empty()) {
    Unmount(mounted.back());
  }
}

void MountTest::SetUp() {
  if (geteuid() != 0) {
    GTEST_SKIP() << "needs root";
  }
  ASSERT_TRUE(EnterOwnNamespace());
}

void MountTest::Run(const std::string& command) {
  ASSERT_EQ(system((command + " >/dev/null 2>&1").c_str()), 0) << command;
}

void MountTest::MountImage(const std::string& type, const std::string& at) {
  last_image = folder + "/" + std::to_string(++images) + type + ".img";
  MakeFolder(at);
  Run("truncate -s " + std::string(type == "xfs" ? "320M " : "120M ") + last_image);
  Run("mkfs." + type + " -q " + last_image);
  Run("mount -o loop " + last_image + " " + at);
  mounted.push_back(at);
}

void MountTest::MountTmpfs(const std::string& at) {
  MakeFolder(at);
  ASSERT_EQ(mount("none", at.c_str(), "tmpfs", 0, nullptr), 0) << at;
  mounted.push_back(at);
}

void MountTest::Bind(const std::string& from, const std::string& at) {
  ASSERT_EQ(mount(from.c_str(), at.c_str(), nullptr, MS_BIND, nullptr), 0) << at;
  mounted.push_back(at);
}

void MountTest::MountOwnRun() {
  MountTmpfs("/run");
  struct stat run = {};
  struct stat var_run = {};
  if (stat("/run", &run) != 0 || stat("/var/run", &var_run) != 0 || run.st_ino != var_run.st_ino) {
    Bind("/run", "/var/run");
  }
}

void MountTest::Unmount(const std::string& at) {
  EXPECT_EQ(umount2(at.c_str(), MNT_DETACH), 0) << at;
  for (auto i = mounted.end(); i != mounted.begin();) {
    if (*--i == at) {
      mounted.erase(i);
      return;
    }
  }
}

void MountTest::MakeFolder(const std::string& path) {
  std::error_code failure;
  std::filesystem::create_directories(path, failure);
  ASSERT_FALSE(failure) << path << ": " << failure.message();
}

void MountTest::MakeFile(const std::string& path) {
  MakeFolder(std::filesystem::path(path).parent_path());
  WriteFile(path, "text");
}

}  // namespace fileindexd
