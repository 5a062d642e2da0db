// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/emptied.h"

#include <algorithm>

namespace fileindexd {

bool HoldsMoreThanFolders(const Settings& settings, const Share& share, uint64_t entries) {
  const auto folders =
      std::count_if(settings.folders.begin(), settings.folders.end(),
                    [&share](const IndexedFolder& folder) { return folder.share == share.name; });
  return entries > static_cast<uint64_t>(folders);
}

bool IsEmptied(StateStore& store, const Settings& settings, const Share& share, uint64_t entries) {
  if (!HoldsMoreThanFolders(settings, share, entries) || !IsRootEmpty(share)) {
    return false;
  }
  ShareStatus status;
  return !store.GetStatus(share.name, status) || !status.accept_empty;
}

}  // namespace fileindexd
