// SPDX-License-Identifier: GPL-2.0-or-later
// A mount of a whole file system that no path leads to.
//
// Handles of directories are turned into paths through it. A mount that shows a part of the file
// system only would name what lies outside of that part by a path that looks right and is wrong;
// and a descriptor in the mount that people use would keep them from unmounting it.
#pragma once

#include <string>

#include "base/scoped_fd.h"
#include "notify/mount_table.h"

namespace fileindexd {

// While it lives the file system stays in use.
struct PrivateMount {
  ScopedFd mount;  // with O_PATH
  ScopedFd root;   // its root, open for reading: handles are not resolved through O_PATH
};

// Of the file system that `mount` shows: a copy of a mount of all of it, or, where there is none
// and the file system lies on a block device, a new one. Nothing can be written through it. False,
// and `error` then names the call and the reason. Needs CAP_SYS_ADMIN.
bool MakePrivateMount(const Mount& mount, PrivateMount& made, std::string& error);

}  // namespace fileindexd
