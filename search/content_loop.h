// SPDX-License-Identifier: GPL-2.0-or-later
// The content service: follows what the daemon commits, has what is wanted read by the pool of
// helpers, and writes it down.
//
// DESIGN. One thread for all but what the shares' file systems are asked, the cutting of texts
// while one share alone has any (see opener.h), and commits. It never waits but in poll, and for
// disks of our own:
//
//   watches      hints: a commit, other settings, the pause, the daemon's pid file
//   permission   the daemon's end, the end of a pause
//   pool         helpers' answers
//   shares       answers of their file systems
//   deadlines    of documents, commits, rests
//
// A step takes in what was told, ends what the helpers ended, gives each share one slice, and hands
// files to the helpers, one share after the other: first what is new in any of them. Reading is
// child processes' work, and what a share's file system is asked, which may never answer, is a
// thread's of that share. The rest is SQLite's, which takes one writer at a time. Texts are packed
// and cut into words beside it, by the thread that looked whether their file is still the same;
// where several shares are at work, whose texts would add up, by the writer. A commit, which writes
// the words' table and waits for the disk, is a thread's of its own while there is more to read:
// the helpers are given work meanwhile. Without permission nothing is read and nothing written:
// what runs is killed and taken back, and it goes on where it was.
#pragma once

#include <poll.h>

#include <chrono>
#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <vector>

#include "extract/pool.h"
#include "search/permission.h"
#include "search/share_contents.h"
#include "search/watches.h"
#include "state/store.h"

namespace fileindexd {

class ContentLoop {
 public:
  explicit ContentLoop(PoolOptions helpers) : options(std::move(helpers)) {}

  // Opens the state. False, and `error` then says why, on failure.
  bool Start(std::string& error);

  void AddPolled(std::vector<pollfd>& polled, Time now) const;
  // When Step wants to be called even though nothing is ready.
  Time Due(Time now) const;
  // `polled`: as AddPolled made it and poll left it. `wall`: seconds since the epoch.
  void Step(const std::vector<pollfd>& polled, Time now, int64_t wall);
  // Takes back what runs.
  void End();

 private:
  struct Followed {
    explicit Followed(const Share& share) : contents(share) {}
    ShareContents contents;
    std::string folders;  // that are indexed, and what of them, as a text to be compared
  };
  // Of a job.
  struct Owner {
    std::string share;
    ShareContents::Turn turn = ShareContents::Turn::NEW;
  };

  void Listen(Time now);
  // Those of the shares that are followed; `names` is empty then.
  void Tell(std::set<std::string>& names, void (ShareContents::*what)());
  bool Reload();
  bool ReadState(std::string& problem);
  bool Follow(const Share& share, const std::string& folders,
              const std::shared_ptr<const Settings>& settings);
  void OpenPool(Time now);
  void TellLeftOut();
  void TakeOutcomes(Time now);
  void TakeOutcome(ExtractOutcome&& outcome, Time now);
  // What is read again leaves a helper to what is new, where there is more than one.
  bool MayReadAgain(Time now) const;
  bool IsNewWaiting(Time now) const;  // in any share
  void HandOut(Time now);
  bool HandOutOne(ShareContents::Turn turn, Time now);
  void RestPool(Time now, const std::string& reason);
  void SettleRetries();

  PoolOptions options;
  Watches watches;
  Hints hints;
  Permission permission;
  std::unique_ptr<StateStore> store;
  std::map<std::string, Followed> shares;  // by name

  std::string state_problem;  // as it was told; empty: the state can be read
  bool works = false;         // had permission at the last step
  std::unique_ptr<ExtractPool> pool;
  Time pool_rest_until;
  std::chrono::seconds pool_rest{0};
  bool pool_told = false;               // that it rests
  std::optional<std::string> left_out;  // as it was told
  uint64_t last_job = 0;                // id
  std::map<uint64_t, Owner> owner;      // by job
  std::string last_share;               // that was given a turn
  Time next_listen;
  Time next_reload = Time::max();
  Time next_look;  // where something could not be watched
};

}  // namespace fileindexd
