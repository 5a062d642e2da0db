// SPDX-License-Identifier: GPL-2.0-or-later
// What became of a share's root.
#include <dirent.h>
#include <sys/stat.h>

#include <cerrno>
#include <string_view>

#include "base/scoped_stream.h"
#include "state/belonging.h"
#include "state/filesystem.h"

namespace fileindexd {

RootState LookAtRoot(const Share& share) {
  struct stat st {};
  if (stat(share.path.c_str(), &st) != 0) {
    const bool gone =
        errno == ENOENT || errno == ENOTDIR || errno == ENAMETOOLONG || errno == ELOOP;
    return gone ? RootState::MISSING : RootState::UNKNOWN;
  }
  if (!S_ISDIR(st.st_mode)) {
    return RootState::MISSING;
  }
  if (share.filesystem.empty()) {
    return RootState::SOUND;  // nothing on record to differ from
  }

  const std::string identity = FilesystemIdentity(share.path);
  if (identity.empty()) {
    return errno == ENOENT ? RootState::MISSING : RootState::UNKNOWN;
  }
  return IsFilesystem(share.filesystem, identity) ? RootState::SOUND : RootState::FOREIGN;
}

bool IsRootEmpty(const Share& share) {
  ScopedDir root;
  root.dir = opendir(share.path.c_str());
  if (root.dir == nullptr) {
    return false;
  }
  errno = 0;
  const dirent* entry = nullptr;
  while ((entry = readdir(root.dir)) != nullptr) {  // NOLINT: of a stream of our own
    const std::string_view name = entry->d_name;
    if (name != "." && name != ".." && !IsPreservedName(name) && !IsPassingName(name)) {
      return false;
    }
  }
  return errno == 0;
}

}  // namespace fileindexd
