// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/compare.h"

#include <sys/resource.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <set>
#include <utility>

#include "index/disk_walk.h"
#include "index/entry_stream.h"
#include "index/entry_table.h"
#include "index/reader.h"
#include "index/suspicion.h"

namespace fileindexd {

namespace {

constexpr uint64_t ROOT_INTERVAL = 500;  // entries found left over, between two looks at the root

// Whether it was said that the share is to be gone on with although its folder is empty.
bool EmptyIsAccepted(StateStore& store, const std::string& share_name) {
  ShareStatus status;
  return store.GetStatus(share_name, status) && status.accept_empty;
}

// What this process lacks, and not the disk: it would be told of everything that follows.
bool IsOwnWant(int reason) {
  return reason == EMFILE || reason == ENFILE || reason == ENOMEM || reason == ENOSYS;
}

}  // namespace

bool IsStale(const Entry& entry, const Look& look) {
  if (entry.thing != look.thing) {
    return true;
  }
  if (look.thing == Thing::DIRECTORY) {
    return false;
  }
  const Kind kind = look.thing == Thing::FILE ? KindOfName(LastComponent(entry.path)) : Kind::OTHER;
  return entry.kind != kind || entry.inode != look.inode || entry.size != look.size ||
         entry.mtime != look.mtime || entry.birth_time != look.birth_time;
}

bool IsContentDue(const Entry& entry, const Look& look, const ContentFlags& wanted) {
  return look.thing == Thing::FILE && IsContentWanted(entry.kind, wanted);
}

struct Comparer::Side {
  explicit Side(std::shared_ptr<const Settings> in_force)
      : settings(std::move(in_force)), walk(*settings) {}

  std::shared_ptr<const Settings> settings;
  const Share* share = nullptr;
  EntryReader reader;
  EntryStream entries;
  DiskWalk walk;
  const Entry* entry = nullptr;  // the next one; null at the end
  bool on_disk = false;          // whether `path` and `look` hold the next thing
  std::string path;
  Look look;
  std::set<std::string> unreadable;  // that entries to come may lie at or below
};

Comparer::Comparer(StateStore& state, std::string compared_share)
    : store(state), share_name(std::move(compared_share)) {}
Comparer::~Comparer() = default;

bool Comparer::Refuse(const std::string& why) {
  error = why;
  return false;
}

bool Comparer::Start(const std::string& from) {
  side.reset();
  counts = {};
  position = from;
  left_over = 0;
  has_index = false;
  std::shared_ptr<const Settings> settings;
  if (!store.GetSettings(settings)) {
    return Refuse(store.Error());
  }
  auto opened = std::make_unique<Side>(settings);
  opened->share = settings->ShareByName(share_name);
  if (opened->share == nullptr) {
    return Refuse("no such share: " + share_name);
  }

  side = std::move(opened);
  if (!CheckRoot() || !OpenIndex() || !CheckRoot()) {
    side.reset();
    return false;
  }
  side->walk.StartAtFolders(*side->share, position);
  side->entries.Start(side->reader.database.db, position);
  if ((has_index && !NextEntry()) || !NextThing()) {
    side.reset();
    return false;
  }
  return true;
}

bool Comparer::OpenIndex() {
  const IndexError opened = side->reader.Open(share_name);
  has_index = opened == IndexError::NONE;
  if (has_index) {
    EntryReader::Summary summary;
    if (!side->reader.Summarise(summary)) {
      return RefuseUnreadable();
    }
    estimate = summary.entries;
    return true;
  }

  // Without a folder nothing belongs in an index.
  const auto& folders = side->settings->folders;
  const bool wants_none =
      std::none_of(folders.begin(), folders.end(),
                   [&](const IndexedFolder& folder) { return folder.share == share_name; });
  if (opened == IndexError::PATH_NOT_FOUND && (wants_none || missing_is_empty)) {
    estimate = 0;
    return true;
  }
  TellWriter(share_name, opened);
  return Refuse("share " + share_name + ": " + IndexErrorText(opened));
}

bool Comparer::RefuseUnreadable() {
  TellWriter(share_name, FromSqlite(sqlite3_errcode(side->reader.database.db)));
  return Refuse("share " + share_name + ": the index cannot be read");
}

// An unmounted disk must not be told as a thousand files that are gone. Where its empty mount point
// is what is on record, only that emptiness tells.
bool Comparer::CheckRoot() {
  const Share& share = *side->share;
  if (LookAtRoot(share) != RootState::SOUND) {
    return Refuse(share.path + ": " + IndexErrorText(IndexError::ROOT));
  }
  if (!has_index || !IsRootEmpty(share)) {
    return true;
  }

  EntryStream entries;
  entries.Start(side->reader.database.db, {});
  const Entry* entry = nullptr;
  do {
    if (!entries.Next(entry)) {
      return RefuseUnreadable();
    }
  } while (entry != nullptr && side->settings->FolderAt(entry->path) != nullptr);
  if (entry == nullptr || EmptyIsAccepted(store, share_name)) {
    return true;
  }
  return Refuse(share.path + ": the share's folder is empty, and the index is not");
}

Comparer::Result Comparer::Run(const Report& report, uint64_t most_paths) {
  if (side == nullptr) {
    return Result::FAILED;
  }
  going = true;
  for (uint64_t done = 0; side->entry != nullptr || side->on_disk; ++done) {
    if (!going || done == most_paths) {
      return Result::STOPPED;
    }
    if (!Step(report)) {
      side.reset();
      return Result::FAILED;
    }
  }

  // Unmounted meanwhile, everything may have looked gone, or missing.
  if (!CheckRoot()) {
    side.reset();
    return Result::FAILED;
  }
  return Result::DONE;
}

// Goes on with the smaller path of the two sides.
bool Comparer::Step(const Report& report) {
  const Entry* entry = side->entry;
  const int order = entry == nullptr ? 1 : !side->on_disk ? -1 : entry->path.compare(side->path);
  const std::string& path = order < 0 ? entry->path : side->path;
  if (order < 0 && !IsPassedOver(path) && !Tell(report, Difference::LEFT_OVER, path)) {
    return false;
  }
  if (order > 0 && !Tell(report, Difference::MISSING, path)) {
    return false;
  }
  if (order == 0) {
    const Look& look = side->look;
    if (IsStale(*entry, look) && !Tell(report, Difference::STALE, path)) {
      return false;
    }
    const bool due = IsContentDue(*entry, look, side->walk.folder->wanted);
    if (entry->content_wanted != due && !Tell(report, Difference::CONTENT, path)) {
      return false;
    }
  }

  position = path;
  ++counts.compared;
  return (order > 0 || NextEntry()) && (order < 0 || NextThing());
}

bool Comparer::Tell(const Report& report, Difference difference, const std::string& path) {
  if (difference == Difference::LEFT_OVER && left_over++ % ROOT_INTERVAL == 0 && !CheckRoot()) {
    return false;
  }
  ++counts.differences;
  const Thing known = difference == Difference::MISSING ? Thing::NONE : side->entry->thing;
  const Thing seen = difference == Difference::LEFT_OVER ? Thing::NONE : side->look.thing;
  going = report({difference, path, known, seen}) && going;
  return true;
}

bool Comparer::NextEntry() {
  if (!side->entries.Next(side->entry)) {
    return RefuseUnreadable();
  }
  counts.entries += side->entry != nullptr ? 1 : 0;
  return true;
}

bool Comparer::NextThing() {
  DiskWalk::Step step = side->walk.Next(side->path, side->look);
  while (step == DiskWalk::Step::FAILED) {
    if (!PassOver(errno)) {
      return false;
    }
    step = side->walk.Next(side->path, side->look);
  }
  side->on_disk = step == DiskWalk::Step::FOUND;
  counts.seen += side->on_disk ? 1 : 0;
  return true;
}

// Notes what the walk could not look at. Without the root there is nothing to compare with.
bool Comparer::PassOver(int reason) {
  const std::string text = strerror(reason);  // NOLINT: glibc's is safe
  if (side->path == side->share->path || IsOwnWant(reason)) {
    return Refuse("cannot look at " + side->path + ": " + text);
  }
  if (counts.unreadable++ == 0) {
    counts.first_unreadable = side->path;
    counts.unreadable_reason = text;
  }
  // Of what lies before the next entry, no entry is asked for any more.
  if (side->entry != nullptr && !PathRange(side->path).EndsBefore(side->entry->path)) {
    side->unreadable.insert(side->path);
  }
  return true;
}

// Whether an entry that the walk did not meet stands at or below what could not be looked at. Asked
// in order of the paths: what no later path lies below is forgotten.
bool Comparer::IsPassedOver(const std::string& path) {
  std::set<std::string>& unreadable = side->unreadable;
  while (!unreadable.empty() && PathRange(*unreadable.begin()).EndsBefore(path)) {
    unreadable.erase(unreadable.begin());
  }
  if (unreadable.empty()) {
    return false;
  }
  for (size_t end = path.size(); end != 0 && end != std::string::npos;
       end = path.rfind('/', end - 1)) {
    if (unreadable.contains(path.substr(0, end))) {
      return true;
    }
  }
  return false;
}

uint64_t Comparer::Estimate() const {
  return std::max(estimate, counts.compared);
}

const char* DifferenceText(Difference difference) {
  switch (difference) {
    case Difference::MISSING:
      return "missing";
    case Difference::LEFT_OVER:
      return "left-over";
    case Difference::STALE:
      return "stale";
    case Difference::CONTENT:
      return "content";
  }
  return "";
}

bool CompareShare(StateStore& store, const std::string& share_name,
                  const std::function<bool(Difference, const std::string& path)>& report,
                  Comparison& result, std::string& error) {
  Comparer comparer(store, share_name);
  const auto tell = [&](const Found& found) { return report(found.difference, found.path); };
  if (!comparer.Start() || comparer.Run(tell) == Comparer::Result::FAILED) {
    error = comparer.Error();
    return false;
  }
  result = comparer.counts;
  return true;
}

void WorkAtIdle() {
  constexpr int IOPRIO_WHO_PROCESS = 1;
  constexpr int IOPRIO_IDLE = 3 << 13;
  constexpr int LOWEST = 19;
  // Numbers of threads, whose priorities are their own on Linux. What a container forbids is not
  // missed: the work is then done at the priority that there is.
  (void)setpriority(PRIO_PROCESS, static_cast<id_t>(gettid()), LOWEST);
  (void)syscall(SYS_ioprio_set, IOPRIO_WHO_PROCESS, gettid(), IOPRIO_IDLE);
}

}  // namespace fileindexd
