// SPDX-License-Identifier: GPL-2.0-or-later
// Pid files: one decimal number and a newline.
//
// A pid file outlives a kill, and pids are used again: a recorded process counts as alive only if
// it runs the program that is expected.
#pragma once

#include <sys/types.h>

#include <string>

namespace fileindexd {

// The recorded process if it is alive and its executable's name is `program`, else 0. Negative,
// with errno, when the file is there and cannot be read.
pid_t AliveByPidFile(const std::string& pid_file, const std::string& program);

// Records the calling process, mode 0644, replacing what is there. False with errno on failure.
bool WritePidFile(const std::string& pid_file);

}  // namespace fileindexd
