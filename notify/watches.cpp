// SPDX-License-Identifier: GPL-2.0-or-later
#include "notify/watches.h"

#include <sys/stat.h>

#include <algorithm>
#include <climits>
#include <cstdlib>
#include <iterator>
#include <set>

#include "notify/log.h"
#include "state/belonging.h"
#include "state/layout.h"
#include "state/open_path.h"

namespace fileindexd {

namespace {

constexpr std::chrono::minutes BETWEEN_TRIES(10);

// Where a share's path leads, by way of links at or above its root.
std::string RealPath(const std::string& path) {
  char resolved[PATH_MAX];
  return realpath(path.c_str(), resolved) != nullptr ? resolved : path;
}

uint64_t InodeOf(const std::string& path) {
  struct stat st {};
  return stat(path.c_str(), &st) == 0 ? st.st_ino : 0;
}

std::vector<IndexedFolder> FoldersOf(const Settings& settings, const std::string& share) {
  std::vector<IndexedFolder> folders;
  for (const IndexedFolder& folder : settings.folders) {
    if (folder.share == share) {
      folders.push_back(folder);
    }
  }
  return folders;
}

bool AreSame(const std::vector<IndexedFolder>& a, const std::vector<IndexedFolder>& b) {
  return std::equal(a.begin(), a.end(), b.begin(), b.end(), [](const auto& one, const auto& other) {
    return one.path == other.path && one.wanted == other.wanted && one.excludes == other.excludes;
  });
}

const char* ProblemOfRoot(RootState state) {
  switch (state) {
    case RootState::MISSING:
      return "its folder is missing";
    case RootState::FOREIGN:
      return "its folder lies on another file system than before";
    case RootState::UNKNOWN:
      return "its folder cannot be looked at";
    case RootState::SOUND:
      break;
  }
  return "";
}

}  // namespace

const char* WatchedByText(WatchedBy by) {
  switch (by) {
    case WatchedBy::FANOTIFY:
      return "fanotify";
    case WatchedBy::INOTIFY:
      return "inotify";
    case WatchedBy::COMPARISON:
      return "comparison";
    case WatchedBy::NOBODY:
      break;
  }
  return nullptr;
}

bool Watches::BeginFanotify(const Mount& mount, ShareWatch& watch, std::string& refusal) {
  if (best > WatchedBy::FANOTIFY) {
    refusal = "fanotify is switched off";
    return false;
  }

  std::unique_ptr<FanGroup>& group = groups[mount.device];
  if (group == nullptr) {
    group = FanGroup::Open(mount, refusal);
  }
  if (group == nullptr) {
    groups.erase(mount.device);
    return false;
  }
  watch.by = WatchedBy::FANOTIFY;
  return true;
}

void Watches::Begin(const Share& share, const Mount& mount, ShareWatch& watch) {
  std::string refusal;
  if (IsChangedElsewhere(mount.type)) {
    refusal = "others than this machine may change a file system of type " + mount.type;
  } else if (BeginFanotify(mount, watch, refusal)) {
    LogInfo("share %s is watched by fanotify", share.name.c_str());
    return;
  } else if (best <= WatchedBy::INOTIFY) {
    std::string second;
    watch.tree = TreeWatch::Open(settings, share, second);
    if (watch.tree != nullptr) {
      watch.by = WatchedBy::INOTIFY;
      watch.problem = refusal;
      LogInfo("share %s is watched by inotify, %zu directories: %s", share.name.c_str(),
              watch.tree->Directories(), refusal.c_str());
      return;
    }
    refusal += "; " + second;
  }

  watch.by = WatchedBy::COMPARISON;
  watch.problem = refusal;
  LogError("share %s is compared at an interval: %s", share.name.c_str(), refusal.c_str());
}

// The mount that shows the share's root, and where the root lies in it. Null, with the problem,
// where the share is not to be watched.
const Mount* Watches::Place(const Share& share, SharePlace& place, std::string& problem) const {
  place.root = share.path;
  const Mount* mount = mounts.MountOf(share.path);
  if (mount != nullptr && IsChangedElsewhere(mount->type)) {
    // One that hangs must not hang the rest: the comparison looks at its root.
    place.real = share.path;
  } else {
    const RootState state = LookAtRoot(share);
    problem = ProblemOfRoot(state);
    place.real = RealPath(share.path);
    place.inode = InodeOf(share.path);
    mount = state == RootState::SOUND ? mounts.MountOf(place.real) : nullptr;
  }
  if (mount != nullptr) {
    place.mount = mount->id;
    place.device = mount->device;
    place.within = MountTable::PathWithin(*mount, place.real);
  }
  return mount;
}

// Whether what is in use is of no use any more.
bool Watches::IsBroken(const ShareWatch& watch, bool same_folders,
                       const std::vector<std::string>& points) const {
  if (watch.moved) {
    return true;
  }
  if (watch.by == WatchedBy::INOTIFY) {
    // A tree of watches is of its settings and mounts: what a mount hid was not watched.
    return !same_folders || watch.tree == nullptr || points != watch.points;
  }
  return watch.by == WatchedBy::FANOTIFY && !groups.contains(watch.place.device);
}

// What kept it from being watched better may be over: few descriptors, a mount in the way.
void Watches::TryBetter(const Share& share, const Mount& mount, ShareWatch& watch, News& news) {
  if (watch.by <= best || watch.by == WatchedBy::NOBODY || IsChangedElsewhere(mount.type) ||
      Clock::now() < watch.next_try) {
    return;
  }
  watch.next_try = Clock::now() + BETWEEN_TRIES;
  std::string refusal;
  if (BeginFanotify(mount, watch, refusal)) {
    watch.tree.reset();
    watch.problem.clear();
    LogInfo("share %s is watched by fanotify now", share.name.c_str());
    news.appeared.push_back(share.name);
  } else if (watch.by == WatchedBy::COMPARISON) {
    Begin(share, mount, watch);
    if (watch.by != WatchedBy::COMPARISON) {
      news.appeared.push_back(share.name);
    }
  }
}

void Watches::FollowShare(const Share& share, News& news) {
  std::vector<IndexedFolder> folders = FoldersOf(*settings, share.name);
  ShareWatch& watch = shares[share.name];
  const bool same_folders = AreSame(folders, watch.folders);
  const bool had_folders = !watch.folders.empty();
  watch.folders = std::move(folders);

  SharePlace place;
  std::string problem;
  const Mount* mount = watch.folders.empty() ? nullptr : Place(share, place, problem);
  if (mount == nullptr) {
    if (watch.folders.empty()) {
      problem = "no folder of it is indexed";
    }
    if (watch.by != WatchedBy::NOBODY || watch.problem != problem) {
      LogInfo("share %s is not watched: %s", share.name.c_str(), problem.c_str());
    }
    watch.by = WatchedBy::NOBODY;
    watch.problem = problem;
    watch.tree.reset();
    watch.points.clear();
    return;
  }

  watch.can_hang = IsChangedElsewhere(mount->type);
  std::vector<std::string> points = mounts.PointsBelow(place.real);
  std::erase(points, place.real);
  const bool same_place = watch.by != WatchedBy::NOBODY && watch.place == place;
  if (!same_place || IsBroken(watch, same_folders, points)) {
    const bool in_the_same_way =
        same_place && watch.by == WatchedBy::FANOTIFY && groups.contains(place.device);
    watch.place = place;
    watch.moved = false;
    watch.problem.clear();
    watch.tree.reset();
    if (!in_the_same_way) {
      watch.next_try = Clock::now() + BETWEEN_TRIES;
      Begin(share, *mount, watch);
    }
    news.appeared.push_back(share.name);
  } else {
    if (!same_folders && had_folders) {
      news.changed.push_back(share.name);
    }
    std::vector<std::string> differing;
    std::set_symmetric_difference(points.begin(), points.end(), watch.points.begin(),
                                  watch.points.end(), std::back_inserter(differing));
    for (const std::string& point : differing) {
      news.mounts.emplace_back(share.name, PathBelow(share.path, BelowRoot(place.real, point)));
    }
    TryBetter(share, *mount, watch, news);
  }
  watch.points = std::move(points);
}

Watches::News Watches::Follow(const std::shared_ptr<const Settings>& in_force) {
  News news;
  settings = in_force;
  if (!mounts.Read()) {
    LogError("the mount table cannot be read: %m");
  }
  const std::string state_root = RealPath(settings->state_root);
  const Mount* own_mount = mounts.MountOf(state_root);
  own_device = own_mount != nullptr ? own_mount->device : "";
  own_within = own_mount != nullptr ? MountTable::PathWithin(*own_mount, state_root) : "";

  std::erase_if(
      shares, [this](const auto& known) { return settings->ShareByName(known.first) == nullptr; });
  for (const Share& share : settings->shares) {
    FollowShare(share, news);
  }
  DropUnusedGroups();
  return news;
}

// A group holds its device, which its users may want to take out.
void Watches::DropUnusedGroups() {
  std::set<std::string> used;
  for (const auto& [name, watch] : shares) {
    if (watch.by == WatchedBy::FANOTIFY) {
      used.insert(watch.place.device);
    }
  }
  std::erase_if(groups, [&used](const auto& group) { return !used.contains(group.first); });
}

std::vector<int> Watches::Descriptors() const {
  std::vector<int> descriptors;
  for (const auto& [device, group] : groups) {
    descriptors.push_back(group->Descriptor());
  }
  for (const auto& [name, watch] : shares) {
    if (watch.tree != nullptr) {
      descriptors.push_back(watch.tree->Descriptor());
    }
  }
  return descriptors;
}

bool Watches::IsAnyMissing() const {
  return std::any_of(shares.begin(), shares.end(), [](const auto& share) {
    return share.second.by == WatchedBy::NOBODY && !share.second.folders.empty();
  });
}

}  // namespace fileindexd
