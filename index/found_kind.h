// SPDX-License-Identifier: GPL-2.0-or-later
// The kinds of entries whose names tell nothing, by what was found in them.
#pragma once

#include <string>

#include "index/database.h"
#include "index/entry.h"
#include "state/settings.h"
#include "state/sqlite.h"

namespace fileindexd {

// For walks over all entries, however long they take: it reads something only of those few that
// need it, each time what is there by then, and holds nothing of the contents' log in between.
class FoundKinds {
 public:
  // Without success names alone tell. PATH_NOT_FOUND: nothing was read out of the share's files
  // yet.
  void Open(const std::string& share_name);

  // By name, or by what was found inside where the name tells nothing. Once that cannot be read,
  // names alone tell.
  Kind KindOf(const Entry& entry);

  IndexError error = IndexError::PATH_NOT_FOUND;  // why only names tell; NONE: they do not

 private:
  IndexDatabase contents;
  Statement found;  // goes before its connection
};

// Whether the entry's content is wanted, when it is known to be of that kind. Before anybody has
// looked inside, a name that tells nothing may be of any kind.
bool IsWantedAs(Kind kind, const Entry& entry, const Settings& settings);

}  // namespace fileindexd
