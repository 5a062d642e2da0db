// SPDX-License-Identifier: GPL-2.0-or-later
// What has happened at a path becomes lines, by a look at what is there now.
//
// Records merge, and come in no order: "created and deleted" is told of a file that exists. So the
// bits only choose between lines that fit what is seen; each line has one bit.
#pragma once

#include <string>
#include <vector>

#include "notify/change.h"
#include "state/belonging.h"
#include "state/queue_folding.h"
#include "state/settings.h"

namespace fileindexd {

// Adds the lines to `lines`, none where nothing need be said. `what` is of Happening; with a former
// path `from`, both of which belong by their letters, the thing was renamed. `folder` is kept from
// one path to the next: those of one folder come together. Returns what was seen at `path`.
Look LinesOfLook(const Settings& settings, const std::string& path, uint32_t what,
                 const std::string& from, FolderView& folder, std::vector<QueueLine>& lines);

}  // namespace fileindexd
