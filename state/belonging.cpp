// SPDX-License-Identifier: GPL-2.0-or-later
// What a path's letters say. What the disk says is in look.cpp.
#include "state/belonging.h"

#include "state/layout.h"

namespace fileindexd {

namespace {

// The part of `path` below `parent`, which covers it; empty for `parent` itself.
std::string_view Below(std::string_view parent, std::string_view path) {
  path.remove_prefix(path.size() == parent.size() ? parent.size()
                     : parent == "/"              ? 1
                                                  : parent.size() + 1);
  return path;
}

bool HasSkippedName(std::string_view below) {
  while (!below.empty()) {
    const size_t slash = below.find('/');
    const std::string_view name = below.substr(0, slash);
    if (IsPreservedName(name) || IsPassingName(name)) {
      return true;
    }
    below.remove_prefix(slash == std::string_view::npos ? below.size() : slash + 1);
  }
  return false;
}

}  // namespace

bool IsPreservedName(std::string_view name) {
  return name == "#snapshot" || name == ".snapshots" || name == "lost+found";
}

bool IsPassingName(std::string_view name) {
  constexpr std::string_view LOCK = ".~lock.";
  return name.starts_with(".nfs") || name.starts_with(".fuse_hidden") || name.starts_with("~$") ||
         (name.starts_with(LOCK) && name.ends_with('#'));
}

Verdict JudgeName(const Settings& settings, const std::string& path) {
  const auto normal = NormalPath(path);
  if (!normal.has_value()) {
    return Verdict::BAD_PATH;
  }
  const Share* share = settings.ShareOfPath(*normal);
  if (share == nullptr) {
    return Verdict::NO_SHARE;
  }
  if (!settings.state_root.empty() && Covers(settings.state_root, *normal)) {
    return Verdict::OWN_STATE;
  }
  const IndexedFolder* folder = settings.FolderOfPath(*normal);
  if (folder == nullptr) {
    return Verdict::NOT_COVERED;
  }
  std::string_view below = *normal;
  below.remove_prefix(share->path.size());
  if (HasSkippedName(below)) {
    return Verdict::SKIPPED_NAME;
  }
  const Excludes::Match match =
      folder->excludes.KeepOut(Below(folder->path, *normal), Leaf::UNKNOWN);
  return match.pattern != nullptr ? Verdict::EXCLUDED : Verdict::BELONGS;
}

Exclusion FindExclusion(const Settings& settings, const std::string& path, Leaf leaf) {
  const IndexedFolder* folder = settings.FolderOfPath(path);
  if (folder == nullptr) {
    return {};
  }
  const std::string_view below = Below(folder->path, path);
  const Excludes::Match match = folder->excludes.KeepOut(below, leaf);
  if (match.pattern == nullptr) {
    return {};
  }
  return {folder, match.pattern, path.substr(0, path.size() - below.size() + match.length)};
}

const char* VerdictText(Verdict verdict) {
  switch (verdict) {
    case Verdict::BELONGS:
      return "belongs in the index";
    case Verdict::BAD_PATH:
      return "not an absolute, plain path";
    case Verdict::NO_SHARE:
      return "in no share";
    case Verdict::NOT_COVERED:
      return "in no indexed folder";
    case Verdict::SKIPPED_NAME:
      return "has a name that is passed over";
    case Verdict::OWN_STATE:
      return "in the indexer's own folder";
    case Verdict::EXCLUDED:
      return "kept out by an exclude pattern";
    case Verdict::GONE:
      return "does not exist";
    case Verdict::BEHIND_LINK:
      return "behind a symbolic link";
    case Verdict::BELOW_MOUNT:
      return "below a nested mount point";
    case Verdict::IN_SNAPSHOT:
      return "in a snapshot";
    case Verdict::SPECIAL_FILE:
      return "a socket, pipe or device";
    case Verdict::UNKNOWN:
      return "the file system does not answer";
  }
  return "";
}

}  // namespace fileindexd
