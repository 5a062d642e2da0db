// SPDX-License-Identifier: GPL-2.0-or-later
// Starts fileindex-extract as if the kernel had no Landlock, and where WITHOUT_NAMESPACES is set no
// namespaces either.
#include <linux/landlock.h>
#include <seccomp.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>

namespace {

bool Deny(scmp_filter_ctx filter, const char* name, int failure) {
  return seccomp_rule_add(filter, SCMP_ACT_ERRNO(static_cast<uint32_t>(failure)),
                          seccomp_syscall_resolve_name(name), 0) == 0;
}

}  // namespace

int main(int /*argc*/, char** argv) {
  const scmp_filter_ctx filter = seccomp_init(SCMP_ACT_ALLOW);
  if (filter == nullptr || !Deny(filter, "landlock_create_ruleset", ENOSYS) ||
      (WITHOUT_NAMESPACES && !Deny(filter, "unshare", ENOSYS)) || seccomp_load(filter) != 0) {
    return 100;
  }
  (void)execv(HELPER, argv);
  return 101;
}
