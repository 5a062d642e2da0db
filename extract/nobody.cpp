// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/nobody.h"

#include <grp.h>
#include <unistd.h>

#include <cerrno>
#include <system_error>

namespace fileindexd {

namespace {

constexpr id_t NOBODY = 65534;

bool Failed(const std::string& what, std::string& error) {
  error = what + ": " + std::generic_category().message(errno);
  return false;
}

}  // namespace

bool LeaveUser(std::string& error) {
  if (geteuid() != 0) {
    return true;
  }
  if (setgroups(0, nullptr) != 0 && errno != EPERM) {  // user namespaces may forbid it
    return Failed("groups", error);
  }
  if (setresgid(NOBODY, NOBODY, NOBODY) != 0 && errno != EINVAL) {
    return Failed("group", error);
  }
  if (setresuid(NOBODY, NOBODY, NOBODY) != 0 && errno != EINVAL) {
    return Failed("user", error);
  }
  return true;
}

}  // namespace fileindexd
