// SPDX-License-Identifier: GPL-2.0-or-later
// Follows what the daemon commits: knows for each share how much is in its index, and how much of
// it has content that is wanted. One thread.
#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <string>

#include "search/watches.h"
#include "state/store.h"

namespace fileindexd {

struct FollowedShare {
  bool readable = false;  // the index could be read at the last look
  uint64_t entries = 0;
  uint64_t wanted = 0;  // entries whose content is wanted
  int64_t last_commit = 0;
};

class Follower {
 public:
  // Opens the state and looks at everything once. False, and `error` then says why, on failure.
  bool Start(std::string& error);

  // Takes in what the watches tell.
  void Listen() { watches.Read(hints); }
  // Has the next step look at everything, whatever was told.
  void LookAtAll();
  bool HasWork() const { return hints.everything || !hints.shares.empty(); }
  // One step: looks at what was hinted at. Stops early, its hints kept, when the process is asked
  // to end.
  void Step();

  Watches watches;
  std::map<std::string, FollowedShare> shares;  // by name

 private:
  bool ReloadSettings();
  void LookAt(const std::string& name, FollowedShare& share);

  Hints hints;
  std::unique_ptr<StateStore> store;
  std::shared_ptr<const Settings> settings;
};

// True when SIGTERM or SIGINT, both blocked, is waiting for this process.
bool IsEndAsked();

}  // namespace fileindexd
