// SPDX-License-Identifier: GPL-2.0-or-later
// A walk of what belongs in an index, in byte order of the full paths.
//
// That order is not the one of directory after directory: "a!b" and "a.b" sort between "a" and
// "a/b". So each directory appears twice among its neighbours: as "a", where it is met, and as
// "a/", where what it holds is met.
//
// No descriptor is held between two steps. Memory grows with the largest directory (its names, and
// 9 bytes for each) and the depth.
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "state/belonging.h"

namespace fileindexd {

class DiskWalk {
 public:
  enum class Step { FOUND, END, FAILED };

  // `walked` outlives the walk.
  explicit DiskWalk(const Settings& walked) : settings(walked) {}

  // Begins with the indexed folders of a share themselves. With `passed` it leaves out that path
  // and all before it.
  void StartAtFolders(const Share& share, std::string passed = {});
  // Begins with what the directory holds. It is looked at first.
  void StartBelow(const std::string& directory);

  // The next thing that belongs. After FAILED, `path` is what could not be looked at, or the
  // directory that could not be read, and errno why; the walk goes on with what is neither at that
  // path nor below it. Things directly in one directory are looked at up to 64 at a time, ahead of
  // their turn.
  Step Next(std::string& path, Look& look);

  // The deepest indexed folder that covers what was found last.
  const IndexedFolder* folder = nullptr;

 private:
  // A name, or a name and '/' for what it holds.
  struct Item {
    uint32_t offset = 0;  // into the level's names
    uint16_t length = 0;
    bool below = false;
    bool descend = false;
  };
  struct Level {
    std::string directory;                  // empty: the names are full paths
    const IndexedFolder* folder = nullptr;  // the one that covers the directory
    std::string names;                      // each with a NUL behind it
    std::vector<Item> items;
    size_t next = 0;
    std::vector<Look> looks;  // of the next names
    size_t next_look = 0;
  };
  enum class Reading { DONE, NOTHING, FAILED };

  static void AddItem(Level& level, std::string_view name, bool below);
  static void Sort(Level& level);
  static std::string_view NameOf(const Level& level, const Item& item);
  static void SetPath(const Level& level, const Item& item, std::string& path);

  bool IsPassed(const std::string& path) const;
  bool MayHoldUnpassed(const std::string& path) const;
  Step TakeName(Level& level, std::string& path, Look& look);
  Reading LookAhead(Level& level, const JudgedDirectory& directory);
  Reading LookAheadAgain(Level& level);
  void AllowDescent(Level& level, const Look& look, const std::string& path);
  bool Enter(const std::string& directory);
  Reading ReadNames(const JudgedDirectory& directory, Level& level);

  const Settings& settings;
  std::vector<Level> levels;
  uint64_t mount_id = 0;     // of all that is entered: the share's own
  std::string passed_path;   // what is not after it is left out; empty once that is behind
  std::vector<char> buffer;  // of directory entries
  std::string name_path;     // of a name that is looked at ahead
};

}  // namespace fileindexd
