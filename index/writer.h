// SPDX-License-Identifier: GPL-2.0-or-later
// The writer of one share's entries. It converges: whatever order operations come in, each leaves
// the entries that it touches as the disk shows them now.
//
// One thread at a time. Nothing throws. Between slices of long work it calls `between_slices`,
// where nothing is half done; that call may unwind.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <string>

#include "index/database.h"
#include "state/belonging.h"
#include "state/settings.h"
#include "state/store.h"

namespace fileindexd {

enum class DeleteMode { ENTRY = 0, STALE = 1, ALL = 2 };

// What is known below a directory that still is the one that was known.
enum class Below {
  KEPT,       // stays as it is
  LOOKED_AT,  // is brought in line with the disk as well
};

class EntryWriter {
 public:
  // `share_name` names the share whose index this is; `store` outlives the writer. Opens the
  // database; IsOpen and last_error tell how that ended.
  EntryWriter(std::string share_name, StateStore& store, std::function<void()> between_slices);
  ~EntryWriter();
  EntryWriter(const EntryWriter&) = delete;
  EntryWriter& operator=(const EntryWriter&) = delete;

  bool IsOpen() const;

  // Brings the entry at `path` in line with the disk, adding it where it is missing and belongs,
  // removing it with all below it that is gone or does not belong where it is gone or does not
  // belong. A path that is no longer the thing that was known has everything below it looked at.
  // `wanted`: the flags in force for it. `decide`: for which kinds it is decided anew whether
  // content is wanted; an entry that is new has it decided in any case.
  // `seen`: what the caller saw there a moment ago, or null to look here. It has to be younger than
  // whatever the operation tells of. The first operation after a commit looks in any case.
  bool Refresh(const std::string& path, const ContentFlags& wanted, const ContentFlags& decide,
               const Seen* seen = nullptr, Below below = Below::KEPT);
  // Like Refresh with every kind decided, of what somebody wrote to: where only its change time is
  // another, its content counts as changed all the same.
  bool Add(const std::string& path, const ContentFlags& wanted, const Seen* seen = nullptr,
           Below below = Below::KEPT);
  bool Delete(const std::string& path, DeleteMode mode);
  // True when everything since the last good commit is durable.
  bool Commit();

  IndexError last_error = IndexError::NONE;

  struct Impl;
  std::unique_ptr<Impl> impl;
};

}  // namespace fileindexd
