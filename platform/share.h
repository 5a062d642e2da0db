// SPDX-License-Identifier: GPL-2.0-or-later
// Shares: their records, where their files lie, whether they can be indexed.
//
// Any thread may call these, each thread for the shares that it works on.
#pragma once

#include <string>

#include "platform/json.h"

namespace fileindexd {

// A share's record. Both texts are NUL-terminated and live as long as the record.
struct _tag_TALOSHARE {  // NOLINT: the host's own name
  const char* name;
  const char* path;  // root directory of the share, absolute
};

// Stores a new record in `*share`; the caller releases it with TALOShareFree. Negative on failure,
// `*share` unchanged: the share is not known, or the store cannot be read.
int TALOShareGet(const char* name, _tag_TALOSHARE** share);

// Releases a record. Null is allowed.
void TALOShareFree(_tag_TALOSHARE* share);

// Write the NUL-terminated path of a share's index database, or of its queue file, whose last
// component is "TALO@file_index_queue", into the caller's buffer of `size` bytes. Negative on
// failure (an invalid name, a buffer that is too small), the buffer unchanged.
int FILEIDXDBPathGet(const char* share_name, char* buffer, int size);
int FILEIDXQueuePathGet(const char* share_name, char* buffer, int size);

namespace TALO::FILEINDEX {

// Appends one event line to the queue of the share that holds `path`. There is no result: a line
// that cannot be written makes the share need a reindex instead.
void AddCustomEvent(const int& event, const std::string& path, const Json::Value& data);

// Told that changes were lost on their way into the index of the share that holds `path`, as
// something failed with `error` (of errno): the whole share has to be indexed again. Never tests
// for cancellation.
void NoteLostChanges(const std::string& path, int error);

// Stores the name of the share that holds `path`. False when there is none, the name unchanged.
bool GetShareNameByPath(std::string& share_name, const std::string& path);

// False when the share must get no Worker.
bool CanShareBeIndexed(const _tag_TALOSHARE* share);

// False when the share's volume, or the one that holds its index, is too full to index.
// Otherwise clears the share's no-space flag where it stands.
bool IsShareSpaceEnough(const std::string& share_name);

}  // namespace TALO::FILEINDEX
}  // namespace fileindexd
