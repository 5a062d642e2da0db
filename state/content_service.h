// SPDX-License-Identifier: GPL-2.0-or-later
// By what the content service is known to others.
#pragma once

namespace fileindexd {

// Started under that name by the daemon, which has it in daemon/daemon.h: they change together.
constexpr const char* SERVICE_PROGRAM = "talocontentsearchd";
constexpr const char* SERVICE_PID_FILE = "/var/run/talocontentsearchd.pid";

}  // namespace fileindexd
