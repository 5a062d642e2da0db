// SPDX-License-Identifier: GPL-2.0-or-later
// One entry of an index.
#pragma once

#include <cstdint>
#include <string>

#include "index/kind.h"
#include "state/belonging.h"

namespace fileindexd {

// Times are nanoseconds since the epoch.

// What was read is the content of a file with exactly these four.
struct FileIdentity {
  uint64_t inode = 0;
  int64_t birth_time = 0;  // 0: not known
  int64_t size = 0;
  int64_t mtime = 0;
  bool operator==(const FileIdentity&) const = default;
};

struct Entry {
  int64_t id = 0;
  std::string path;  // normal
  Thing thing = Thing::NONE;
  Kind kind = Kind::OTHER;
  bool content_wanted = false;
  uint64_t inode = 0;
  int64_t size = 0;   // bytes; 0 for a directory
  int64_t mtime = 0;  // 0 for a directory
  int64_t ctime = 0;
  int64_t birth_time = 0;  // 0: not known
  int64_t first_seen = 0;  // when the entry was added
  uint32_t owner = 0;
  uint32_t group = 0;
  uint32_t mode = 0;
  int64_t written =
      0;  // when the row was last written, a greater number each time; set by the table
  int64_t reread = 0;  // the `written` of the last add that found it changed; 0: none
};

inline FileIdentity IdentityOf(const Entry& entry) {
  return {entry.inode, entry.birth_time, entry.size, entry.mtime};
}

}  // namespace fileindexd
