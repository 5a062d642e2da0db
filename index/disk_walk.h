// SPDX-License-Identifier: GPL-2.0-or-later
// A walk of what belongs in an index, in byte order of the full paths.
//
// That order is not the one of directory after directory: "a!b" and "a.b" sort between "a" and
// "a/b". So each directory appears twice among its neighbours: as "a", where it is met, and as
// "a/", where what it holds is met.
//
// No descriptor is held between two steps. Memory grows with the largest directory and the depth.
#pragma once

#include <string>
#include <vector>

#include "state/belonging.h"

namespace fileindexd {

class DiskWalk {
 public:
  enum class Step { FOUND, END, FAILED };

  // `walked` outlives the walk.
  explicit DiskWalk(const Settings& walked) : settings(walked) {}

  // Begins with the indexed folders of a share themselves.
  void StartAtFolders(const Share& share);
  // Begins with what the directory holds. It is looked at first.
  void StartBelow(const std::string& directory);

  // The next thing that belongs. After FAILED, `path` is what could not be looked at, and errno
  // why.
  Step Next(std::string& path, Look& look);

 private:
  struct Item {
    std::string key;  // a name, or a name and '/' for what it holds
    bool descend = false;
    uint64_t mount_id = 0;
  };
  struct Level {
    std::string directory;  // empty: the keys are full paths
    std::vector<Item> items;
    size_t next = 0;
    bool any_mount = false;  // the mount of what holds the items does not count
    uint64_t mount_id = 0;
  };

  bool Enter(const std::string& directory, uint64_t mount_id);
  void AllowDescent(Level& level, const Look& look, const std::string& path);

  const Settings& settings;
  std::vector<Level> levels;
};

}  // namespace fileindexd
