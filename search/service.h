// SPDX-License-Identifier: GPL-2.0-or-later
// The content service's names.
#pragma once

namespace fileindexd {

constexpr const char* SERVICE_PROGRAM = "talocontentsearchd";
constexpr const char* HELPER_PROGRAM = "fileindex-extract";
constexpr const char* SERVICE_PID_FILE = "/var/run/talocontentsearchd.pid";
constexpr const char* SERVICE_LOCK_FILE = "/var/run/talocontentsearchd.lock";

}  // namespace fileindexd
