// SPDX-License-Identifier: GPL-2.0-or-later
// One share "s" on a folder of its own, with one indexed folder (the whole share), and a Worker.
#pragma once

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <memory>
#include <set>
#include <string>
#include <vector>

#include "daemon/daemon.h"
#include "scripted/script.h"
#include "scripted/temp_folder.h"
#include "worker/worker.h"

namespace fileindexd {

// What changes an index.
inline const std::set<std::string> CHANGES = {"AddFSDocument", "UpdateFSDocument", "DelFSDocument",
                                              "Commit"};

class WorkerFixture : public ::testing::Test {
 protected:
  WorkerFixture();
  ~WorkerFixture() override;

  // Makes the Worker as the registry does. Null when the constructor throws -1.
  Worker* Create();
  void Delete();

  // A folder setting of the share; `path` absolute.
  void AddFolder(const std::string& path);
  // Appends lines to the queue file.
  void Queue(const std::vector<std::string>& lines);
  static std::string Event(int code, const std::string& path, const std::string& more = "");
  std::string In(const std::string& name) const { return share_path + "/" + name; }

  // One burst: starts the thread and waits for its end.
  void RunThread();
  // Stops and joins as the registry does; `cancel` at once.
  void JoinThread(bool cancel);

  static std::vector<std::string> Log() { return script.Texts(); }
  static std::vector<std::string> Changes() { return script.CallsOf(CHANGES); }
  // Both of the Daemon's mutexes and the Worker's own can be taken now.
  void ExpectMutexesFree();

  static scripted::Script& script;
  scripted::TempFolder folder;
  std::string share_path;
  std::string queue_path;
  std::string db_path;
  Daemon daemon;
  Worker* worker = nullptr;
  bool running = false;
  int indexers_before = 0;
  int records_before = 0;
};

}  // namespace fileindexd
