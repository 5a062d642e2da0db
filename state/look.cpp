// SPDX-License-Identifier: GPL-2.0-or-later
// What the disk says about a path.
//
// DESIGN. An ordinary file costs three calls: open, statx, close. The share's root is needed beside
// it, for the mount and the device that everything in the share has to be on. Where mounts have
// numbers that are never given twice, the root's are kept for a second in each thread: a thing with
// the same mount number lies in the share's mount, and any difference is looked into with care,
// the root asked before and after. Where mount numbers are reused, the root is asked every time.
#include <fcntl.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>

#include <cerrno>
#include <ctime>

#include "base/scoped_fd.h"
#include "state/belonging.h"
#include "state/filesystem.h"
#include "state/layout.h"
#include "state/open_path.h"
#include "state/statx_look.h"

namespace fileindexd {

namespace {

constexpr int64_t ROOT_KEPT_NS = 1'000'000'000;
constexpr int64_t FOLDER_KEPT_NS = 5'000'000;
constexpr int CAREFUL_TRIES = 3;

struct RootView {
  std::string path;
  uint64_t mount_id = 0;
  uint64_t device = 0;
  bool unique = false;    // mount_id is never given to another mount
  int64_t seen_time = 0;  // nanoseconds, monotonic
};

bool IsSameMount(const RootView& a, const RootView& b) {
  return a.mount_id == b.mount_id && a.device == b.device;
}

int64_t Now() {
  timespec now{};
  (void)clock_gettime(CLOCK_MONOTONIC_COARSE, &now);  // cannot fail for this clock
  return static_cast<int64_t>(now.tv_sec) * 1'000'000'000 + now.tv_nsec;
}

bool SeeRoot(const std::string& root, RootView& view) {
  struct statx st {};
  if (statx(AT_FDCWD, root.c_str(), 0, WANTED, &st) != 0 || !HasMountId(st)) {
    return false;
  }
  view.path = root;
  view.mount_id = st.stx_mnt_id;
  view.device = makedev(st.stx_dev_major, st.stx_dev_minor);
  view.unique = (st.stx_mask & UNIQUE_MOUNT_ID) != 0;
  view.seen_time = Now();
  return true;
}

// The root as it was at most a second ago if that is good enough. Null with errno on failure.
const RootView* RecentRoot(const std::string& root) {
  thread_local RootView kept;
  if (kept.path == root && kept.unique && Now() - kept.seen_time < ROOT_KEPT_NS) {
    return &kept;
  }
  return SeeRoot(root, kept) ? &kept : nullptr;
}

// BELONGS when there is something to judge further.
Verdict See(const std::string& root, const std::string& path, struct statx& st) {
  const ScopedFd thing(OpenInShare(root, path));
  if (thing.fd < 0) {
    return VerdictOfError(errno);
  }
  if (statx(thing.fd, "", AT_EMPTY_PATH, WANTED, &st) != 0 || !HasMountId(st)) {
    return Verdict::UNKNOWN;
  }
  return Verdict::BELONGS;
}

std::string ParentOf(const std::string& path) {
  const size_t slash = path.rfind('/');
  return slash == 0 ? "/" : path.substr(0, slash);
}

// What is left to judge of a thing in the share's own mount, or of a mount point there; `device` is
// that of the thing, or of the folder that holds the mount point.
Verdict JudgeInMount(const RootView& root, const std::string& path, uint64_t device, Thing thing) {
  if (device != root.device && IsInSnapshot(root.path, path)) {
    return Verdict::IN_SNAPSHOT;
  }
  return thing == Thing::NONE ? Verdict::SPECIAL_FILE : Verdict::BELONGS;
}

// One attempt; `st` is the thing as seen, `root` as it was before that.
Verdict JudgeAcrossMounts(const RootView& root, const std::string& path, const struct statx& st,
                          Look& look) {
  if (look.mount_id == root.mount_id) {
    return JudgeInMount(root, path, look.device, look.thing);
  }
  if ((st.stx_attributes & STATX_ATTR_MOUNT_ROOT) == 0 || path == root.path) {
    return Verdict::BELOW_MOUNT;
  }
  struct statx parent {};
  const std::string folder = ParentOf(path);
  const Verdict seen = See(root.path, folder, parent);
  if (seen != Verdict::BELONGS) {
    return seen;
  }
  if (parent.stx_mnt_id != root.mount_id) {
    return Verdict::BELOW_MOUNT;
  }
  return JudgeInMount(root, folder, makedev(parent.stx_dev_major, parent.stx_dev_minor),
                      look.thing);
}

// A share that is mounted or unmounted between two calls would look as if everything in it lay
// below a nested mount. So the verdict counts only if the root was the same before and after.
Look LookWithCare(const std::string& root_path, const std::string& path) {
  for (int i = 0; i < CAREFUL_TRIES; ++i) {
    Look look;
    RootView before;
    RootView after;
    struct statx st {};
    if (!SeeRoot(root_path, before)) {
      look.verdict = Verdict::UNKNOWN;
      return look;
    }
    look.verdict = See(root_path, path, st);
    if (look.verdict != Verdict::BELONGS) {
      return look;
    }
    Fill(st, look);
    look.verdict = JudgeAcrossMounts(before, path, st, look);
    const int reason = errno;
    if (SeeRoot(root_path, after) && IsSameMount(before, after)) {
      errno = reason;
      return look;
    }
  }
  errno = EAGAIN;
  return Look{};
}

// What the disk says of a path that lies in a share.
Look LookOnDisk(const Settings& settings, const std::string& normal) {
  Look look;
  const std::string& root_path = settings.ShareOfPath(normal)->path;
  struct statx st {};
  look.verdict = See(root_path, normal, st);
  if (look.verdict != Verdict::BELONGS) {
    return look;
  }

  Fill(st, look);
  const RootView* root = RecentRoot(root_path);
  if (root == nullptr || root->mount_id != look.mount_id) {
    return LookWithCare(root_path, normal);
  }
  look.verdict = JudgeInMount(*root, normal, look.device, look.thing);
  return look;
}

// True when `path` is a folder in the share's own mount and device, with no link on the way.
bool SeeFolder(const std::string& root_path, const std::string& path, FolderView& folder) {
  if (folder.path == path && folder.root == root_path &&
      Now() - folder.seen_time < FOLDER_KEPT_NS) {
    return true;
  }

  folder.seen_time = 0;
  struct statx st {};
  const RootView* root = RecentRoot(root_path);
  if (root == nullptr || !root->unique || See(root_path, path, st) != Verdict::BELONGS ||
      !S_ISDIR(st.stx_mode) || st.stx_mnt_id != root->mount_id ||
      makedev(st.stx_dev_major, st.stx_dev_minor) != root->device) {
    return false;
  }
  folder = {root_path, path, root->mount_id, root->device, Now()};
  return true;
}

// One call if the folder that holds it is known.
Look LookInFolder(const Settings& settings, const std::string& normal, FolderView& folder) {
  const std::string& root_path = settings.ShareOfPath(normal)->path;
  struct statx st {};
  if (normal == root_path || !SeeFolder(root_path, ParentOf(normal), folder) ||
      statx(AT_FDCWD, normal.c_str(), AT_SYMLINK_NOFOLLOW | AT_NO_AUTOMOUNT, WANTED, &st) != 0) {
    return LookOnDisk(settings, normal);
  }

  Look look;
  Fill(st, look);
  if (look.mount_id != folder.mount_id || look.device != folder.device) {
    return LookOnDisk(settings, normal);  // a mount point, or a subvolume
  }
  look.verdict = look.thing == Thing::NONE ? Verdict::SPECIAL_FILE : Verdict::BELONGS;
  return look;
}

}  // namespace

Look LookAt(const Settings& settings, const std::string& path) {
  Look look;
  look.verdict = JudgeName(settings, path);
  if (look.verdict != Verdict::BELONGS) {
    return look;
  }

  const std::string normal = NormalPath(path).value_or(path);
  look = LookOnDisk(settings, normal);
  JudgeByPatterns(settings, normal, look);
  return look;
}

Look LookNear(const Settings& settings, const std::string& path, FolderView& folder) {
  Look look;
  look.verdict = JudgeName(settings, path);
  if (look.verdict != Verdict::BELONGS) {
    return look;
  }

  const std::string normal = NormalPath(path).value_or(path);
  look = LookInFolder(settings, normal, folder);
  JudgeByPatterns(settings, normal, look);
  return look;
}

Look LookPastExcludes(const Settings& settings, const std::string& path) {
  Look look;
  look.verdict = JudgeName(settings, path);
  if (look.verdict == Verdict::BELONGS || look.verdict == Verdict::EXCLUDED) {
    look = LookOnDisk(settings, NormalPath(path).value_or(path));
  }
  return look;
}

Thing ThingAt(const Settings& settings, const std::string& path) {
  const auto normal = NormalPath(path);
  if (!normal.has_value()) {
    return Thing::NONE;
  }
  struct stat st {};
  const Share* share = settings.ShareOfPath(*normal);
  if (share == nullptr) {
    return lstat(normal->c_str(), &st) == 0 ? ThingOfMode(st.st_mode) : Thing::NONE;
  }
  const ScopedFd thing(OpenInShare(share->path, *normal));
  if (thing.fd < 0 || fstat(thing.fd, &st) != 0) {
    return Thing::NONE;
  }
  return ThingOfMode(st.st_mode);
}

}  // namespace fileindexd
