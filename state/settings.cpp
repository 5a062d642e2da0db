// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/settings.h"

#include <algorithm>

#include "state/layout.h"

namespace fileindexd {

const Share* Settings::ShareByName(std::string_view name) const {
  const auto found = std::lower_bound(
      shares.begin(), shares.end(), name,
      [](const Share& share, std::string_view wanted) { return share.name < wanted; });
  return found != shares.end() && found->name == name ? &*found : nullptr;
}

const Share* Settings::ShareOfPath(std::string_view path) const {
  // No share lies in another, so the first is the only one.
  for (const Share& share : shares) {
    if (Covers(share.path, path)) {
      return &share;
    }
  }
  return nullptr;
}

const IndexedFolder* Settings::FolderOfPath(std::string_view path) const {
  const IndexedFolder* deepest = nullptr;
  for (const IndexedFolder& folder : folders) {
    if (Covers(folder.path, path) &&
        (deepest == nullptr || folder.path.size() > deepest->path.size())) {
      deepest = &folder;
    }
  }
  return deepest;
}

const IndexedFolder* Settings::FolderAt(std::string_view path) const {
  const auto found = std::lower_bound(
      folders.begin(), folders.end(), path,
      [](const IndexedFolder& folder, std::string_view wanted) { return folder.path < wanted; });
  return found != folders.end() && found->path == path ? &*found : nullptr;
}

bool Settings::HasFolderBelow(std::string_view path) const {
  const std::string first = path == "/" ? "/" : std::string(path) + "/";
  const auto found = std::upper_bound(
      folders.begin(), folders.end(), first,
      [](const std::string& wanted, const IndexedFolder& folder) { return wanted < folder.path; });
  return found != folders.end() && found->path.starts_with(first);
}

}  // namespace fileindexd
