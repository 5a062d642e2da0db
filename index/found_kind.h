// SPDX-License-Identifier: GPL-2.0-or-later
// The kinds of entries whose names tell nothing, by what was found in them.
#pragma once

#include <string>

#include "index/database.h"
#include "index/entry.h"
#include "state/sqlite.h"

namespace fileindexd {

// For walks over all entries: it reads something only of those few that need it. Goes before the
// connection that it was opened on.
class FoundKinds {
 public:
  // Attaches the share's contents to its open entries. PATH_NOT_FOUND: nothing was read out of the
  // share's files yet. Whatever comes, the entries stay usable, and names alone tell.
  IndexError Open(IndexDatabase& entries, const std::string& share_name);

  // The entry's kind: by name, or by what was found inside where the name tells nothing. False when
  // it cannot be read.
  bool KindOf(const Entry& entry, Kind& kind);

 private:
  Statement found;
};

}  // namespace fileindexd
