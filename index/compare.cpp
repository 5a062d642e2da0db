// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/compare.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <vector>

#include "index/disk_walk.h"
#include "index/entry_table.h"
#include "index/reader.h"
#include "index/schema.h"
#include "state/sqlite.h"

namespace fileindexd {

namespace {

constexpr int SLICE = 500;  // rows

// Entries in byte order of the paths, read in slices: a transaction that lasts as long as the walk
// would keep the writer's log from being cut.
class EntryStream {
 public:
  explicit EntryStream(sqlite3* opened) : db(opened) {}

  // False when reading failed. `entry` is null at the end.
  bool Next(const Entry*& entry) {
    if (next == rows.size() && !ended && !ReadSlice()) {
      return false;
    }
    entry = next == rows.size() ? nullptr : &rows[next++];
    return true;
  }

 private:
  bool ReadSlice() {
    const std::string after = rows.empty() ? "" : rows.back().path;
    Statement statement;
    if (statement.Prepare(db,
                          "SELECT " FILEINDEX_ENTRY_COLUMNS
                          " FROM entries WHERE path > ?1 ORDER BY path LIMIT ?2") != SQLITE_OK) {
      return false;
    }

    statement.BindBlob(1, after);
    statement.BindInt(2, SLICE);
    rows.clear();
    next = 0;
    int code = statement.Step();
    for (; code == SQLITE_ROW; code = statement.Step()) {
      ReadEntry(statement, rows.emplace_back());
    }
    ended = rows.size() < SLICE;
    return code == SQLITE_DONE;
  }

  sqlite3* db;
  std::vector<Entry> rows;
  size_t next = 0;
  bool ended = false;
};

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

// What compares one share; each step goes on with the smaller path of the two sides.
class ShareComparison {
 public:
  ShareComparison(const Settings& in_force, const Share& compared, sqlite3* db,
                  const std::function<bool(Difference, const std::string&)>& to_report,
                  Comparison& counted)
      : settings(in_force),
        share(compared),
        entries(db),
        walk(in_force),
        report(to_report),
        result(counted) {}

  bool Run(std::string& error) {
    walk.StartAtFolders(share);
    if (!NextEntry(error) || !NextThing(error)) {
      return false;
    }
    while (going && (entry != nullptr || on_disk)) {
      if (!Step(error)) {
        return false;
      }
    }
    return true;
  }

 private:
  bool Step(std::string& error) {
    const int order = entry == nullptr ? 1 : !on_disk ? -1 : entry->path.compare(path);
    if (order < 0) {
      return Report(Difference::LEFT_OVER, entry->path, error) && NextEntry(error);
    }
    if (order > 0) {
      return Report(Difference::MISSING, path, error) && NextThing(error);
    }

    if (IsStale(*entry, look) && !Report(Difference::STALE, path, error)) {
      return false;
    }
    const bool wanted = look.thing == Thing::FILE &&
                        IsContentWanted(entry->kind, settings.FolderOfPath(path)->wanted);
    if (entry->content_wanted != wanted && !Report(Difference::CONTENT, path, error)) {
      return false;
    }
    return NextEntry(error) && NextThing(error);
  }

  // An unmounted disk must not be told as a thousand files that are gone.
  bool Report(Difference difference, const std::string& at, std::string& error) {
    if (!going) {
      return true;
    }
    if (difference == Difference::LEFT_OVER && left_over++ % SLICE == 0 &&
        LookAtRoot(share) != RootState::SOUND) {
      error = RootError(share);
      return false;
    }
    ++result.differences;
    going = report(difference, at);
    return true;
  }

  bool NextEntry(std::string& error) {
    if (!entries.Next(entry)) {
      error = "the index cannot be read";
      return false;
    }
    result.entries += entry != nullptr ? 1 : 0;
    return true;
  }

  bool NextThing(std::string& error) {
    const DiskWalk::Step step = walk.Next(path, look);
    if (step == DiskWalk::Step::FAILED) {
      error = "cannot look at " + path + ": " + strerror(errno);  // NOLINT: glibc's is safe
      return false;
    }
    on_disk = step == DiskWalk::Step::FOUND;
    result.seen += on_disk ? 1 : 0;
    return true;
  }

 public:
  static std::string RootError(const Share& share) {
    return share.path + ": " + IndexErrorText(IndexError::ROOT);
  }

 private:
  const Settings& settings;
  const Share& share;
  EntryStream entries;
  DiskWalk walk;
  const std::function<bool(Difference, const std::string&)>& report;
  Comparison& result;
  const Entry* entry = nullptr;
  bool on_disk = false;
  std::string path;
  Look look;
  bool going = true;
  uint64_t left_over = 0;
};

}  // namespace

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
  std::shared_ptr<const Settings> settings;
  if (!store.GetSettings(settings)) {
    error = store.Error();
    return false;
  }
  const Share* share = settings->ShareByName(share_name);
  if (share == nullptr) {
    error = "no such share: " + share_name;
    return false;
  }
  if (LookAtRoot(*share) != RootState::SOUND) {
    error = ShareComparison::RootError(*share);
    return false;
  }

  EntryReader reader;
  const IndexError opened = reader.Open(share_name);
  const bool wants_none =
      std::none_of(settings->folders.begin(), settings->folders.end(),
                   [&](const IndexedFolder& folder) { return folder.share == share_name; });
  if (opened == IndexError::PATH_NOT_FOUND && wants_none) {
    result = {};
    return true;  // nothing belongs in an index, and there is none
  }
  if (opened != IndexError::NONE) {
    error = "share " + share_name + ": " + IndexErrorText(opened);
    return false;
  }

  Comparison counted;
  ShareComparison comparison(*settings, *share, reader.database.db, report, counted);
  if (!comparison.Run(error)) {
    return false;
  }
  // Unmounted meanwhile, everything may have looked gone, or missing.
  if (LookAtRoot(*share) != RootState::SOUND) {
    error = ShareComparison::RootError(*share);
    return false;
  }
  result = counted;
  return true;
}

}  // namespace fileindexd
