// SPDX-License-Identifier: GPL-2.0-or-later
#include "notify/watches.h"

#include <sys/stat.h>

#include <algorithm>
#include <climits>
#include <cstdlib>
#include <cstring>
#include <iterator>
#include <optional>
#include <set>
#include <string_view>

#include "notify/log.h"
#include "state/belonging.h"
#include "state/layout.h"
#include "state/open_path.h"

namespace fileindexd {

namespace {

// Of one descriptor in one go: enough to keep up with the kernel, and the caller's other work is
// not kept waiting for more than some milliseconds.
constexpr int MOST_BUFFERS = 32;

constexpr std::chrono::minutes BETWEEN_TRIES(10);

constexpr uint32_t NAMES = CREATED | DELETED | MOVED_FROM | MOVED_TO;

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

std::string Join(const std::string& root, std::string_view below) {
  if (below.empty()) {
    return root;
  }
  return (root == "/" ? root : root + '/') + std::string(below);
}

// A path within the file system as a path of the share; none when it lies outside.
std::optional<std::string> InShare(const ShareWatch& watch, const std::string& path) {
  if (path.empty() || !Covers(watch.place.within, path)) {
    return std::nullopt;
  }
  std::string_view below = std::string_view(path).substr(watch.place.within.size());
  if (below.starts_with('/')) {
    below.remove_prefix(1);
  }
  return Join(watch.place.root, below);
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
    if (watch.by == WatchedBy::INOTIFY) {
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
      news.mounts.emplace_back(share.name, Join(share.path, BelowRoot(place.real, point)));
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

void Watches::Tell(const std::string& device, const Change& change, const TellShare& tell,
                   Strays& strays, Reading& reading) {
  // By whatever path a share shows it: a line about our own writing would be the next writing.
  if (device == own_device && !change.path.empty() && Covers(own_within, change.path)) {
    return;
  }
  bool taken = false;
  for (auto& [name, watch] : shares) {
    if (watch.by != WatchedBy::FANOTIFY || watch.place.device != device) {
      continue;
    }
    const std::string& within = watch.place.within;
    if ((change.what & NAMES) != 0 && !change.path.empty() &&
        (Covers(change.path, within) || (!change.from.empty() && Covers(change.from, within)))) {
      // Even if it is back by the time of the look, changes may have been told of another path.
      watch.moved = true;
      reading.roots_moved = true;
    }

    const std::optional<std::string> path = InShare(watch, change.path);
    const std::optional<std::string> from = InShare(watch, change.from);
    if (path.has_value()) {
      taken |= tell(name, {change.what, change.directory, *path, from.value_or(""), change.target});
    } else if (from.has_value()) {
      taken |= tell(name, {MOVED_FROM, change.directory, *from, ""});
    }
  }
  if (!taken && !change.target.empty()) {
    strays.insert_or_assign(change.target, change.path);
  }
}

// Nearly all of what happens outside the shares is done to files of one name.
void Watches::FindOtherNames(const FanGroup& group, const std::string& device, const Strays& strays,
                             Reading& reading) {
  for (const auto& [target, path] : strays) {
    FanGroup::Target thing;
    if (!group.LookAtTarget(target, thing)) {
      LogDebug("device %s: a changed file cannot be looked at: %m", device.c_str());
      continue;
    }
    if (thing.links > 1 || (thing.links == 1 && !group.IsAt(path, thing))) {
      reading.unseen.push_back({device, thing.inode});
    }
  }
}

bool Watches::LookAtTarget(const std::string& share, const std::string& target,
                           FanGroup::Target& thing) const {
  const auto watch = shares.find(share);
  if (watch == shares.end() || watch->second.by != WatchedBy::FANOTIFY) {
    return false;
  }
  const auto group = groups.find(watch->second.place.device);
  return group != groups.end() && group->second->LookAtTarget(target, thing);
}

void Watches::ReadGroups(const TellShare& tell, Reading& reading) {
  for (auto group = groups.begin(); group != groups.end();) {
    const std::string& device = group->first;
    FanGroup& events = *group->second;
    FanGroup::Result result = FanGroup::Result::MORE;
    Strays strays;
    for (int n = 0; n < MOST_BUFFERS && result == FanGroup::Result::MORE; ++n) {
      result =
          events.Read([&](const Change& change) { Tell(device, change, tell, strays, reading); });
    }
    FindOtherNames(events, device, strays, reading);

    const bool overflown = events.TakeOverflow();
    for (auto& [name, watch] : shares) {
      if (overflown && watch.by == WatchedBy::FANOTIFY && watch.place.device == device) {
        ++watch.overflows;
        reading.overflown.push_back(name);
      }
    }
    if (result == FanGroup::Result::FAILED) {
      LogError("fanotify on device %s: reading failed: %m", device.c_str());
      reading.roots_moved = true;
      group = groups.erase(group);
      continue;
    }
    reading.all_read = reading.all_read && result == FanGroup::Result::EMPTY;
    ++group;
  }
}

void Watches::ReadTrees(const TellShare& tell, Reading& reading) {
  for (auto& entry : shares) {
    const std::string& name = entry.first;
    ShareWatch& watch = entry.second;
    if (watch.tree == nullptr) {
      continue;
    }
    TreeWatch::Result result = TreeWatch::Result::MORE;
    for (int n = 0; n < MOST_BUFFERS && result == TreeWatch::Result::MORE; ++n) {
      result = watch.tree->Read([&](const Change& change) {
        if ((change.what & NAMES) != 0 && Covers(change.path, watch.place.root)) {
          watch.moved = true;
          reading.roots_moved = true;
        }
        tell(name, change);
      });
    }
    if (watch.tree->TakeOverflow()) {
      ++watch.overflows;
      reading.overflown.push_back(name);
    }
    if (result == TreeWatch::Result::FAILED) {
      LogError("share %s: %s", name.c_str(), watch.tree->Error().c_str());
      watch.tree.reset();
      reading.roots_moved = true;
      continue;
    }
    reading.all_read = reading.all_read && result == TreeWatch::Result::EMPTY;
  }
}

Watches::Reading Watches::Read(const TellShare& tell) {
  Reading reading;
  ReadGroups(tell, reading);
  ReadTrees(tell, reading);
  return reading;
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
