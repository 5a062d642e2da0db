// SPDX-License-Identifier: GPL-2.0-or-later
// What outlives a run of the daemon: the pause state, flags of shares, markers of one-time updates.
#pragma once

#include <cstdint>
#include <string>

namespace fileindexd::TALO::FILEINDEX {

namespace StatusMgr {

// Stores the stored pause state, in seconds since the epoch: 0 paused without end, a time in the
// future paused until then, anything else not paused. False when it cannot be read.
bool GetPauseInfo(int64_t& resume_time);

// True when the one-time update of that name already ran.
bool IsUpdated(const std::string& marker);
// Records that it ran; false when that cannot be stored.
bool SetUpdated(const std::string& marker);

// Whether the whole share has to be indexed again: the flag is set, or a reindex was begun and has
// not ended. Asked at the beginning of a pass: where the host puts the reindex off, the answer is
// no, and the host remembers until the pass's end that another one may be due.
bool ShareIsNeedReindex(const std::string& share_name);
// Sets the flag, or clears it and records that the reindex begins.
void ShareSetNeedReindex(const std::string& share_name, bool need);

// Records whether the share ran out of space; false when that cannot be stored.
bool ShareSetNoSpace(const std::string& share_name, bool no_space);

}  // namespace StatusMgr

// The one-time data update; false when it failed and has to run again.
bool Updater_hvx60_beta2();

}  // namespace fileindexd::TALO::FILEINDEX
