// SPDX-License-Identifier: GPL-2.0-or-later
// What file system a share lies on, its free space, mount points and snapshots inside it.
#pragma once

#include <sys/statfs.h>

#include <cstdint>
#include <string>

namespace fileindexd {

// Identity of the file system that holds `path`, stable over remounts and restarts: UUID (and
// subvolume), else type and inode of the mount's root, with the number that each tmpfs has. Empty,
// with errno, when it cannot be told.
std::string FilesystemIdentity(const std::string& path);

// Whether `identity` is the one on record; older records of a tmpfs lack its number.
bool IsFilesystem(const std::string& recorded, const std::string& identity);

// False for proc, sysfs and the like, and when it cannot be told.
bool IsRealFilesystem(const std::string& path);

// False when less than 1 % is free, counted as at least 1 MiB and at most 64 MiB. A file system
// that is mounted read-only, reports no size or cannot be asked counts as enough if
// `lenient`: a share's own; without it a failure to ask counts as full.
bool HasSpace(const std::string& path, bool lenient);

// By the mount table: a bind mount and a mounted subvolume count. 1, 0, or negative on failure.
int IsMountPoint(const std::string& path);

// True when `path`, below the share root `root`, lies in (or is) a read-only subvolume that is a
// copy of another, or below a folder "#snapshot".
bool IsInSnapshot(const std::string& root, const std::string& path);

}  // namespace fileindexd
