// SPDX-License-Identifier: GPL-2.0-or-later
// Puts inotify watches on the directories of a share and keeps the tree of their names.
#pragma once

#include <sys/inotify.h>

#include <cstdint>
#include <memory>
#include <set>
#include <string>
#include <vector>

#include "base/scoped_fd.h"
#include "notify/watch_nodes.h"
#include "state/settings.h"

namespace fileindexd {

// One thread. What returns bool is false on failure, and `error` then says why; what is gone, or is
// no directory any more, is no failure.
class TreeWatcher {
 public:
  bool Open();
  // Sees to it that directory `name` in `parent` is watched, with all below it, if it is to be, and
  // not if not. The watch comes before the look into it, so nothing falls between. With `again`,
  // what is below is looked at even where it is watched already.
  bool Cover(WatchNode& parent, const std::string& name, bool again);
  // Renames in the tree, and then covers the new name.
  bool Move(WatchNode& from, const std::string& name, WatchNode& to, const std::string& new_name);
  // Stops watching it.
  void Drop(WatchNode& parent, const std::string& name);
  // Looks at everything anew. Watches that are there stay: what they told since is not lost.
  bool Rebuild();

  std::shared_ptr<const Settings> settings;
  Share share;
  ScopedFd inotify;
  WatchNodes nodes;
  std::set<int> above;  // watches on the directories above the share's root
  bool stale = false;   // the tree contradicts the disk: to be rebuilt
  std::string error;

 private:
  struct Todo {
    int parent_wd;
    std::string name;
    bool again;
  };
  enum class Added { WATCHED, GONE, FOREIGN, FAILED };

  bool IsWanted(const std::string& path) const;
  bool IsJudgedAlike(const std::string& from, const std::string& to) const;
  Added Add(const std::string& path, ScopedFd& directory, int& wd);
  bool AddAbove();
  bool CoverOne(const Todo& todo, std::vector<Todo>& todos);
  bool CoverAll(std::vector<Todo> todos);
  bool List(const ScopedFd& directory, int wd, bool again, std::vector<Todo>& todos);
  bool StartAtRoot(std::vector<Todo>& todos);
  void DropNodes(std::unique_ptr<WatchNode> top);
  bool Failed(const std::string& path);

  uint64_t mount_id = 0;  // of the share's root; 0: the kernel tells none
  uint64_t device = 0;
};

}  // namespace fileindexd
