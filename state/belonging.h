// SPDX-License-Identifier: GPL-2.0-or-later
// The one rule: what belongs in a share's index.
//
// A path belongs when an indexed folder covers it, no component below the share's root has a
// preserved or passing name, and it lies neither below a nested mount point, nor behind a symbolic
// link, nor in a snapshot, nor in our own state folder, and no pattern of the deepest folder that
// covers it keeps it out; and when it is a directory, a regular file
// or a symbolic link. The path of a nested mount point itself belongs, as one entry.
//
// Everything here may be called from any thread at any time.
#pragma once

#include <sys/stat.h>

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>

#include "base/scoped_fd.h"
#include "state/settings.h"

namespace fileindexd {

enum class Verdict {
  BELONGS,
  BAD_PATH,      // relative, or with a "." or ".." component, or a NUL
  NO_SHARE,      // in no share
  NOT_COVERED,   // by no indexed folder
  SKIPPED_NAME,  // a component below the share's root has a preserved or passing name
  OWN_STATE,     // in our own state folder
  EXCLUDED,      // by a pattern of the indexed folder, see excludes.h
  GONE,          // does not exist
  BEHIND_LINK,   // a directory on the way is a symbolic link
  BELOW_MOUNT,   // below a nested mount point
  IN_SNAPSHOT,
  SPECIAL_FILE,  // socket, pipe or device
  UNKNOWN,       // the file system did not answer: errno tells
};

enum class Thing { NONE, FILE, DIRECTORY, LINK };

// What was seen at a path. Only `verdict` means anything unless the thing exists.
struct Look {
  Verdict verdict = Verdict::UNKNOWN;
  Thing thing = Thing::NONE;
  uint64_t inode = 0;
  uint64_t links = 0;
  int64_t size = 0;        // bytes
  int64_t mtime = 0;       // nanoseconds since the epoch
  int64_t ctime = 0;       // nanoseconds since the epoch
  int64_t birth_time = 0;  // nanoseconds since the epoch; 0: the file system keeps none
  uint32_t owner = 0;
  uint32_t group = 0;
  uint32_t mode = 0;      // permission bits
  uint64_t mount_id = 0;  // of the mount that shows the thing; to be compared with other looks only
  uint64_t device = 0;
  bool mount_root = false;  // the thing is the root of that mount
};

// A look with the settings that it was judged by.
struct Seen {
  std::shared_ptr<const Settings> settings;
  Look look;
};

// A folder of which nothing but the names in it is left to judge: see LookNear.
struct FolderView {
  std::string root;  // of the share
  std::string path;
  uint64_t mount_id = 0;
  uint64_t device = 0;
  int64_t seen_time = 0;  // nanoseconds, monotonic, after the look; 0: never
};

// Looks at a path and judges it. Three system calls for an ordinary file.
Look LookAt(const Settings& settings, const std::string& path);

// The same in one system call, for one path after the other in the same folder. What was seen of
// the folder is kept in `folder` for some milliseconds: if it is replaced meanwhile, by a link or
// by another folder, the answer may be wrong by that. For whoever hears of each change after it was
// made, and looks again then.
Look LookNear(const Settings& settings, const std::string& path, FolderView& folder);

// A directory that belongs, opened so that what lies directly in it is looked at by its name.
struct JudgedDirectory {
  std::string path;  // normal
  uint64_t mount_id = 0;
  uint64_t device = 0;
  ScopedFd fd;
};

// Opens a directory that was found to belong, in the mount `mount_id`. BELONGS, or why it is not to
// be entered any more: GONE, BEHIND_LINK, BELOW_MOUNT when something was mounted over it, UNKNOWN
// with errno.
Verdict OpenJudged(const Settings& settings, const std::string& path, uint64_t mount_id,
                   JudgedDirectory& directory);

// What LookAt tells of `path`, which is `name` in that directory: one system call for what lies in
// the directory's own mount and subvolume. `name` ends with a NUL in memory.
Look LookAtIn(const Settings& settings, const JudgedDirectory& directory, const std::string& path,
              std::string_view name);

// The same judged by the path alone: BELONGS when nothing in its letters speaks against it. A
// pattern for directories alone speaks only against what lies below one, or for one.
Verdict JudgeName(const Settings& settings, const std::string& path);

// As LookAt, but excludes do not count: for the way to an indexed folder that lies below what
// another folder's pattern keeps out.
Look LookPastExcludes(const Settings& settings, const std::string& path);

// The pattern that keeps normal path `path` out, and whose it is. Both live as long as `settings`.
struct Exclusion {
  const IndexedFolder* folder = nullptr;  // null: no pattern does
  const std::string* pattern = nullptr;
  std::string path;  // what the pattern matches: `path`, or a directory above it
};
Exclusion FindExclusion(const Settings& settings, const std::string& path, Leaf leaf);

// What exists at `path`: the last component not followed, and nothing below a share's root behind a
// symbolic link. NONE for special files, and when it cannot be told.
Thing ThingAt(const Settings& settings, const std::string& path);

// "#snapshot", ".snapshots", "lost+found".
bool IsPreservedName(std::string_view name);
// ".nfs*", ".fuse_hidden*", "~$*", ".~lock.*#".
bool IsPassingName(std::string_view name);

// Whether a share's root is what is on record.
enum class RootState { SOUND, MISSING, FOREIGN, UNKNOWN };
RootState LookAtRoot(const Share& share);
// True when nothing is in the share's root, or only names that are passed over. False when that
// cannot be told.
bool IsRootEmpty(const Share& share);

// The verdict in a few words, for people.
const char* VerdictText(Verdict verdict);

}  // namespace fileindexd
