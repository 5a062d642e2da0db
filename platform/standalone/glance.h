// SPDX-License-Identifier: GPL-2.0-or-later
// The look that a Worker's questions about a path were answered from, for the operation that
// follows them.
#pragma once

#include <string>

#include "state/belonging.h"

namespace fileindexd {

// True when this thread has just asked about exactly that path, and the thing there belongs; then
// stores what was seen, and forgets it. `seen` is unchanged otherwise.
bool TakeGlance(const std::string& path, Seen& seen);

}  // namespace fileindexd
