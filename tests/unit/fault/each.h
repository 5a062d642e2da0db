// SPDX-License-Identifier: GPL-2.0-or-later
// The same story once for each call that can fail in it.
#pragma once

#include <functional>
#include <string>

#include "unit/fault/plan.h"

namespace fileindexd::fault {

// Runs `story` in a process and a folder of its own for every call of the kind that it makes, with
// that call failing; it arms and disarms by itself, with the number that it is given. A process
// that dies, hangs, or has a failed expectation fails the test, and so does it when a story ends
// before its call, but for the last quarter of them. Of the calls that are too many for the
// scale, some are taken at even distances: at the long one, of requests for memory alone.
void ForEachCall(const Fault& fault, const std::function<void(int nth)>& story);

}  // namespace fileindexd::fault
