// SPDX-License-Identifier: GPL-2.0-or-later
// Where everything lies on disk, and the form in which paths are compared.
//
//   ROOT/state.db                               shares, folders, flags
//   ROOT/contents-left-out                      what is not read on this host
//   ROOT/shares/NAME/TALO@file_index_queue      the share's queue file
//   ROOT/shares/NAME/TALO@file_index_queue.tmp  its drained copy
//   ROOT/shares/NAME/index/                     entries
//   ROOT/shares/NAME/contents/                  what was read out of files
//   ROOT/shares/NAME/index.damaged/             a database that could not be used, set aside
//   ROOT/shares/.NAME.removed/                  what is being removed, where that was cut short
#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace fileindexd {

constexpr const char* QUEUE_NAME = "TALO@file_index_queue";

// FILEINDEXD_STATE_DIR, or /var/lib/fileindexd where that is not set or empty. Where it is no
// absolute path there is no root: MakeStateRoot says so, and nothing stands below what this gives.
// Read at each call.
std::string StateRoot();

std::string StateDatabasePath();
std::string SharesFolder();
std::string ShareFolder(const std::string& share_name);
std::string QueuePath(const std::string& share_name);
std::string DrainedPath(const std::string& share_name);
std::string IndexPath(const std::string& share_name);
std::string ContentsPath(const std::string& share_name);
std::string DamagedIndexPath(const std::string& share_name);
std::string DamagedContentsPath(const std::string& share_name);

// Creates ROOT and ROOT/shares where they are missing, mode 0700 whatever the umask. False on
// failure, and `error` then says what and why.
bool MakeStateRoot(std::string& error);
// The same for a share's folder, ROOT included.
bool MakeShareFolder(const std::string& share_name, std::string& error);

// 1 to 64 bytes; no '/', no NUL, no leading '.', no control characters of ASCII: what can be the
// name of a share that there is.
bool IsValidShareName(std::string_view name);
// As a share may be called from now on: no other control characters (U+0080 to U+009F) either.
bool CanNameNewShare(std::string_view name);

// The one form in which paths are kept and compared: repeated and trailing slashes dropped. None
// for a path that is relative or empty, holds a NUL, or has a "." or ".." component.
std::optional<std::string> NormalPath(std::string_view path);

// True when normal path `path` is `parent` or lies below it. "/" covers everything.
bool Covers(std::string_view parent, std::string_view path);

}  // namespace fileindexd
