// SPDX-License-Identifier: GPL-2.0-or-later
// A root folder that holds nothing but what a helper needs, for kernels without Landlock.
#pragma once

#include <string>

#include "extract/run_time_files.h"

namespace fileindexd {

// Moves the process, in a mount namespace of its own, into a root folder in memory in which those
// files alone appear, at their paths and not to be changed. Takes the right to mount, or a
// kernel that gives user namespaces to everybody: the superuser becomes nobody for that. False, and
// `error` then says why, on failure: the process may then be nobody, in a namespace of its own, and
// see what it saw, or a root folder that is half made. It opens nothing by its path then.
bool EnterOwnRoot(const RunTimeFiles& files, std::string& error);

}  // namespace fileindexd
