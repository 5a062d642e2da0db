// SPDX-License-Identifier: GPL-2.0-or-later
#include "notify/private_mount.h"

#include <fcntl.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>

#include <cerrno>
#include <cstring>

#include "state/filesystem.h"

namespace fileindexd {

namespace {

constexpr unsigned ATTRIBUTES_OF_MOUNT =
    MOUNT_ATTR_RDONLY | MOUNT_ATTR_NOSUID | MOUNT_ATTR_NODEV | MOUNT_ATTR_NOEXEC;

std::string Reason(const std::string& call) {
  return call + ": " + strerror(errno);  // NOLINT: glibc's is safe
}

std::string DeviceOf(int fd) {
  struct stat st {};
  if (fstat(fd, &st) != 0) {
    return {};
  }
  return std::to_string(major(st.st_dev)) + ":" + std::to_string(minor(st.st_dev));
}

// "btrfs:UUID" of "btrfs:UUID:SUBVOLUME".
std::string WithoutSubvolume(const std::string& identity) {
  return identity.substr(0, identity.rfind(':'));
}

// btrfs gives each subvolume a device number of its own, none of them that of the mount table.
bool ShowsFilesystemOf(int made, const Mount& mount) {
  if (mount.type != "btrfs") {
    return DeviceOf(made) == mount.device;
  }
  const std::string identity = FilesystemIdentity("/proc/self/fd/" + std::to_string(made));
  return !identity.empty() &&
         WithoutSubvolume(identity) == WithoutSubvolume(FilesystemIdentity(mount.point));
}

bool Clone(const Mount& whole, ScopedFd& made, std::string& error) {
  const ScopedFd point(open(whole.point.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
  if (point.fd < 0) {
    error = Reason("open " + whole.point);
    return false;
  }
  struct statx st {};
  if (statx(point.fd, "", AT_EMPTY_PATH, STATX_MNT_ID, &st) != 0 ||
      (st.stx_mask & STATX_MNT_ID) == 0) {
    error = Reason("statx " + whole.point);
    return false;
  }
  if (st.stx_mnt_id != whole.id) {
    error = "open " + whole.point + ": another mount lies over it";
    return false;
  }

  ScopedFd copy(open_tree(point.fd, "", OPEN_TREE_CLONE | OPEN_TREE_CLOEXEC | AT_EMPTY_PATH));
  if (copy.fd < 0) {
    error = Reason("open_tree " + whole.point);
    return false;
  }
  // Private, or what is mounted below the original later on is mounted below the copy as well, and
  // stays in use with it.
  mount_attr attributes{};
  attributes.attr_set = ATTRIBUTES_OF_MOUNT;
  attributes.propagation = MS_PRIVATE;
  if (mount_setattr(copy.fd, "", AT_EMPTY_PATH, &attributes, sizeof attributes) != 0) {
    error = Reason("mount_setattr " + whole.point);
    return false;
  }
  made.Swap(copy);
  return true;
}

bool Create(const Mount& mount, bool read_only, ScopedFd& made, std::string& error) {
  const ScopedFd context(fsopen(mount.type.c_str(), FSOPEN_CLOEXEC));
  if (context.fd < 0) {
    error = Reason("fsopen " + mount.type);
    return false;
  }
  if (fsconfig(context.fd, FSCONFIG_SET_STRING, "source", mount.source.c_str(), 0) != 0 ||
      (mount.type == "btrfs" &&
       fsconfig(context.fd, FSCONFIG_SET_STRING, "subvolid", "5", 0) != 0) ||
      (read_only && fsconfig(context.fd, FSCONFIG_SET_FLAG, "ro", nullptr, 0) != 0) ||
      fsconfig(context.fd, FSCONFIG_CMD_CREATE, nullptr, nullptr, 0) != 0) {
    const int reason = errno;
    error = Reason("fsconfig " + mount.source);
    errno = reason;
    return false;
  }
  ScopedFd created(fsmount(context.fd, FSMOUNT_CLOEXEC, ATTRIBUTES_OF_MOUNT));
  if (created.fd < 0) {
    error = Reason("fsmount " + mount.source);
    return false;
  }
  made.Swap(created);
  return true;
}

// "ro" is said of the file system, not of the mount, and must be as it is already: else the kernel
// answers EBUSY. Read-only is tried first, since older kernels answer a btrfs that is asked for
// writable while it is read-only by making it writable.
bool CreateAsItIs(const Mount& mount, ScopedFd& made, std::string& error) {
  struct stat st {};
  if (stat(mount.source.c_str(), &st) != 0 || !S_ISBLK(st.st_mode)) {
    error = "open_tree: no mount shows the whole file system at " + mount.point;
    return false;
  }
  return Create(mount, true, made, error) || (errno == EBUSY && Create(mount, false, made, error));
}

bool MakeUnchecked(const Mount& mount, ScopedFd& made, std::string& error) {
  MountTable table;
  if (!table.Read()) {
    error = Reason("read mount table");
    return false;
  }
  if (mount.root == "/" && Clone(mount, made, error)) {
    return true;
  }
  for (const Mount& other : table.mounts) {
    if (other.root == "/" && other.device == mount.device && other.id != mount.id &&
        Clone(other, made, error)) {
      return true;
    }
  }
  return CreateAsItIs(mount, made, error);
}

}  // namespace

bool MakePrivateMount(const Mount& mount, PrivateMount& made, std::string& error) {
  ScopedFd unchecked;
  std::string last;  // also of attempts before the one that worked
  if (!MakeUnchecked(mount, unchecked, last)) {
    error = last;
    return false;
  }
  ScopedFd root(openat(unchecked.fd, ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (root.fd < 0) {
    error = Reason("open the root of " + mount.source);
    return false;
  }
  if (!ShowsFilesystemOf(root.fd, mount)) {
    error = "fstat: the mount of the whole shows another file system than " + mount.point;
    return false;
  }
  made.mount.Swap(unchecked);
  made.root.Swap(root);
  return true;
}

}  // namespace fileindexd
