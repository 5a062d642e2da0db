// SPDX-License-Identifier: GPL-2.0-or-later
#include "ctl/root_problem.h"

#include "ctl/output.h"

namespace fileindexd {

// The root itself is an entry where it is an indexed folder; an index of that alone is as empty.
bool IsRootEmptied(const Settings& settings, const Share& share, const ShareStatus& status,
                   RootState root, uint64_t entries) {
  const uint64_t own = settings.FolderAt(share.path) != nullptr ? 1 : 0;
  return !status.accept_empty && root == RootState::SOUND && entries > own && IsRootEmpty(share);
}

std::string RootProblem(const std::string& subject, const Share& share, RootState root,
                        bool emptied) {
  const std::string accept = "fileindexctl share accept " + OneLine(share.name);
  switch (root) {
    case RootState::SOUND:
      return emptied ? subject + " is empty where it was not; if that is meant: " + accept : "";
    case RootState::MISSING:
      return subject + " is missing; the index is left as it is";
    case RootState::FOREIGN:
      return subject +
             " lies on another file system than before; the index is left as it is; to go on with "
             "this one: " +
             accept;
    case RootState::UNKNOWN:
      break;
  }
  return subject + " cannot be looked at";
}

}  // namespace fileindexd
