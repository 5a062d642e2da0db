// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/nobody.h"

#include <grp.h>
#include <unistd.h>

#include <cerrno>

#include "extract/error_text.h"

namespace fileindexd {

namespace {

constexpr id_t NOBODY = 65534;

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
