// SPDX-License-Identifier: GPL-2.0-or-later
// A Landlock ruleset: file rights that a process keeps, by what lies beneath some paths.
#pragma once

#include <fcntl.h>
#include <linux/landlock.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>
#include <cstdint>

#include "base/scoped_fd.h"

namespace fileindexd {

// Of newer kernels than the headers may be.
constexpr uint64_t LANDLOCK_TRUNCATE_RIGHT = uint64_t{1} << 14;

constexpr uint64_t LANDLOCK_WRITES = LANDLOCK_ACCESS_FS_WRITE_FILE | LANDLOCK_ACCESS_FS_REMOVE_DIR |
                                     LANDLOCK_ACCESS_FS_REMOVE_FILE | LANDLOCK_ACCESS_FS_MAKE_CHAR |
                                     LANDLOCK_ACCESS_FS_MAKE_DIR | LANDLOCK_ACCESS_FS_MAKE_REG |
                                     LANDLOCK_ACCESS_FS_MAKE_SOCK | LANDLOCK_ACCESS_FS_MAKE_FIFO |
                                     LANDLOCK_ACCESS_FS_MAKE_BLOCK | LANDLOCK_ACCESS_FS_MAKE_SYM;
constexpr uint64_t LANDLOCK_READS =
    LANDLOCK_ACCESS_FS_READ_FILE | LANDLOCK_ACCESS_FS_READ_DIR | LANDLOCK_ACCESS_FS_EXECUTE;
// What can be given for a path that is no folder.
constexpr uint64_t LANDLOCK_OF_FILES = LANDLOCK_ACCESS_FS_READ_FILE | LANDLOCK_ACCESS_FS_EXECUTE |
                                       LANDLOCK_ACCESS_FS_WRITE_FILE | LANDLOCK_TRUNCATE_RIGHT;

// Which version the kernel has; below 1, with errno, none.
inline long LandlockVersion() {
  return syscall(SYS_landlock_create_ruleset, nullptr, 0, LANDLOCK_CREATE_RULESET_VERSION);
}

// The rights that change files, as far as a kernel of that version knows them. Before version 2
// renaming from folder to folder is refused altogether, before 3 cutting a file short is not
// limited.
inline uint64_t LandlockWrites(long version) {
  return LANDLOCK_WRITES | (version >= 2 ? LANDLOCK_ACCESS_FS_REFER : 0) |
         (version >= 3 ? LANDLOCK_TRUNCATE_RIGHT : 0);
}

// Takes the handled rights away from the process but for what is allowed; each false with errno.
class LandlockRules {
 public:
  bool Open(uint64_t handled_rights) {
    handled = handled_rights;
    landlock_ruleset_attr attributes = {};
    attributes.handled_access_fs = handled;
    ScopedFd opened(
        static_cast<int>(syscall(SYS_landlock_create_ruleset, &attributes, sizeof(attributes), 0)));
    ruleset.Swap(opened);
    return ruleset.fd >= 0;
  }

  // Beneath the path, or of that file. What is not there needs no right. Rules go by what lies
  // there now, behind links.
  bool Allow(const char* path, uint64_t rights) const {
    const ScopedFd place(open(path, O_PATH | O_CLOEXEC));
    struct stat info = {};
    if (place.fd < 0 || fstat(place.fd, &info) != 0) {
      return errno == ENOENT || errno == ENOTDIR;
    }

    landlock_path_beneath_attr rule = {};
    rule.allowed_access = rights & handled & (S_ISDIR(info.st_mode) ? handled : LANDLOCK_OF_FILES);
    rule.parent_fd = place.fd;
    return syscall(SYS_landlock_add_rule, ruleset.fd, LANDLOCK_RULE_PATH_BENEATH, &rule, 0) == 0;
  }

  // For good. Asks for no new privileges first, or a capability.
  bool Restrict() const { return syscall(SYS_landlock_restrict_self, ruleset.fd, 0) == 0; }

 private:
  uint64_t handled = 0;
  ScopedFd ruleset;
};

}  // namespace fileindexd
