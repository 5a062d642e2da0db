// SPDX-License-Identifier: GPL-2.0-or-later
// Starting other programs: default signals, an empty signal mask, umask 022, a session of their
// own, the descriptor limit that we were started with, and no descriptor of ours.
#pragma once

#include <sys/types.h>

#include <string>

namespace fileindexd {

// Runs a program and waits for its end: the exit status, or -1 with errno when it could not be run.
int RunProgram(const char* const* arguments);

// Starts a program detached from us: its process, or -1 with errno.
pid_t StartDetached(const std::string& program);

// Name of the running program's file, without its folder, and that folder.
std::string OwnProgram();
std::string OwnFolder();

}  // namespace fileindexd
