// SPDX-License-Identifier: GPL-2.0-or-later
// What is mounted where, as this process sees it at one moment.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

namespace fileindexd {

struct Mount {
  uint64_t id = 0;
  uint64_t parent = 0;
  std::string device;  // "major:minor": one for each mounted file system, whatever its mounts
  std::string root;    // the path within the file system that the mount shows
  std::string point;   // normal
  std::string type;    // "ext4"
  std::string source;  // "/dev/sda1"
  bool operator==(const Mount&) const = default;
};

// From /proc/self/mountinfo, which polls as an error (POLLPRI) when it has changed. One thread.
class MountTable {
 public:
  // Replaces what is here. False, with errno, when it cannot be read; then nothing changes.
  bool Read();

  // The mount that shows normal path `path`: of those whose point covers it the one that is on
  // top. By the table alone; null for a path that is shown by none.
  const Mount* MountOf(std::string_view path) const;

  // Where `path`, shown by `mount`, lies within the file system.
  static std::string PathWithin(const Mount& mount, std::string_view path);

  // Points, each once and in byte order, at or below normal path `path`.
  std::vector<std::string> PointsBelow(std::string_view path) const;

  std::vector<Mount> mounts;  // in the order of the table: later ones hide earlier ones
};

// Whether others than this machine change file systems of that type: no event tells of it, though
// some of them can be watched.
bool IsChangedElsewhere(std::string_view type);

// The path of what lies at `below`, without a slash in front, under normal path `root`.
std::string PathBelow(const std::string& root, std::string_view below);

}  // namespace fileindexd
