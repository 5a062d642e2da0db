// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/filesystem.h"

#include <fcntl.h>
#include <linux/btrfs.h>
#include <linux/btrfs_tree.h>
#include <linux/magic.h>
#include <sys/ioctl.h>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>

#include "base/scoped_fd.h"
#include "state/layout.h"
#include "state/open_path.h"

namespace fileindexd {

namespace {

constexpr uint32_t XFS_MAGIC = 0x58465342;

// The kernel's oldest description of an xfs, which every version answers. Its own header belongs to
// a package that nothing else here needs.
struct XfsGeometry {
  uint32_t sizes[8];
  uint64_t counts[4];
  unsigned char uuid[16];
  uint32_t rest[7];
};
constexpr unsigned long XFS_GEOMETRY = _IOR('X', 100, XfsGeometry);

std::string Hex(const unsigned char* bytes, size_t size) {
  constexpr char DIGITS[] = "0123456789abcdef";
  std::string text;
  for (size_t i = 0; i < size; ++i) {
    text += DIGITS[bytes[i] >> 4];
    text += DIGITS[bytes[i] & 0xf];
  }
  return text;
}

// The operations below ask the file system itself, which an O_PATH descriptor does not allow.
int OpenFolder(const std::string& path) {
  return open(path.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC | O_NONBLOCK);
}

// The ioctl was seen to answer 1, not 0, for subvolumes other than the top one, with all that is
// used here filled in: only a negative answer is a failure.
bool AskSubvolume(int folder, btrfs_ioctl_get_subvol_info_args& info) {
  return ioctl(folder, BTRFS_IOC_GET_SUBVOL_INFO, &info) >= 0;
}

std::string BtrfsIdentity(int folder) {
  btrfs_ioctl_fs_info_args info{};
  btrfs_ioctl_get_subvol_info_args subvolume{};
  if (ioctl(folder, BTRFS_IOC_FS_INFO, &info) != 0 || !AskSubvolume(folder, subvolume)) {
    return {};
  }
  return "btrfs:" + Hex(info.fsid, sizeof info.fsid) + ":" + std::to_string(subvolume.treeid);
}

std::string XfsIdentity(int folder) {
  XfsGeometry geometry{};
  if (ioctl(folder, XFS_GEOMETRY, &geometry) != 0) {
    return {};
  }
  return "xfs:" + Hex(geometry.uuid, sizeof geometry.uuid);
}

std::string KernelNumber(const struct statfs& fs) {
  char text[32];
  (void)snprintf(text, sizeof text, "%08x%08x", static_cast<unsigned>(fs.f_fsid.__val[0]),
                 static_cast<unsigned>(fs.f_fsid.__val[1]));
  return text;
}

// Climbs to the root of the mount. That asks no path, so a mount over it, or a root that this
// process cannot name, does not mislead.
std::string MountRootIdentity(int folder, uint64_t type) {
  ScopedFd at(fcntl(folder, F_DUPFD_CLOEXEC, 0));
  uint64_t below = 0;
  for (;;) {
    struct statx st {};
    if (at.fd < 0 || statx(at.fd, "", AT_EMPTY_PATH, STATX_INO, &st) != 0) {
      return {};
    }
    // The process's own root is as high as it gets; it is its own parent.
    if ((st.stx_attributes & STATX_ATTR_MOUNT_ROOT) != 0 || st.stx_ino == below) {
      char text[64];
      (void)snprintf(text, sizeof text, "type:%llx:%llu", static_cast<unsigned long long>(type),
                     static_cast<unsigned long long>(st.stx_ino));
      return text;
    }
    below = st.stx_ino;
    ScopedFd parent(openat(at.fd, "..", O_PATH | O_DIRECTORY | O_CLOEXEC));
    at.Swap(parent);
  }
}

std::string ParentOf(const std::string& path) {
  const size_t slash = path.rfind('/');
  return slash == 0 || slash == std::string::npos ? "/" : path.substr(0, slash);
}

// True when the subvolume that holds the folder is read-only and a copy of another.
bool IsSnapshotSubvolume(int folder) {
  btrfs_ioctl_get_subvol_info_args info{};
  if (!AskSubvolume(folder, info)) {
    return false;
  }
  const bool copied = std::any_of(std::begin(info.parent_uuid), std::end(info.parent_uuid),
                                  [](unsigned char byte) { return byte != 0; });
  return copied && (info.flags & BTRFS_ROOT_SUBVOL_RDONLY) != 0;
}

}  // namespace

std::string FilesystemIdentity(const std::string& path) {
  ScopedFd folder(OpenFolder(path));
  if (folder.fd < 0 && errno == ENOTDIR) {
    ScopedFd parent(OpenFolder(ParentOf(path)));
    folder.Swap(parent);
  }
  struct statfs fs {};
  if (folder.fd < 0 || fstatfs(folder.fd, &fs) != 0) {
    return {};
  }

  const auto type = static_cast<uint32_t>(fs.f_type);
  if (type == BTRFS_SUPER_MAGIC) {
    return BtrfsIdentity(folder.fd);
  }
  if (type == XFS_MAGIC) {
    return XfsIdentity(folder.fd);
  }
  if (type == EXT4_SUPER_MAGIC) {  // ext2 and ext3 as well; the number is made from the UUID
    return "ext:" + KernelNumber(fs);
  }
  const std::string identity = MountRootIdentity(folder.fd, type);
  // Each tmpfs has a number of its own; that of most others is their device's, which may change.
  return type == TMPFS_MAGIC && !identity.empty() ? identity + ':' + KernelNumber(fs) : identity;
}

bool IsFilesystem(const std::string& recorded, const std::string& identity) {
  return identity == recorded ||
         (recorded.starts_with("type:") && identity.starts_with(recorded + ':'));
}

bool IsRealFilesystem(const std::string& path) {
  constexpr uint32_t AUTOFS = 0x187;
  constexpr uint32_t MQUEUE = 0x19800202;
  constexpr uint32_t CONFIGFS = 0x62656570;
  constexpr uint32_t FUSE_CONTROL = 0x65735543;
  constexpr uint32_t RPC_PIPES = 0x67596969;
  constexpr uint32_t NFS_SERVER = 0x6e667364;
  constexpr uint32_t UNREAL[] = {PROC_SUPER_MAGIC,
                                 SYSFS_MAGIC,
                                 DEVPTS_SUPER_MAGIC,
                                 CGROUP_SUPER_MAGIC,
                                 CGROUP2_SUPER_MAGIC,
                                 DEBUGFS_MAGIC,
                                 TRACEFS_MAGIC,
                                 SECURITYFS_MAGIC,
                                 BPF_FS_MAGIC,
                                 PSTOREFS_MAGIC,
                                 HUGETLBFS_MAGIC,
                                 BINFMTFS_MAGIC,
                                 SELINUX_MAGIC,
                                 EFIVARFS_MAGIC,
                                 NSFS_MAGIC,
                                 SOCKFS_MAGIC,
                                 PIPEFS_MAGIC,
                                 AUTOFS,
                                 MQUEUE,
                                 CONFIGFS,
                                 FUSE_CONTROL,
                                 RPC_PIPES,
                                 NFS_SERVER};
  struct statfs fs {};
  if (statfs(path.c_str(), &fs) != 0) {
    return false;
  }
  return std::find(std::begin(UNREAL), std::end(UNREAL), static_cast<uint32_t>(fs.f_type)) ==
         std::end(UNREAL);
}

bool HasSpace(const std::string& path, bool lenient) {
  constexpr uint64_t MIB = 1024 * 1024;
  struct statvfs fs {};
  if (statvfs(path.c_str(), &fs) != 0) {
    return lenient;
  }
  if (lenient && ((fs.f_flag & ST_RDONLY) != 0 || fs.f_blocks == 0)) {
    return true;
  }
  const uint64_t total = static_cast<uint64_t>(fs.f_blocks) * fs.f_frsize;
  const uint64_t available = static_cast<uint64_t>(fs.f_bavail) * fs.f_frsize;
  return available >= std::clamp(total / 100, MIB, 64 * MIB);
}

int IsMountPoint(const std::string& path) {
  struct statx st {};
  if (statx(AT_FDCWD, path.c_str(), AT_SYMLINK_NOFOLLOW | AT_NO_AUTOMOUNT, STATX_INO, &st) != 0) {
    return -1;
  }
  if ((st.stx_attributes_mask & STATX_ATTR_MOUNT_ROOT) == 0) {
    errno = ENOSYS;  // a kernel before 5.8
    return -1;
  }
  return (st.stx_attributes & STATX_ATTR_MOUNT_ROOT) != 0 ? 1 : 0;
}

bool IsInSnapshot(const std::string& root, const std::string& path) {
  if (("/" + BelowRoot(root, path) + "/").find("/#snapshot/") != std::string::npos) {
    return true;
  }
  struct stat st {};
  if (stat(root.c_str(), &st) != 0) {
    return false;
  }
  const dev_t root_device = st.st_dev;

  // Every subvolume has a device of its own, and a folder tells of the subvolume that it lies in.
  dev_t asked = root_device;
  for (std::string at = path; at.size() > root.size(); at = ParentOf(at)) {
    const ScopedFd thing(OpenInShare(root, at));
    if (thing.fd < 0 || fstat(thing.fd, &st) != 0 || !S_ISDIR(st.st_mode)) {
      continue;  // gone, or no folder: it lies where its folder lies
    }
    if (st.st_dev == root_device) {
      return false;
    }
    if (st.st_dev == asked) {
      continue;
    }
    asked = st.st_dev;
    const ScopedFd folder(openat(thing.fd, ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC | O_NONBLOCK));
    if (folder.fd >= 0 && IsSnapshotSubvolume(folder.fd)) {
      return true;
    }
  }
  return false;
}

}  // namespace fileindexd
