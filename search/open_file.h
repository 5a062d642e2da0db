// SPDX-License-Identifier: GPL-2.0-or-later
// Opening a file that is to be read: the very one that the index knows, and nothing else.
#pragma once

#include <string>

#include "base/scoped_fd.h"
#include "index/contents_writer.h"
#include "state/settings.h"

namespace fileindexd {

enum class Opening {
  DONE,
  CHANGED,  // gone, behind a link, no regular file, or another one than the index knows
  REFUSED,  // the file's own fault: `reason`
  UNREAD,   // the disk's fault, which does not give it: `reason`
  LATER,    // the host's fault: `reason`
};

// Opens the file for reading. Nothing that is no regular file is ever opened, so that no pipe and
// no device notices; nothing behind a link below the share's root is; and where the host allows,
// the reading leaves no trace in the file's times. `file` and `reason` are set as said.
Opening OpenFile(const Share& share, const std::string& path, const FileIdentity& identity,
                 ScopedFd& file, std::string& reason);

// Of an `errno` at the opening. `reason` as for OpenFile.
Opening OpeningOfError(int error, std::string& reason);

// Whether the open file still is what the index knows.
bool IsStill(int file, const FileIdentity& identity);

}  // namespace fileindexd
