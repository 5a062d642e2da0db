// SPDX-License-Identifier: GPL-2.0-or-later
// Event codes of queue lines: bits, shared by all who write or read them.
#pragma once

#include <cstdint>

namespace fileindexd {

constexpr uint32_t QLIB_NOTIFY_MODIFY = 0x2;
constexpr uint32_t QLIB_NOTIFY_ATTRIB = 0x4;
constexpr uint32_t QLIB_NOTIFY_CLOSE_WRITE = 0x8;
constexpr uint32_t QLIB_NOTIFY_CREATE = 0x40;
constexpr uint32_t QLIB_NOTIFY_DELETE = 0x80;
constexpr uint32_t QLIB_NOTIFY_RENAME = 0x100;
constexpr uint32_t QLIB_NOTIFY_RENAME_FULL = 0x200;
constexpr uint32_t QLIB_NOTIFY_QUEUE_RESET = 0x400;
constexpr uint32_t CUSTOM_EVENT_REINDEX = 0x10000;
constexpr uint32_t CUSTOM_EVENT_UPDATE = 0x20000;

}  // namespace fileindexd
