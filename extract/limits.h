// SPDX-License-Identifier: GPL-2.0-or-later
// Resource limits of a helper; the amounts stand in doors.h.
#pragma once

namespace fileindexd {

// Where the host runs short of memory, the process is the first to go. While files can be opened.
void GoFirst();

// False with errno.
bool SetLimits();

}  // namespace fileindexd
