// SPDX-License-Identifier: GPL-2.0-or-later
// Passes that ran out of descriptors, or could not read what was queued for them.
//
// What a walk has no descriptor for it passes over without a word. So the shares that this happens
// to are kept here, by name; at the end of such a pass the whole share is asked for again, a few
// times, and each time after a longer wait: Workers that walk at the same time take the descriptors
// from each other, and one has to be alone. Thread-safe.
#pragma once

#include <string>

#include "state/settings.h"

namespace fileindexd {

// Whether what failed with `error` lacked nothing but a descriptor.
bool IsShortage(int error);

// Something failed in the pass of the share that holds `path`, if one does, and the index lacks
// changes at or below it: a look or an opening, for want of a descriptor; the reading of the queue,
// for any reason.
void NoteFailedLook(const Settings& settings, const std::string& path, int error);

// Whether such a thing was noted since the last EndPass of the share.
bool IsPassShort(const std::string& share);

// At the end of a pass; if that was short, the share's needs-reindex flag is set by then.
// Microseconds to wait before the next one, 0 when the pass was whole, or when it is not tried
// again: then the flag stands until the share's next event.
unsigned EndPass(const std::string& share);

}  // namespace fileindexd
