// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/statx_look.h"

#include <sys/sysmacros.h>

#include <cerrno>

namespace fileindexd {

namespace {

// Whether a file's name may have been left open, because a directory of that name is taken in.
bool IsFileOpen(const Settings& settings, const std::string& normal) {
  const IndexedFolder* folder = settings.FolderOfPath(normal);
  return folder != nullptr && folder->excludes.takes_in_directories;
}

}  // namespace

int64_t Nanoseconds(const statx_timestamp& time) {
  constexpr int64_t SECOND = 1'000'000'000;
  int64_t nanoseconds = 0;
  if (__builtin_mul_overflow(time.tv_sec, SECOND, &nanoseconds) ||
      __builtin_add_overflow(nanoseconds, static_cast<int64_t>(time.tv_nsec), &nanoseconds)) {
    return time.tv_sec < 0 ? INT64_MIN : INT64_MAX;
  }
  return nanoseconds;
}

bool HasMountId(const struct statx& st) {
  if ((st.stx_mask & (STATX_MNT_ID | UNIQUE_MOUNT_ID)) != 0) {
    return true;
  }
  errno = ENOSYS;  // a kernel before 5.8
  return false;
}

Thing ThingOfMode(unsigned mode) {
  if (S_ISREG(mode)) {
    return Thing::FILE;
  }
  if (S_ISDIR(mode)) {
    return Thing::DIRECTORY;
  }
  return S_ISLNK(mode) ? Thing::LINK : Thing::NONE;
}

void Fill(const struct statx& st, Look& look) {
  look.thing = ThingOfMode(st.stx_mode);
  look.inode = st.stx_ino;
  look.links = st.stx_nlink;
  look.size = static_cast<int64_t>(st.stx_size);
  look.mtime = Nanoseconds(st.stx_mtime);
  look.ctime = Nanoseconds(st.stx_ctime);
  look.birth_time = (st.stx_mask & STATX_BTIME) != 0 ? Nanoseconds(st.stx_btime) : 0;
  look.owner = st.stx_uid;
  look.group = st.stx_gid;
  look.mode = st.stx_mode & 07777U;
  look.mount_id = st.stx_mnt_id;
  look.device = makedev(st.stx_dev_major, st.stx_dev_minor);
  look.mount_root = (st.stx_attributes & STATX_ATTR_MOUNT_ROOT) != 0;
}

Verdict VerdictOfError(int reason) {
  switch (reason) {
    case ENOENT:
    case ENOTDIR:
    case ENAMETOOLONG:
      return Verdict::GONE;
    case ELOOP:
      return Verdict::BEHIND_LINK;
    default:
      return Verdict::UNKNOWN;
  }
}

void JudgeByPatterns(const Settings& settings, const std::string& normal, Look& look) {
  const bool is_directory = look.thing == Thing::DIRECTORY;
  if (look.verdict != Verdict::BELONGS || (!is_directory && !IsFileOpen(settings, normal))) {
    return;
  }
  const Leaf leaf = is_directory ? Leaf::DIRECTORY : Leaf::OTHER;
  if (FindExclusion(settings, normal, leaf).pattern != nullptr) {
    look.verdict = Verdict::EXCLUDED;
  }
}

}  // namespace fileindexd
