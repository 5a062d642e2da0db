// SPDX-License-Identifier: GPL-2.0-or-later
// Messages over a local socket, with open files along with them.
#pragma once

#include <sys/types.h>

#include <cstddef>
#include <span>
#include <string_view>

#include "base/scoped_fd.h"

namespace fileindexd {

// With one message.
constexpr size_t MOST_PASSED_FILES = 3;

// As send with these flags, and MSG_NOSIGNAL. True when all of it has gone.
bool SendWithFiles(int socket, std::string_view bytes, std::span<const int> files, int flags = 0);

// As recv, without flags. `files` then are those that came, close-on-exec, in their order, and none
// behind them. A message of which a file could not be had, or that had more of them, is lost: -1,
// with EMFILE. No memory is asked for.
ssize_t ReceiveWithFiles(int socket, std::span<char> bytes, std::span<ScopedFd> files);

}  // namespace fileindexd
