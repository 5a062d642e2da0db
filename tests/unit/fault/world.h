// SPDX-License-Identifier: GPL-2.0-or-later
// A share on disk, its state, and the daemon's registry with a Worker for it, all of them real.
#pragma once

#include <string>
#include <vector>

#include "daemon/daemon.h"
#include "worker/worker.h"

namespace fileindexd::fault {

class World {
 public:
  // In the working directory: "share" with files, and a state that knows it. Nothing fails yet.
  World();
  ~World();
  World(const World&) = delete;
  World& operator=(const World&) = delete;

  // The share's Worker, made by the registry if there is none. False where the registry makes none.
  bool HaveWorker();
  // One burst of the Worker's thread, as an event of the queue starts it; nothing without a Worker.
  void Burst();
  void Touch();  // of the queue, by whoever does not know what is in it

  // Files come, go, move and change; the lines that tell of it are queued.
  void ChangeFiles();
  void AskForReindex();

  // Index, queue and status are as they have to be once all is done.
  void ExpectWhole();
  // After a fault has passed.
  void ExpectMadeGoodByATouch();

  std::string root;
  std::string state_root;
  Daemon daemon;

 private:
  static void Join(pthread_t thread);
  void ExpectNoDifference();
  void ExpectStatusClear();
  void ExpectIntegrity();
  void ExpectWordsOfNames();
  void ExpectEachNameFound();

  std::vector<std::string> lines;
};

}  // namespace fileindexd::fault
