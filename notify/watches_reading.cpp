// SPDX-License-Identifier: GPL-2.0-or-later
// What the watches tell, by share.
#include <cerrno>
#include <optional>
#include <string_view>

#include "notify/log.h"
#include "notify/watches.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

// Of one descriptor in one go: enough to keep up with the kernel, and the caller's other work is
// not kept waiting for more than some milliseconds.
constexpr int MOST_BUFFERS = 32;

constexpr uint32_t NAMES = CREATED | DELETED | MOVED_FROM | MOVED_TO;

// A path within the file system as a path of the share; none when it lies outside.
std::optional<std::string> InShare(const ShareWatch& watch, const std::string& path) {
  if (path.empty() || !Covers(watch.place.within, path)) {
    return std::nullopt;
  }
  std::string_view below = std::string_view(path).substr(watch.place.within.size());
  if (below.starts_with('/')) {
    below.remove_prefix(1);
  }
  return PathBelow(watch.place.root, below);
}

}  // namespace

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
    const int reason = errno;
    FindOtherNames(events, device, strays, reading);

    const bool overflown = events.TakeOverflow();
    for (auto& [name, watch] : shares) {
      if (overflown && watch.by == WatchedBy::FANOTIFY && watch.place.device == device) {
        ++watch.overflows;
        reading.overflown.push_back(name);
      }
    }
    if (result == FanGroup::Result::FAILED) {
      errno = reason;
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

}  // namespace fileindexd
