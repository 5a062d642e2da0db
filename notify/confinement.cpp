// SPDX-License-Identifier: GPL-2.0-or-later
#include "notify/confinement.h"

#include <fcntl.h>
#include <linux/capability.h>
#include <linux/landlock.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdint>
#include <system_error>

#include "base/scoped_fd.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

// Of newer kernels than the headers may be.
constexpr uint64_t TRUNCATE_RIGHT = uint64_t{1} << 14;

constexpr uint64_t WRITES = LANDLOCK_ACCESS_FS_WRITE_FILE | LANDLOCK_ACCESS_FS_REMOVE_DIR |
                            LANDLOCK_ACCESS_FS_REMOVE_FILE | LANDLOCK_ACCESS_FS_MAKE_CHAR |
                            LANDLOCK_ACCESS_FS_MAKE_DIR | LANDLOCK_ACCESS_FS_MAKE_REG |
                            LANDLOCK_ACCESS_FS_MAKE_SOCK | LANDLOCK_ACCESS_FS_MAKE_FIFO |
                            LANDLOCK_ACCESS_FS_MAKE_BLOCK | LANDLOCK_ACCESS_FS_MAKE_SYM;

bool Failed(const std::string& what, std::string& error) {
  error = what + ": " + std::generic_category().message(errno);
  return false;
}

uint64_t Bit(int capability) {
  return uint64_t{1} << capability;
}

// The queues are written as their folder's owner where that is the superuser.
uint64_t WantedCapabilities() {
  uint64_t wanted = Bit(CAP_SYS_ADMIN) | Bit(CAP_DAC_READ_SEARCH);
  struct stat root = {};
  if (stat(StateRoot().c_str(), &root) == 0 && root.st_uid != geteuid()) {
    wanted |= Bit(CAP_DAC_OVERRIDE);
  }
  return wanted;
}

void Keep(uint32_t wanted, __user_cap_data_struct& half) {
  half.permitted &= wanted;
  half.effective = half.permitted;
  half.inheritable = 0;
}

bool DropCapabilities(std::string& error) {
  const uint64_t wanted = WantedCapabilities();
  // The bounding set first: changing it takes a capability that goes with the others.
  int is_bound = 0;
  for (int capability = 0; is_bound >= 0; ++capability) {
    is_bound = prctl(PR_CAPBSET_READ, capability, 0, 0, 0);  // negative beyond the last
    if (is_bound == 1 && (wanted & Bit(capability)) == 0 &&
        prctl(PR_CAPBSET_DROP, capability, 0, 0, 0) != 0) {
      return Failed("bounding set of capabilities", error);
    }
  }
  // Kernels without ambient capabilities have none to clear.
  if (prctl(PR_CAP_AMBIENT, PR_CAP_AMBIENT_CLEAR_ALL, 0, 0, 0) != 0 && errno != EINVAL) {
    return Failed("ambient capabilities", error);
  }

  // By system call: the library for this is not everywhere, and both halves are all there is to it.
  __user_cap_header_struct header = {_LINUX_CAPABILITY_VERSION_3, 0};
  std::array<__user_cap_data_struct, _LINUX_CAPABILITY_U32S_3> sets = {};
  if (syscall(SYS_capget, &header, sets.data()) != 0) {
    return Failed("capabilities", error);
  }
  // What a container has kept back cannot be had; whoever needs it says so.
  Keep(static_cast<uint32_t>(wanted), sets[0]);
  Keep(static_cast<uint32_t>(wanted >> 32), sets[1]);
  if (syscall(SYS_capset, &header, sets.data()) != 0) {
    return Failed("capabilities", error);
  }
  return true;
}

// What is not there needs no right.
bool Allow(int ruleset, const std::string& path, uint64_t rights, std::string& error) {
  const ScopedFd place(open(path.c_str(), O_PATH | O_CLOEXEC));
  if (place.fd < 0) {
    return errno == ENOENT || Failed(path, error);
  }

  landlock_path_beneath_attr rule = {};
  rule.allowed_access = rights;
  rule.parent_fd = place.fd;
  if (syscall(SYS_landlock_add_rule, ruleset, LANDLOCK_RULE_PATH_BENEATH, &rule, 0) != 0) {
    return Failed(path, error);
  }
  return true;
}

bool LimitWriting(std::string& missing, std::string& error) {
  const long version =
      syscall(SYS_landlock_create_ruleset, nullptr, 0, LANDLOCK_CREATE_RULESET_VERSION);
  if (version < 1) {
    missing = "Landlock: " + std::generic_category().message(errno);
    return true;
  }

  // Before version 2 renaming from folder to folder is refused altogether, before 3 cutting a file
  // short is not limited.
  const uint64_t cutting = version >= 3 ? TRUNCATE_RIGHT : 0;
  landlock_ruleset_attr handled = {};
  handled.handled_access_fs = WRITES | cutting | (version >= 2 ? LANDLOCK_ACCESS_FS_REFER : 0);
  const ScopedFd ruleset(
      static_cast<int>(syscall(SYS_landlock_create_ruleset, &handled, sizeof(handled), 0)));
  if (ruleset.fd < 0) {
    return Failed("Landlock", error);
  }

  const uint64_t device = LANDLOCK_ACCESS_FS_WRITE_FILE | cutting;
  if (!Allow(ruleset.fd, StateRoot(), handled.handled_access_fs, error) ||
      !Allow(ruleset.fd, "/run", handled.handled_access_fs, error) ||
      !Allow(ruleset.fd, "/var/run", handled.handled_access_fs, error) ||
      !Allow(ruleset.fd, "/dev/null", device, error) ||
      !Allow(ruleset.fd, "/dev/tty", device, error)) {
    return false;
  }

  if (syscall(SYS_landlock_restrict_self, ruleset.fd, 0) != 0) {
    return Failed("Landlock", error);
  }
  return true;
}

}  // namespace

bool Confine(std::string& missing, std::string& error) {
  missing.clear();
  // The rules go by what lies at these places now: a state folder that came later would not count.
  if (!MakeStateRoot(error)) {
    return false;
  }
  if (prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0) != 0) {
    return Failed("no new privileges", error);
  }
  return LimitWriting(missing, error) && DropCapabilities(error);
}

}  // namespace fileindexd
