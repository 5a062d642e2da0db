// SPDX-License-Identifier: GPL-2.0-or-later
// How each share is watched: the best that its file system allows.
//
//   fanotify     one mark for each file system, whatever the number of its shares and directories
//   inotify      one watch for each directory, where the file system cannot be marked
//   comparison   none at all: on file systems that others change as well (network, FUSE), and where
//                neither of the two can be had
#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <string>
#include <unordered_map>
#include <utility>
#include <vector>

#include "notify/change.h"
#include "notify/fan_group.h"
#include "notify/mount_table.h"
#include "notify/tree_watch.h"
#include "state/settings.h"

namespace fileindexd {

enum class WatchedBy { FANOTIFY, INOTIFY, COMPARISON, NOBODY };  // from the best down
// "fanotify", "inotify", "comparison"; null for NOBODY.
const char* WatchedByText(WatchedBy by);

// Where a share's root lies.
struct SharePlace {
  std::string root;    // the share's path
  std::string real;    // where that leads
  uint64_t inode = 0;  // of the root
  uint64_t mount = 0;  // id of the mount that shows it
  std::string device;  // of that mount
  std::string within;  // the root's path within the file system
  bool operator==(const SharePlace&) const = default;
};

struct ShareWatch {
  WatchedBy by = WatchedBy::NOBODY;
  std::string problem;  // why it is not watched, or not better; empty: none
  SharePlace place;
  bool can_hang = false;                           // with another machine, or a program
  bool moved = false;                              // something happened at or above the root
  std::chrono::steady_clock::time_point next_try;  // to watch it better
  std::vector<std::string> points;                 // what is mounted inside the share
  std::unique_ptr<TreeWatch> tree;                 // by INOTIFY
  std::vector<IndexedFolder> folders;
  uint64_t overflows = 0;
};

// One thread.
class Watches {
 public:
  // `best_way`: nothing better than that is tried.
  explicit Watches(WatchedBy best_way) : best(best_way) {}

  // What the caller has to do after a change of settings or mounts.
  struct News {
    std::vector<std::string> appeared;  // shares that are watched anew: what came before is unknown
    std::vector<std::string> changed;   // shares whose folders are others than before
    std::vector<std::pair<std::string, std::string>> mounts;  // share, and a path in it where
                                                              // something was mounted or unmounted
  };
  // Brings the watches into line with the settings, the mounts and the shares' roots of now.
  News Follow(const std::shared_ptr<const Settings>& in_force);

  // Returns whether the share took the change in.
  using TellShare = std::function<bool(const std::string& share, const Change& change)>;
  struct ChangedThing {
    std::string device;
    uint64_t inode = 0;
  };
  struct Reading {
    bool all_read = true;                // nothing waits any more
    bool roots_moved = false;            // something happened at or above a share's root, or a
                                         // watch broke: Follow is due
    std::vector<std::string> overflown;  // shares of which events were lost
    std::vector<ChangedThing> unseen;  // things that were changed by names which no share took, and
                                       // may have others
  };
  // Reads what waits, a bounded number of buffers.
  Reading Read(const TellShare& tell);

  // The thing that the target of one of the share's changes is. False when it cannot be told.
  bool LookAtTarget(const std::string& share, const std::string& target,
                    FanGroup::Target& thing) const;

  // All descriptors that can be read from.
  std::vector<int> Descriptors() const;

  // Whether a share that should be watched is not there: it may come without a sign.
  bool IsAnyMissing() const;

  std::map<std::string, ShareWatch> shares;  // by name

 private:
  using Clock = std::chrono::steady_clock;

  const Mount* Place(const Share& share, SharePlace& place, std::string& problem) const;
  bool IsBroken(const ShareWatch& watch, bool same_folders,
                const std::vector<std::string>& points) const;
  void FollowShare(const Share& share, News& news);
  void TryBetter(const Share& share, const Mount& mount, ShareWatch& watch, News& news);
  void Begin(const Share& share, const Mount& mount, ShareWatch& watch);
  bool BeginFanotify(const Mount& mount, ShareWatch& watch, std::string& refusal);
  // By the handle of what was changed: a path within the file system.
  using Strays = std::unordered_map<std::string, std::string>;
  void Tell(const std::string& device, const Change& change, const TellShare& tell, Strays& strays,
            Reading& reading);
  static void FindOtherNames(const FanGroup& group, const std::string& device, const Strays& strays,
                             Reading& reading);
  void ReadGroups(const TellShare& tell, Reading& reading);
  void ReadTrees(const TellShare& tell, Reading& reading);
  void DropUnusedGroups();

  const WatchedBy best;
  MountTable mounts;
  std::shared_ptr<const Settings> settings;
  std::map<std::string, std::unique_ptr<FanGroup>> groups;  // by device
  std::string own_device;                                   // of the state folder
  std::string own_within;                                   // and its path within it
};

}  // namespace fileindexd
