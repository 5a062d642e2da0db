// SPDX-License-Identifier: GPL-2.0-or-later
// A share's entries in byte order of the paths, read in slices: a transaction that lasts as long as
// the walk beside it would keep the writer's log from being cut. What is written meanwhile is met
// or not, as it falls.
#pragma once

#include <string>
#include <vector>

#include "index/entry.h"
#include "state/sqlite.h"

namespace fileindexd {

class EntryStream {
 public:
  // The connection outlives the stream. What is not after `passed` is left out.
  void Start(sqlite3* opened, std::string passed);

  // False when reading failed. `entry` is null at the end; of it are set the path, what it is, the
  // attributes that tell whether it is stale, and whether its content is wanted.
  bool Next(const Entry*& entry);

 private:
  bool ReadSlice();

  sqlite3* db = nullptr;
  Statement statement;
  std::string after;
  std::vector<Entry> rows;  // made once, their texts reused
  size_t count = 0;         // rows that hold something
  size_t next = 0;
  bool ended = false;
};

}  // namespace fileindexd
