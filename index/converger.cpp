// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/converger.h"

#include <ctime>
#include <utility>

#include "index/disk_walk.h"

namespace fileindexd {

namespace {

// Comparing a new name with all others of its inode is quadratic in their number.
constexpr uint64_t MANY_LINKS = 1000;
constexpr size_t LOOKED_AT_LIMIT = 10000;

int64_t Now() {
  timespec now{};
  clock_gettime(CLOCK_REALTIME, &now);
  return static_cast<int64_t>(now.tv_sec) * 1'000'000'000 + now.tv_nsec;
}

bool Decides(Kind kind, const ContentFlags& decide) {
  return IsContentWanted(kind, decide);
}

Entry EntryOf(const std::string& path, const Look& look) {
  Entry entry;
  entry.path = path;
  entry.thing = look.thing;
  entry.inode = look.inode;
  entry.ctime = look.ctime;
  entry.birth_time = look.birth_time;
  entry.owner = look.owner;
  entry.group = look.group;
  entry.mode = look.mode;
  if (look.thing == Thing::DIRECTORY) {
    entry.kind = Kind::FOLDER;
    return entry;
  }

  entry.size = look.size;
  entry.mtime = look.mtime;
  entry.kind = look.thing == Thing::FILE ? KindOfName(LastComponent(path)) : Kind::OTHER;
  return entry;
}

bool IsOtherThing(const Entry& known, const Entry& seen) {
  return known.thing != seen.thing || known.inode != seen.inode ||
         (known.birth_time != 0 && seen.birth_time != 0 && known.birth_time != seen.birth_time);
}

// A directory's change time moves with every name in it, and is not worth a write.
bool IsSame(const Entry& known, const Entry& seen) {
  return known.thing == seen.thing && known.kind == seen.kind &&
         known.content_wanted == seen.content_wanted && known.inode == seen.inode &&
         known.size == seen.size && known.mtime == seen.mtime &&
         known.birth_time == seen.birth_time && known.owner == seen.owner &&
         known.group == seen.group && known.mode == seen.mode &&
         (known.ctime == seen.ctime || known.thing == Thing::DIRECTORY);
}

}  // namespace

IndexError Converger::Sql(int code) {
  sql_failed = code != SQLITE_OK;
  return FromSqlite(code);
}

IndexError Converger::CheckRoot() {
  switch (LookAtRoot(*share)) {
    case RootState::SOUND:
      return IndexError::NONE;
    case RootState::MISSING:
    case RootState::FOREIGN:
      mount_known = false;
      return IndexError::ROOT;
    case RootState::UNKNOWN:
      break;
  }
  mount_known = false;
  return IndexError::IO;
}

IndexError Converger::CheckMount(const Look& look) {
  if (mount_known && look.mount_id == mount_id && look.device == device) {
    return IndexError::NONE;
  }

  const IndexError error = CheckRoot();
  if (error == IndexError::NONE) {
    mount_known = true;
    mount_id = look.mount_id;
    device = look.device;
  }
  return error;
}

IndexError Converger::Refresh(const Settings& in_force, const Share& in_share,
                              const std::string& path, const ContentFlags& wanted,
                              const ContentFlags& decide, const Look* seen, bool added,
                              Below below) {
  added_path = added ? &path : nullptr;
  settings = &in_force;
  share = &in_share;
  sql_failed = false;
  other_paths.clear();
  const Look look = seen != nullptr ? *seen : LookAt(*settings, path);
  IndexError error = IndexError::NONE;
  switch (look.verdict) {
    case Verdict::BELONGS:
      error = Settle(path, look, wanted, decide, below);
      return error == IndexError::NONE ? SettleOtherPaths() : error;
    case Verdict::UNKNOWN:
      return IndexError::IO;
    case Verdict::BAD_PATH:
    case Verdict::NO_SHARE:
      return IndexError::NONE;
    default:
      break;
  }

  error = RemoveAt(path, look.verdict == Verdict::GONE);
  error = error == IndexError::NONE ? RemoveBelow(path, false) : error;
  return error == IndexError::NONE ? SettleOtherPaths() : error;
}

IndexError Converger::Settle(const std::string& path, const Look& look, const ContentFlags& wanted,
                             const ContentFlags& decide, Below below) {
  Outcome outcome = Outcome::SAME;
  IndexError error = Put(path, look, wanted, decide, outcome);
  const bool is_new = outcome == Outcome::NEW || outcome == Outcome::NEW_ABOVE;
  if (error == IndexError::NONE && look.links > 1 && look.thing == Thing::FILE &&
      outcome != Outcome::SAME) {
    error = NoteTwins(path, look, is_new);
  }
  if (error != IndexError::NONE) {
    return error;
  }

  const bool look_below = outcome == Outcome::REPLACED || outcome == Outcome::NEW_ABOVE;
  std::vector<std::string> walks;
  if (look_below && look.thing == Thing::DIRECTORY) {
    walks.push_back(path);
  }
  const bool is_known = look.thing == Thing::DIRECTORY && !is_new;
  // Without birth times, another directory with the inode of the old one looks the same.
  const bool doubtful = is_known && look.birth_time == 0;
  if (look_below || (is_known && below == Below::LOOKED_AT) || (doubtful && !IsLookedAt(path))) {
    error = LookBelow(path, walks);
  }
  for (size_t i = 0; i < walks.size() && error == IndexError::NONE; ++i) {
    error = AddBelow(walks[i]);
  }
  if (error == IndexError::NONE && doubtful) {
    if (looked_at.size() >= LOOKED_AT_LIMIT) {
      looked_at.clear();
    }
    if (!IsLookedAt(path)) {
      looked_at.insert(path);
    }
  }
  return error;
}

IndexError Converger::Put(const std::string& path, const Look& look, const ContentFlags& wanted,
                          const ContentFlags& decide, Outcome& outcome) {
  IndexError error = CheckMount(look);
  if (error != IndexError::NONE) {
    return error;
  }

  Entry known;
  bool found = false;
  bool has_below = false;
  error = Sql(table.FindOrBelow(path, known, found, has_below));
  if (error != IndexError::NONE) {
    return error;
  }
  if (found) {
    error = Change(known, look, wanted, decide, outcome);
    if (error != IndexError::NONE || outcome != Outcome::REPLACED) {
      return error;
    }
    Entry entry = EntryOf(path, look);
    entry.id = known.id;
    return NoteOtherPaths(entry, look);
  }

  outcome = has_below ? Outcome::NEW_ABOVE : Outcome::NEW;
  Entry entry = EntryOf(path, look);
  entry.first_seen = Now();
  entry.content_wanted = entry.thing == Thing::FILE && IsContentWanted(entry.kind, wanted);
  error = Sql(table.Insert(entry));
  entry.id = table.inserted;
  return error == IndexError::NONE ? NoteOtherPaths(entry, look) : error;
}

IndexError Converger::Change(const Entry& known, const Look& look, const ContentFlags& wanted,
                             const ContentFlags& decide, Outcome& outcome) {
  Entry seen = EntryOf(known.path, look);
  const bool replaced = IsOtherThing(known, seen);
  seen.id = known.id;
  seen.first_seen = replaced ? Now() : known.first_seen;
  if (seen.thing == Thing::FILE) {
    const bool anew = replaced || seen.kind != known.kind || Decides(seen.kind, decide);
    seen.content_wanted = anew ? IsContentWanted(seen.kind, wanted) : known.content_wanted;
  }

  outcome = Outcome::SAME;
  if (IsSame(known, seen)) {
    return IndexError::NONE;
  }
  // Even where size or mtime changed, too: whoever wrote may set them back before anybody follows.
  const bool reread = added_path != nullptr && known.path == *added_path && !replaced;
  seen.reread = replaced ? 0 : known.reread;
  const IndexError error = Sql(table.Update(seen, reread));
  if (error == IndexError::NONE) {
    outcome = replaced ? Outcome::REPLACED : Outcome::CHANGED;
  }
  return error;
}

// Other names of the file, whose rows tell something else. The number may also have been that of
// another thing, perhaps of a folder with much below it: each is settled like a former path.
IndexError Converger::NoteTwins(const std::string& path, const Look& look, bool is_new) {
  const bool too_many = is_new && look.links > MANY_LINKS;
  return too_many ? IndexError::NONE : Sql(table.StaleTwins(EntryOf(path, look), other_paths));
}

// Where the same thing is known under other paths, it may have been renamed. A link that was added
// or taken away changes the file's change time: paths that were seen with the present one are all
// still there, and a first index asks nothing of them. (A file system without birth times counts
// change times in whole seconds, which tell nothing.)
IndexError Converger::NoteOtherPaths(const Entry& entry, const Look& look) {
  const bool has_links = look.thing != Thing::DIRECTORY && look.links > 1;
  if (has_links && look.links > MANY_LINKS) {
    return IndexError::NONE;
  }
  const bool changed = has_links && look.birth_time != 0;
  return Sql(table.OtherPaths(entry, changed, other_paths));
}

// In the transaction that added the new path: whatever order a rename's events come in, nothing is
// found under both. The list grows while it is worked through (a row of files, each renamed to its
// neighbour's name), which a recursion would answer with its depth.
IndexError Converger::SettleOtherPaths() {
  IndexError error = IndexError::NONE;
  for (size_t i = 0; i < other_paths.size() && error == IndexError::NONE; ++i) {
    const std::string path = other_paths[i];
    Entry known;
    bool found = false;
    error = Sql(table.Find(path, known, found));
    if (error != IndexError::NONE || !found) {
      continue;
    }

    const Look look = LookAt(*settings, path);
    Outcome ignored = Outcome::SAME;
    if (look.verdict == Verdict::UNKNOWN) {
      error = IndexError::IO;
    } else if (look.verdict != Verdict::BELONGS) {
      error = RemoveAt(path, true);
      error = error == IndexError::NONE ? RemoveBelow(path, false) : error;
    } else if (IsOtherThing(known, EntryOf(path, look))) {
      error = Settle(path, look, settings->FolderOfPath(path)->wanted, {}, Below::KEPT);
    } else {
      error = Put(path, look, settings->FolderOfPath(path)->wanted, {}, ignored);
    }
    if ((i + 1) % SLICE == 0) {
      between();
    }
  }
  return error;
}

// The entries below, in byte order; what the step adds behind those that it was given is met too.
IndexError Converger::ForEachSliceBelow(const std::string& path, const SliceStep& step) {
  const PathRange range(path);
  std::string after = range.first;
  std::vector<Entry> rows;
  for (;;) {
    IndexError error = Sql(table.Slice(after, range.end, SLICE, rows));
    if (error == IndexError::NONE) {
      error = step(rows);
    }
    if (error != IndexError::NONE || rows.size() < SLICE) {
      return error;
    }
    after = rows.back().path;
    between();
  }
}

// Appends to `replaced` the directories below that are not the ones that were known.
IndexError Converger::LookBelow(const std::string& path, std::vector<std::string>& replaced) {
  return ForEachSliceBelow(
      path, [&](const std::vector<Entry>& rows) { return SettleSlice(rows, replaced); });
}

IndexError Converger::SettleSlice(const std::vector<Entry>& rows,
                                  std::vector<std::string>& replaced) {
  IndexError error = IndexError::NONE;
  std::vector<const Entry*> gone;
  for (const Entry& known : rows) {
    const Look look = LookAt(*settings, known.path);
    if (look.verdict == Verdict::UNKNOWN) {
      return IndexError::IO;
    }
    if (look.verdict != Verdict::BELONGS) {
      gone.push_back(&known);
      continue;
    }

    Outcome outcome = Outcome::SAME;
    error = CheckMount(look);
    if (error == IndexError::NONE) {
      error = Change(known, look, settings->FolderOfPath(known.path)->wanted, {}, outcome);
    }
    if (error != IndexError::NONE) {
      return error;
    }
    if (outcome == Outcome::REPLACED && look.thing == Thing::DIRECTORY) {
      replaced.push_back(known.path);
    }
  }

  if (!gone.empty()) {
    error = CheckRoot();
  }
  return error == IndexError::NONE ? Sql(table.RemoveAll(std::move(gone))) : error;
}

// Adds what is missing. What is known below has just been looked at.
IndexError Converger::AddBelow(const std::string& directory) {
  DiskWalk walk(*settings);
  walk.StartBelow(directory);
  std::string path;
  Look look;
  for (int count = 1;; ++count) {
    const DiskWalk::Step step = walk.Next(path, look);
    if (step != DiskWalk::Step::FOUND) {
      return step == DiskWalk::Step::END ? IndexError::NONE : IndexError::IO;
    }

    Outcome ignored = Outcome::SAME;
    const IndexError error = Put(path, look, settings->FolderOfPath(path)->wanted, {}, ignored);
    if (error != IndexError::NONE) {
      return error;
    }
    if (count % SLICE == 0) {
      between();
    }
  }
}

// Only subtrees that hold the path count: a second event for the same directory looks again.
bool Converger::IsLookedAt(const std::string& path) const {
  for (size_t slash = path.rfind('/'); slash != std::string::npos && slash != 0;
       slash = path.rfind('/', slash - 1)) {
    if (looked_at.contains(path.substr(0, slash))) {
      return true;
    }
  }
  return looked_at.contains("/");
}

}  // namespace fileindexd
