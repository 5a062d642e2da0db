// SPDX-License-Identifier: GPL-2.0-or-later
#include "notify/gatherer.h"

#include <algorithm>
#include <string_view>

#include "base/event_codes.h"
#include "notify/look_lines.h"
#include "state/belonging.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;

constexpr milliseconds HOLD(50);    // a new file waits for its close
constexpr milliseconds GATHER(50);  // under load
constexpr size_t LOAD = 20;         // lines within GATHER
constexpr size_t BATCH_BYTES = 1 << 20;
constexpr seconds MODIFY_DELAY(1);
constexpr seconds MODIFY_INTERVAL(60);
constexpr size_t MODIFIED_BYTES = 4 << 20;  // paths of files held open that are remembered

constexpr size_t MOST_TARGETS = 4;  // of one path

constexpr uint32_t COMES_OR_GOES = CREATED | DELETED | MOVED_FROM | MOVED_TO;
constexpr uint32_t AT_ONCE = WRITTEN | DELETED | MOVED_FROM | MOVED_TO;

std::string_view FolderOf(std::string_view path) {
  return path.substr(0, path.rfind('/'));
}

}  // namespace

bool Gatherer::Belongs(const Settings& settings, const std::string& path) const {
  const Share* of_path = settings.ShareOfPath(path);
  return of_path != nullptr && of_path->name == share &&
         JudgeName(settings, path) == Verdict::BELONGS;
}

void Gatherer::Add(const Settings& settings, const Change& change, Time now) {
  const bool renamed = (change.what & MOVED_TO) != 0 && !change.from.empty();
  const bool here = Belongs(settings, change.path);
  const bool was_here = renamed && Belongs(settings, change.from);
  bool taken = here || was_here;
  if ((change.what & COMES_OR_GOES) != 0) {
    taken |= AddFoldersBelow(settings, change.path, now);
    taken |= renamed && AddFoldersBelow(settings, change.from, now);
  }

  if (here && was_here) {
    AddRename(change, now);
  } else if (here) {
    Pending& entry = Gather(change.path, change.what, change.directory, now);
    if (!change.target.empty()) {
      AddTarget(entry, change.target);
    }
  } else if (was_here) {
    Gather(change.from, DELETED, change.directory, now);
  }
  changes += taken ? 1 : 0;
}

bool Gatherer::AddFoldersBelow(const Settings& settings, const std::string& path, Time now) {
  if (!settings.HasFolderBelow(path)) {
    return false;
  }
  bool any = false;
  for (const IndexedFolder& folder : settings.folders) {
    if (folder.share == share && folder.path != path && Covers(path, folder.path)) {
      Gather(folder.path, MOVED_TO, true, now);
      any = true;
    }
  }
  return any;
}

void Gatherer::AddRename(const Change& change, Time now) {
  std::string origin = change.from;
  bool was_changed = false;
  std::vector<std::string> targets;
  const auto source = pending.find(change.from);
  if (source != pending.end() && !source->second.from.empty()) {
    origin = source->second.from;
    SetFrom(source->second, {});
    source->second.what |= MOVED_FROM;
  } else if (source != pending.end() && change.from != change.path) {
    was_changed = source->second.changed;
    targets = source->second.targets;
    Drop(source);  // the rename's line covers both paths
    ++folded;
  }

  // One that goes back to where it was is none.
  const std::string from = origin == change.path ? std::string() : origin;
  Pending& rename = Gather(change.path, change.what | MOVED_TO, change.directory, now);
  const std::string before = rename.from;
  SetFrom(rename, from);
  if (!before.empty() && before != from) {
    Gather(before, MOVED_FROM, change.directory, now);
  }
  rename.changed |= was_changed;
  for (const std::string& target : targets) {
    AddTarget(rename, target);
  }
}

void Gatherer::AddTarget(Pending& entry, const std::string& target) {
  if (std::find(entry.targets.begin(), entry.targets.end(), target) != entry.targets.end()) {
    return;
  }
  if (entry.targets.size() == MOST_TARGETS) {
    // One thing after the other is put there: the first is long gone from this path.
    bytes -= entry.targets.front().size();
    changed.push_back({{std::move(entry.targets.front())}, 0, 0});
    entry.targets.erase(entry.targets.begin());
  }
  entry.targets.push_back(target);
  bytes += target.size();
}

size_t Gatherer::BytesOf(const std::string& path, const Pending& entry) {
  size_t sum = path.size() + entry.from.size();
  for (const std::string& target : entry.targets) {
    sum += target.size();
  }
  return sum;
}

Gatherer::Pending& Gatherer::Gather(const std::string& path, uint32_t what, bool directory,
                                    Time now) {
  if ((what & (WRITTEN | DELETED)) != 0) {
    const auto held_open = modified.find(path);
    if (held_open != modified.end()) {
      modified_bytes -= path.size();
      modified.erase(held_open);
    }
  }

  const auto [at, is_new] = pending.try_emplace(path);
  Pending& entry = at->second;
  entry.what |= what;
  entry.directory |= directory;
  entry.changed |= !directory && (what & CHANGES_THING) != 0;
  if (is_new) {
    bytes += path.size();
    entry.first = now;
    entry.due = Time::max();
  } else {
    ++folded;
  }

  const Time due = std::min(entry.due, DueOf(path, entry, now));
  if (due != entry.due) {
    by_due.erase({entry.due, &at->first});
    by_due.emplace(due, &at->first);
    entry.due = due;
    CountIntoBatch(path.size(), due, now);
  }
  return entry;
}

void Gatherer::SetFrom(Pending& rename, const std::string& from) {
  bytes += from.size();
  bytes -= rename.from.size();
  rename.from = from;
}

void Gatherer::Drop(PendingMap::iterator dropped) {
  bytes -= BytesOf(dropped->first, dropped->second);
  by_due.erase({dropped->second.due, &dropped->first});
  pending.erase(dropped);
}

Gatherer::Time Gatherer::DueOf(const std::string& path, const Pending& entry, Time now) {
  if ((entry.what & AT_ONCE) != 0 || entry.directory) {
    return Soon(now);
  }
  if ((entry.what & CREATED) != 0) {
    // On a grid, or many links would cost a round of work each.
    const auto since =
        std::chrono::duration_cast<milliseconds>((entry.first + HOLD).time_since_epoch());
    return Time(since - since % 10);
  }
  if ((entry.what & ATTRIBUTES) != 0) {
    return Soon(now);
  }
  const auto last = modified.find(path);
  const Time delayed = entry.first + MODIFY_DELAY;
  return last == modified.end() ? delayed : std::max(delayed, last->second + MODIFY_INTERVAL);
}

Gatherer::Time Gatherer::Soon(Time now) {
  if (!IsBusy(now)) {
    return now;
  }
  if (batch_due <= now) {
    batch_due = now + GATHER;
    batch_bytes = 0;
  }
  return batch_due;
}

void Gatherer::CountIntoBatch(size_t length, Time due, Time now) {
  if (due != batch_due) {
    return;
  }
  batch_bytes += length;
  if (batch_bytes >= BATCH_BYTES && !batch_full.has_value()) {
    batch_full = now;
  }
}

bool Gatherer::IsBusy(Time now) const {
  return recent.size() == LOAD && now - recent.front() <= GATHER;
}

void Gatherer::NoteModify(const std::string& path, Time now) {
  if (modified_bytes + path.size() > MODIFIED_BYTES) {
    for (auto entry = modified.begin(); entry != modified.end();) {
      if (entry->second + MODIFY_INTERVAL > now) {
        ++entry;
        continue;
      }
      modified_bytes -= entry->first.size();
      entry = modified.erase(entry);
    }
    if (modified_bytes + path.size() > MODIFIED_BYTES) {
      return;  // it has a line each second then
    }
  }
  if (modified.insert_or_assign(path, now).second) {
    modified_bytes += path.size();
  }
}

std::vector<Gatherer::PendingMap::node_type> Gatherer::TakeUntil(Time until) {
  std::vector<PendingMap::node_type> taken;
  while (!by_due.empty() && by_due.begin()->first <= until) {
    taken.push_back(pending.extract(*by_due.begin()->second));
    by_due.erase(by_due.begin());
    bytes -= BytesOf(taken.back().key(), taken.back().mapped());
  }
  std::sort(taken.begin(), taken.end(), [](const auto& a, const auto& b) {
    const std::string_view folder_a = FolderOf(a.key());
    const std::string_view folder_b = FolderOf(b.key());
    return folder_a != folder_b ? folder_a < folder_b : a.key() < b.key();
  });
  return taken;
}

void Gatherer::PutBack(PendingMap::node_type&& entry) {
  bytes += BytesOf(entry.key(), entry.mapped());
  const auto back = pending.insert(std::move(entry)).position;
  by_due.emplace(back->second.due, &back->first);
}

void Gatherer::TakeDue(const Settings& settings, Time now, bool everything,
                       std::vector<QueueLine>& lines, Time deadline) {
  Time until = batch_full.has_value() ? std::max(now, batch_due) : now;
  until = everything ? Time::max() : until;
  if (until >= batch_due) {
    batch_due = {};
    batch_full.reset();
  }

  FolderView folder;
  for (auto& taken : TakeUntil(until)) {
    if (deadline != Time::max() && std::chrono::steady_clock::now() >= deadline) {
      PutBack(std::move(taken));
      continue;
    }
    const std::string& path = taken.key();
    const size_t before = lines.size();
    const Look look =
        LinesOfLook(settings, path, taken.mapped().what, taken.mapped().from, folder, lines);
    NoteChanged(taken.mapped(), look);
    folded += lines.size() == before ? 1 : 0;
    for (size_t i = before; i < lines.size(); ++i) {
      recent.push_back(now);
      if (lines[i].event == QLIB_NOTIFY_MODIFY) {
        NoteModify(lines[i].path, now);
      }
    }
    while (recent.size() > LOAD) {
      recent.pop_front();
    }
  }
}

// Without a handle, what is no longer at the path cannot be found; and the handle of what is there
// tells no more than the look, but nobody knows yet that it is that.
void Gatherer::NoteChanged(Pending& looked_at, const Look& look) {
  const bool is_there = look.verdict == Verdict::BELONGS && look.thing != Thing::DIRECTORY;
  if (!looked_at.targets.empty() || (looked_at.changed && is_there && look.links > 1)) {
    changed.push_back(
        {std::move(looked_at.targets), is_there ? look.inode : 0, is_there ? look.links : 0});
  }
}

std::optional<Gatherer::Time> Gatherer::NextDue() const {
  if (by_due.empty()) {
    return std::nullopt;
  }
  const Time due = by_due.begin()->first;
  return batch_full.has_value() ? std::min(due, *batch_full) : due;
}

void Gatherer::Clear() {
  by_due.clear();
  pending.clear();
  changed.clear();
  bytes = 0;
  batch_due = {};
  batch_full.reset();
}

}  // namespace fileindexd
