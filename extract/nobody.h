// SPDX-License-Identifier: GPL-2.0-or-later
// The user that a helper becomes.
#pragma once

#include <string>

namespace fileindexd {

// The superuser becomes nobody, without groups; anybody else stays. In a user namespace that does
// not know that user (EINVAL) it stays what it is there. False, and `error` then says why.
bool LeaveUser(std::string& error);

}  // namespace fileindexd
