// SPDX-License-Identifier: GPL-2.0-or-later
// Looks at what lies in an open directory, for walks.
#include <fcntl.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>

#include <cerrno>
#include <climits>

#include "base/scoped_fd.h"
#include "state/belonging.h"
#include "state/open_path.h"
#include "state/statx_look.h"

namespace fileindexd {

namespace {

// JudgeName for a name in a directory that belongs: all that the letters of the way to it say has
// been judged with the directory.
Verdict JudgeNameIn(const Settings& settings, const std::string& path, std::string_view name) {
  if (IsPreservedName(name) || IsPassingName(name)) {
    return Verdict::SKIPPED_NAME;
  }
  // The directory does not lie in our state folder, so nothing but that folder itself can.
  if (path == settings.state_root) {
    return Verdict::OWN_STATE;
  }
  return FindExclusion(settings, path, Leaf::UNKNOWN).pattern != nullptr ? Verdict::EXCLUDED
                                                                         : Verdict::BELONGS;
}

}  // namespace

Verdict OpenJudged(const Settings& settings, const std::string& path, uint64_t mount_id,
                   JudgedDirectory& directory) {
  const Share* share = settings.ShareOfPath(path);
  if (share == nullptr) {
    return Verdict::NO_SHARE;
  }
  const ScopedFd found(OpenInShare(share->path, path));
  if (found.fd < 0) {
    return VerdictOfError(errno);
  }
  ScopedFd opened(openat(found.fd, ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC | O_NONBLOCK));
  struct statx st {};
  if (opened.fd < 0 || statx(opened.fd, "", AT_EMPTY_PATH, WANTED, &st) != 0) {
    return VerdictOfError(errno);
  }
  if (!HasMountId(st)) {
    return Verdict::UNKNOWN;
  }
  if (st.stx_mnt_id != mount_id) {
    return Verdict::BELOW_MOUNT;
  }
  directory.path = path;
  directory.mount_id = mount_id;
  directory.device = makedev(st.stx_dev_major, st.stx_dev_minor);
  directory.fd.Swap(opened);
  return Verdict::BELONGS;
}

Look LookAtIn(const Settings& settings, const JudgedDirectory& directory, const std::string& path,
              std::string_view name) {
  Look look;
  look.verdict = JudgeNameIn(settings, path, name);
  if (look.verdict != Verdict::BELONGS) {
    return look;
  }
  // A path that no other program could open by its letters is judged by them.
  if (path.size() >= PATH_MAX) {
    return LookAt(settings, path);
  }

  struct statx st {};
  if (statx(directory.fd.fd, name.data(), AT_SYMLINK_NOFOLLOW, WANTED, &st) != 0) {
    look.verdict = VerdictOfError(errno);
    return look;
  }
  if (!HasMountId(st)) {
    look.verdict = Verdict::UNKNOWN;
    return look;
  }
  Fill(st, look);
  // A mount point, or a subvolume that may be a snapshot: rare, and judged from the root.
  if (look.mount_id != directory.mount_id || look.device != directory.device) {
    return LookAt(settings, path);
  }
  look.verdict = look.thing == Thing::NONE ? Verdict::SPECIAL_FILE : Verdict::BELONGS;
  JudgeByPatterns(settings, path, look);
  return look;
}

}  // namespace fileindexd
