// SPDX-License-Identifier: GPL-2.0-or-later
// The one writer of queue files.
//
// One line is one JSON object: {"event": number, "path": text, "path_old": text, "data": object},
// the last two only where they are given; see event_codes.h. Bytes of paths stay as they are.
#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace fileindexd {

// One event line without its newline. `data` is JSON text, empty for none.
std::string EventLine(uint32_t event, std::string_view path,
                      const std::optional<std::string>& path_old = std::nullopt,
                      std::string_view data = {});

// Appends whole lines (each gets its newline) under the queue's lock, which is waited for 5 s at
// most, and closes the file; no lines only creates and closes it. False on failure, nothing half
// written, and `error` then tells. The share's folder is made where it is missing.
bool AppendToQueue(const std::string& share_name, const std::vector<std::string>& lines,
                   std::string& error);

// SYNCED: true only once a power cut cannot take the lines away again. Costs two syncs. After false
// the lines may be queued all the same.
enum class Durability { NONE, SYNCED };

// The same with lines, one at least, that are made while the lock is held.
using MakeLines = std::function<std::vector<std::string>()>;
bool AppendToQueue(const std::string& share_name, const MakeLines& make, Durability durability,
                   std::string& error);

// Opens the queue file as a writer does, creating it where it is missing, takes its lock without
// waiting and closes it: the daemon looks at the queue again. True also while another program holds
// the lock: it closes the file in turn. False on failure, and `error` then tells.
bool TouchQueue(const std::string& share_name, std::string& error);

// Lines in the queue file and its drained copy together; 0 when there is neither.
uint64_t WaitingLines(const std::string& share_name);

}  // namespace fileindexd
