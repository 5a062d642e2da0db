// SPDX-License-Identifier: GPL-2.0-or-later
// Tells that the daemon took a queue file, and that the state database was written.
#pragma once

#include <map>
#include <set>
#include <string>

#include "base/scoped_fd.h"

namespace fileindexd {

// One thread. Hints: whoever gets one looks.
class QueueWatch {
 public:
  // Watches the state root. False with errno when the host refuses.
  bool Open();
  // Watches the folders of these shares, where they exist, and no others.
  void Set(const std::set<std::string>& share_names);
  // Reads what waits. True when settings may have changed; adds to `taken` the shares whose queue
  // file went.
  bool Read(std::set<std::string>& taken);
  // Whether the state root was moved or removed: what is opened and allowed is the old one's.
  bool IsRootGone() const { return root_is_gone; }
  int Descriptor() const { return inotify.fd; }

 private:
  ScopedFd inotify;
  int root = -1;
  bool root_is_gone = false;
  std::map<int, std::string> folders;  // share names by watch descriptor
};

}  // namespace fileindexd
