// SPDX-License-Identifier: GPL-2.0-or-later
#include "notify/confinement.h"

#include <sys/prctl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdint>
#include <system_error>

#include "base/capabilities.h"
#include "base/landlock.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

bool Failed(const std::string& what, std::string& error) {
  error = what + ": " + std::generic_category().message(errno);
  return false;
}

// The queues are written as their folder's owner where that is the superuser.
uint64_t WantedCapabilities() {
  uint64_t wanted = CapabilityBit(CAP_SYS_ADMIN) | CapabilityBit(CAP_DAC_READ_SEARCH);
  struct stat root = {};
  if (stat(StateRoot().c_str(), &root) == 0 && root.st_uid != geteuid()) {
    wanted |= CapabilityBit(CAP_DAC_OVERRIDE);
  }
  return wanted;
}

bool Allow(const LandlockRules& rules, const std::string& path, uint64_t rights,
           std::string& error) {
  return rules.Allow(path.c_str(), rights) || Failed(path, error);
}

bool LimitWriting(std::string& missing, std::string& error) {
  const long version = LandlockVersion();
  if (version < 1) {
    missing = "Landlock: " + std::generic_category().message(errno);
    return true;
  }

  const uint64_t writes = LandlockWrites(version);
  LandlockRules rules;
  if (!rules.Open(writes)) {
    return Failed("Landlock", error);
  }

  const uint64_t device = LANDLOCK_ACCESS_FS_WRITE_FILE | LANDLOCK_TRUNCATE_RIGHT;
  if (!Allow(rules, StateRoot(), writes, error) || !Allow(rules, "/run", writes, error) ||
      !Allow(rules, "/var/run", writes, error) || !Allow(rules, "/dev/null", device, error) ||
      !Allow(rules, "/dev/tty", device, error)) {
    return false;
  }
  return rules.Restrict() || Failed("Landlock", error);
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
  if (!LimitWriting(missing, error)) {
    return false;
  }
  const uint64_t wanted = WantedCapabilities();
  return (BoundCapabilities(wanted) && KeepCapabilities(wanted)) || Failed("capabilities", error);
}

}  // namespace fileindexd
