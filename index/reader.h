// SPDX-License-Identifier: GPL-2.0-or-later
// Reading one share's entries. One thread at a time; sees one consistent state per call. Never
// hinders the writer for longer than its call.
#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>

#include "index/database.h"
#include "index/entry.h"

namespace fileindexd {

class EntryReader {
 public:
  // NONE, or why the index of that share cannot be read.
  IndexError Open(const std::string& share_name);
  // The same. Where there is none it looks again for a fifth of a second: a database that is just
  // being made, or put in another's place, is not there for some milliseconds.
  IndexError OpenOnceMade(const std::string& share_name);

  // What the last Summarise, Count or ForEach has met.
  IndexError read_error = IndexError::NONE;

  struct Summary {
    uint64_t entries = 0;
    uint64_t wanted = 0;      // those whose content is wanted
    int64_t last_commit = 0;  // seconds since the epoch; 0: none yet
  };
  bool Summarise(Summary& summary);

  // Whether the share was never indexed: it has no folder for an index.
  static bool IsMissing(const std::string& share_name);

  // Entries of the share. False when reading failed.
  bool Count(uint64_t& entries);

  // Calls `visit` with each entry at or below normal path `under` in byte order of the paths, until
  // it returns false. False when reading failed.
  bool ForEach(const std::string& under, const std::function<bool(const Entry&)>& visit);

  // The entry at exactly that path, if there is one. NONE, or why that cannot be told.
  IndexError Find(const std::string& path, std::optional<Entry>& entry);

  // Calls `visit` with each entry of that inode, in no order, until it returns false. False when
  // reading failed.
  bool ForEachOfInode(uint64_t inode, const std::function<bool(const Entry&)>& visit);

  // Whether what was being written when this reader was first asked has ended since, committed or
  // not: what its writer saw on the disk before that is in what is read from now on. Waits for it
  // that long. True where it cannot be told.
  bool HasWriterEnded(int milliseconds);

  // How many entries lie below normal path `directory`, counted up to `limit`, which reads their
  // part of an index. False when reading failed.
  bool CountBelow(const std::string& directory, uint64_t limit, uint64_t& below);

  IndexDatabase database;

 private:
  bool Ends(bool is_read);  // sets read_error

  std::optional<int64_t> first_written;  // `last_written` when HasWriterEnded was first asked
};

}  // namespace fileindexd
