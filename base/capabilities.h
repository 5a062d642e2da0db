// SPDX-License-Identifier: GPL-2.0-or-later
// Giving up capabilities, by system call: the library for this is not everywhere, and there is not
// much to it.
#pragma once

#include <linux/capability.h>
#include <sys/prctl.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdint>

namespace fileindexd {

constexpr uint64_t CapabilityBit(int capability) {
  return uint64_t{1} << capability;
}

inline void KeepCapabilityHalf(uint32_t wanted, __user_cap_data_struct& half) {
  half.permitted &= wanted;
  half.effective = half.permitted;
  half.inheritable = 0;
}

// Drops all capabilities but the wanted ones from the bounding set, where the process may do that:
// before it gives up the capability for it. False with errno.
inline bool BoundCapabilities(uint64_t wanted) {
  int is_bound = 0;
  for (int capability = 0; is_bound >= 0; ++capability) {
    is_bound = prctl(PR_CAPBSET_READ, capability, 0, 0, 0);  // negative beyond the last
    if (is_bound == 1 && (wanted & CapabilityBit(capability)) == 0 &&
        prctl(PR_CAPBSET_DROP, capability, 0, 0, 0) != 0 && (errno != EPERM || geteuid() == 0)) {
      return false;
    }
  }
  return true;
}

// The same for all other sets. What the process does not have cannot be had; whoever needs it says
// so. False with errno.
inline bool KeepCapabilities(uint64_t wanted) {
  // Kernels without ambient capabilities have none to clear.
  if (prctl(PR_CAP_AMBIENT, PR_CAP_AMBIENT_CLEAR_ALL, 0, 0, 0) != 0 && errno != EINVAL) {
    return false;
  }

  __user_cap_header_struct header = {_LINUX_CAPABILITY_VERSION_3, 0};
  std::array<__user_cap_data_struct, _LINUX_CAPABILITY_U32S_3> sets = {};
  if (syscall(SYS_capget, &header, sets.data()) != 0) {
    return false;
  }
  KeepCapabilityHalf(static_cast<uint32_t>(wanted), sets[0]);
  KeepCapabilityHalf(static_cast<uint32_t>(wanted >> 32), sets[1]);
  return syscall(SYS_capset, &header, sets.data()) == 0;
}

}  // namespace fileindexd
