// SPDX-License-Identifier: GPL-2.0-or-later
// What this platform keeps for the whole process: the store, the settings in force, what became of
// each share's last commit. Thread-safe. Nothing here tests for cancellation.
#pragma once

#include <sys/resource.h>

#include <memory>
#include <string>

#include "state/settings.h"
#include "state/store.h"

namespace fileindexd {

// The process's one connection to the store, opened by the first call. Null, after a log line, when
// it cannot be opened; the next call tries again.
StateStore* Store();

// Of the three below, each tells a failure once, until the same goes well again or fails otherwise.

// The settings in force. When they cannot be read, the last ones that could, or empty ones.
std::shared_ptr<const Settings> CurrentSettings();

// The share's status; the default when it cannot be read.
ShareStatus StatusOf(const std::string& share);
bool ChangeStatus(const std::string& share, const std::function<void(ShareStatus&)>& change);

// The share that a path lies in, however the path is written; null: none. The settings' own.
const Share* FindShareOfPath(const Settings& settings, const std::string& path);

// Makes the share's next pass a whole reindex, and sees to it that there is one. False when that
// could not be recorded.
bool RequestReindex(const std::string& share);

// The same without seeing to it: some later pass will be the reindex.
bool RecordReindex(const std::string& share);

// Whether the share's root is anything but sound.
bool IsRootAway(const std::string& share);

// Whether the share's index holds anything but the indexed folders themselves. False as well when
// that cannot be told.
bool HoldsMoreThanFolders(const std::string& share);

// Whether a whole reindex is to be put off although it is asked for: the root is empty where it was
// not, so it would be refused, and take along the queue in which single deletions are told of.
bool PutReindexOff(const std::string& share);
// At the end of a pass: whether the reindex was put off in it. If it was, and may be made now, sees
// to the next one.
bool TakeUpReindex(const std::string& share);

void NoteCommit(const std::string& share, bool good);
// True once after each good commit: what is opened then is a database that was there.
bool TakeReopening(const std::string& share);
// False while the last commit of the share's index failed.
bool WasLastCommitGood(const std::string& share);

// The limit on descriptors that the process was started with; its own is raised by Store().
rlimit InheritedDescriptorLimit();

}  // namespace fileindexd
