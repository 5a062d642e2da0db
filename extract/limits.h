// SPDX-License-Identifier: GPL-2.0-or-later
// Resource limits of a helper; the amounts stand in doors.h.
#pragma once

namespace fileindexd {

// False with errno.
bool SetLimits();

}  // namespace fileindexd
