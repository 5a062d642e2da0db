// SPDX-License-Identifier: GPL-2.0-or-later
// Changes of one share through inotify, with a watch on each directory: for file systems that
// fanotify does not mark.
#pragma once

#include <memory>
#include <string>

#include "notify/change.h"
#include "state/settings.h"

namespace fileindexd {

// One thread. Memory grows with the number of directories.
class TreeWatch {
 public:
  // Watches each directory of the share that belongs, and those on the way to an indexed folder.
  // Null, and `error` then tells in one line that names the limit
  // (fs.inotify.max_user_watches, max_user_instances) or the path, when not all can be watched.
  static std::unique_ptr<TreeWatch> Open(std::shared_ptr<const Settings> settings,
                                         const Share& share, std::string& error);
  ~TreeWatch();
  TreeWatch(const TreeWatch&) = delete;
  TreeWatch& operator=(const TreeWatch&) = delete;

  enum class Result {
    EMPTY,   // nothing waits
    MORE,    // there may be more
    FAILED,  // Error() tells; the watch is of no use any more
  };
  // Reads one buffer of events and tells of each change, with full paths. Directories that appear
  // are watched from then on, with all below them.
  Result Read(const TellChange& tell);
  const std::string& Error() const;

  // True once after events were lost.
  bool TakeOverflow();

  size_t Waiting() const;  // bytes of events that wait
  size_t Directories() const;
  int Descriptor() const;

 private:
  struct Impl;
  explicit TreeWatch(std::unique_ptr<Impl> opened);
  std::unique_ptr<Impl> impl;
};

}  // namespace fileindexd
