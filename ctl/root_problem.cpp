// SPDX-License-Identifier: GPL-2.0-or-later
#include "ctl/root_problem.h"

#include "ctl/output.h"
#include "index/emptied.h"

namespace fileindexd {

bool IsRootEmptied(const Settings& settings, const Share& share, const ShareStatus& status,
                   RootState root, uint64_t entries) {
  return !status.accept_empty && root == RootState::SOUND &&
         HoldsMoreThanFolders(settings, share, entries) && IsRootEmpty(share);
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
