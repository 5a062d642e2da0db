// SPDX-License-Identifier: GPL-2.0-or-later
// A Daemon in this process, on shares "a", "b" and "c" of a temporary folder. /run is a file system
// of the test's own, so that the fixed paths of socket and pid file can be used.
#pragma once

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "daemon/daemon.h"
#include "platform/log.h"
#include "scripted/script.h"
#include "scripted/temp_folder.h"
#include "worker/worker.h"

namespace fileindexd {

constexpr const char* PID_PATH = "/var/run/fileindexd.pid";

class DaemonFixture : public ::testing::Test {
 protected:
  DaemonFixture();
  ~DaemonFixture() override;

  // Indexed folders of these shares, then SetupWorkers.
  void SetUpShares(const std::vector<std::string>& names);
  void AddFolder(const std::string& share, const std::string& path);
  std::string SharePath(const std::string& name) const { return folder.path + "/share-" + name; }
  std::string QueuePath(const std::string& name) const;
  void WriteQueue(const std::string& name, const std::string& path);  // one deletion
  // A thread that has ended by itself, not joined yet.
  void AwaitFinished(const std::string& name, size_t times = 1);

  // A client that has sent these bytes; with `gone` it sends no more.
  static int Connect(const std::string& bytes, bool gone = true);

  static std::vector<std::string> Log() { return script.Texts(); }

  static scripted::Script& script;
  scripted::TempFolder folder;
  Daemon daemon;
};

// Puts a file system of this process's own over /run. False without the right to.
bool HideRun();

}  // namespace fileindexd
