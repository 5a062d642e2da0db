// SPDX-License-Identifier: GPL-2.0-or-later
// All that can be said of one path: settings, disk, index and queue.
#pragma once

#include <string>

#include "ctl/info_content.h"
#include "ctl/pending.h"
#include "ctl/places.h"
#include "index/entry.h"
#include "state/belonging.h"

namespace fileindexd {

enum class Agreement {
  CURRENT,    // in the index, as the disk shows it
  STALE,      // in the index with other attributes
  MISSING,    // belongs, and is not in the index
  LEFT_OVER,  // in the index, and does not belong
  ABSENT,     // not in the index, where it does not belong
  UNKNOWN,    // cannot be told
};
// "current", "stale", "missing", "left-over", "absent", "unknown".
const char* AgreementText(Agreement agreement);

// Pointers live as long as the session's settings.
struct PathFacts {
  std::string path;  // normal
  const Share* share = nullptr;
  const IndexedFolder* folder = nullptr;  // the deepest that covers it
  RootState root = RootState::SOUND;      // of the share
  bool root_emptied = false;              // sound, and empty where the index holds something
  ShareStatus status;
  Look look;
  std::string reason;  // why it belongs or not, a sentence
  Exclusion exclusion;
  std::string at;  // the component that decides (a link, a mount point, a name); empty: none
  bool in_index = false;
  Entry entry;  // if so
  EntryContent content;
  bool index_read = true;
  std::string index_problem;  // why there is nothing to read; empty: there is
  Agreement agreement = Agreement::UNKNOWN;
  Pending pending;
};

// False, with its line written, on failure.
bool FindFacts(Session& session, const std::string& given, PathFacts& facts);

}  // namespace fileindexd
