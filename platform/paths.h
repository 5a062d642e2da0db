// SPDX-License-Identifier: GPL-2.0-or-later
// Rules about paths: what exists, what may be an index entry, what is passed over.
//
// Paths are absolute and taken byte for byte.
#pragma once

#include <string>

#include "platform/json.h"

namespace fileindexd {

namespace TALO::FILEINDEX {

// True for an existing directory. The last component is not followed; below a share's root nothing
// behind a symbolic link exists, and a directory that is in a snapshot, or that a pattern of the
// settings keeps out with all it holds, is none.
bool IsDirExist(const std::string& path);

// True for an existing regular file or symbolic link, by the same rules; for a queue file, only a
// regular file.
bool IsFileExist(const std::string& path);

// Whether a directory itself may be an index entry.
bool CanFullPathBeIndexed(const std::string& path);

// Told of a directory that a walk passes over, as opening it failed with `error` (of errno): what
// only lacked a descriptor can be walked later. Never tests for cancellation.
void NoteUnopenedDirectory(const std::string& path, int error);

// True for bare names that are never indexed and never descended into.
bool IsSystemPreservedFileName(const std::string& name);

// True when the path must not be added. Call with the daemon's platform mutex held; never tests for
// cancellation.
bool IsSkipIndex(const std::string& path);

// True when `text` begins with `prefix`.
bool StringStartWith(const std::string& text, const std::string& prefix);

// Stores object[key]. When the key is missing or not a boolean, or `object` is no object, the
// variable is left as it was.
void RetrieveBoolFromJsonObj(bool& value, const char* key, const Json::Value& object);

}  // namespace TALO::FILEINDEX

// Both are called with the daemon's platform mutex held, and never test for cancellation.

// 0 on success, and then `*in_snapshot` is 1 when the path lies inside a snapshot, else 0.
int QLIBFhsPathInSnapshot(const char* path, int* in_snapshot);

// 1 when the directory is a mount point, 0 when not, negative on failure.
int TALOFSDirIsMntPoint(const char* path);

}  // namespace fileindexd
