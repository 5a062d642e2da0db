// SPDX-License-Identifier: GPL-2.0-or-later
// The content service's names, beside those that others know.
#pragma once

namespace fileindexd {

constexpr const char* HELPER_PROGRAM = "fileindex-extract";
constexpr const char* SERVICE_LOCK_FILE = "/var/run/talocontentsearchd.lock";

}  // namespace fileindexd
