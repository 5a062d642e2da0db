// SPDX-License-Identifier: GPL-2.0-or-later
// All changes of one file system, through one fanotify group with one mark.
#pragma once

#include <memory>
#include <string>

#include "notify/change.h"
#include "notify/mount_table.h"

namespace fileindexd {

// One thread. Needs CAP_SYS_ADMIN to open, CAP_DAC_READ_SEARCH to read.
class FanGroup {
 public:
  // Marks the file system that `mount` shows. Null, and `error` then names the call and the reason,
  // where the kernel or the file system refuses. While the object lives it holds a mount of the
  // whole file system that no path leads to: unmounting goes on to work, but the device stays in
  // use until the object is gone.
  static std::unique_ptr<FanGroup> Open(const Mount& mount, std::string& error);
  ~FanGroup();
  FanGroup(const FanGroup&) = delete;
  FanGroup& operator=(const FanGroup&) = delete;

  enum class Result {
    EMPTY,   // nothing waits
    MORE,    // there may be more
    FAILED,  // errno tells; the group is of no use any more
  };
  // Reads one buffer of events and tells of each change, with paths within the file system as they
  // are now. A change in a directory that is gone is not told: that the directory went is; but a
  // change of a thing that has other names is, without a path.
  Result Read(const TellChange& tell);

  // The thing that a change's target is, as it is now.
  struct Target {
    uint64_t inode = 0;
    uint64_t links = 0;  // names that it has; 0: it is gone
    uint64_t device = 0;
  };
  // False when it cannot be told.
  bool LookAtTarget(const std::string& target, Target& thing) const;
  // Whether `path`, within the file system, shows that thing now.
  bool IsAt(const std::string& path, const Target& thing) const;

  // True once after events were lost.
  bool TakeOverflow();

  // Bytes of events that wait.
  size_t Waiting() const;

  int Descriptor() const;

 private:
  struct Impl;
  explicit FanGroup(std::unique_ptr<Impl> opened);
  std::unique_ptr<Impl> impl;
};

}  // namespace fileindexd
