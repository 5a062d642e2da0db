// SPDX-License-Identifier: GPL-2.0-or-later
// What the keeper does, step by step, without a thread or a clock.
//
// A queue file that stays, round after round, while the daemon is there and nothing keeps it from
// work, has no Worker: it gets one. One that only missed its wake-up needs the touch alone.
#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <string>

#include "state/daemon_socket.h"
#include "state/store.h"

namespace fileindexd {

// How the daemon is reached.
struct DaemonLink {
  std::function<bool()> lives;
  std::function<Reply(const std::string& command)> send;
  // Lets so much time pass. False: the work is to end, now.
  std::function<bool(std::chrono::milliseconds)> wait;
};

// One thread. `now` is in seconds since the epoch.
class KeeperRound {
 public:
  KeeperRound(StateStore& state, DaemonLink link) : store(state), daemon(std::move(link)) {}

  // All that is done every 15 s.
  void Run(int64_t now);
  // A Worker for the share, at once, and a look at its queue.
  void Appear(const std::string& share_name, int64_t now);

 private:
  // Which file has the queue's name; a new one may have an old one's inode number.
  struct QueueFile {
    uint64_t inode = 0;
    int64_t birth_time = 0;  // nanoseconds since the epoch; 0: the file system keeps none
    bool operator==(const QueueFile&) const = default;
  };
  struct Kept {
    QueueFile queue;          // of the last round
    int rounds = 0;           // it has stood there, and should not have, before this one
    int64_t last_ask = 0;     // for a Worker; seconds since the epoch
    std::string trouble;      // that was told last; empty: there is none
    std::string ask_trouble;  // the same, of asking for a Worker
  };

  void RunShare(const Settings& settings, const Share& share, int64_t now);
  bool SeesSpace(const Share& share, ShareStatus& status, Kept& kept);
  bool HasStayed(const Share& share, Kept& kept);
  void AskForWorker(const Settings& settings, const Share& share, int64_t now, Kept& kept);
  void Touch(const std::string& share, Kept& kept);
  void EndPause(int64_t now);
  bool SendResume(int64_t resume_time, Reply& reply);
  void RestorePause(int64_t resume_time);
  std::string Trouble(Reply reply) const;
  void Tell(std::string& told, const std::string& trouble);

  StateStore& store;
  const DaemonLink daemon;
  bool daemon_lives = false;  // in this round
  bool paused = false;        // the same
  std::map<std::string, Kept> shares;
  std::string store_trouble;  // as Kept's
  std::string pause_trouble;  // the same
};

}  // namespace fileindexd
