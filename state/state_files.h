// SPDX-License-Identifier: GPL-2.0-or-later
// What the opening of the state database and the copying of it do with files.
#pragma once

#include <string>

#include "base/scoped_fd.h"

namespace fileindexd {

// The lock on the state root under which both are done, waited for 5 s at most or, without `wait`,
// not at all. False on failure, and `error` then says why.
bool LockStateRoot(const std::string& root, bool wait, ScopedFd& lock, std::string& error);

// What could not be done with a file, and why, by errno.
std::string StateFileError(const std::string& what, const std::string& path);

// Whether anything stands there, whatever it is.
bool StateFileExists(const std::string& path);

}  // namespace fileindexd
