// SPDX-License-Identifier: GPL-2.0-or-later
// Walks of a Worker, as the index sees them: operations on a directory, then on all below it.
//
// A walk meets what is there. What is gone from a directory that still is the one that was known is
// met by nobody, and an event that told of it may have been displaced by the one that has the
// directory walked. So the first operation of a walk has everything known below looked at.
#pragma once

#include <string>

namespace fileindexd {

// All of the calling thread, which works for one share.

// Whether a walk of `path` begins here: none of a directory above it was begun in this pass.
bool BeginsWalk(const std::string& path);
// What is known below `path` was looked at, and the walk of it comes next: it does not begin one.
void NoteLookedAt(const std::string& path);
// The pass has ended: what was looked at in it may have changed since.
void EndWalks();

}  // namespace fileindexd
