// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/statistics_scan.h"

#include <algorithm>
#include <utility>

#include "base/ascii.h"
#include "index/contents_reader.h"
#include "index/entry_table.h"
#include "index/schema.h"
#include "index/suspicion.h"
#include "state/sqlite.h"

namespace fileindexd {

namespace {

constexpr const char* OTHERS_KEY = " ";  // no group has that name
constexpr int64_t DAY = int64_t{24} * 60 * 60 * 1'000'000'000;

// Without a copy; good until the next step.
std::string_view View(const Statement& row, int column) {
  const void* bytes = sqlite3_column_blob(row.handle, column);
  const int size = sqlite3_column_bytes(row.handle, column);
  return bytes == nullptr ? std::string_view()
                          : std::string_view(static_cast<const char*>(bytes),
                                             static_cast<size_t>(std::max(size, 0)));
}

}  // namespace

bool OpenShare::Open(bool with_contents, std::vector<std::string>& failures) {
  const auto fail = [&](const char* what, IndexError error) {
    failures.push_back("share " + share.name + ": " + what + IndexErrorText(error));
  };
  if (EntryReader::IsMissing(share.name)) {
    return false;
  }
  const IndexError error = reader.OpenOnceMade(share.name);
  if (error != IndexError::NONE) {
    TellWriter(share.name, error);
    fail("", error);
    return false;
  }
  if (with_contents) {
    const IndexError attached = AttachContents(reader.database, share.name);
    has_contents = attached == IndexError::NONE;
    TellContentsWriter(share.name, attached);
    if (!has_contents && attached != IndexError::PATH_NOT_FOUND) {
      fail("contents: ", attached);
    }
  }

  transaction = std::make_unique<ReadTransaction>(reader.database.db);
  if (transaction->code != SQLITE_OK) {
    fail("", FromSqlite(transaction->code));
    return false;
  }
  return true;
}

std::string ExtensionOf(std::string_view path) {
  constexpr size_t LONGEST = 16;
  const std::string_view name = LastComponent(path);
  const size_t dot = name.rfind('.');
  if (dot == std::string_view::npos || dot == 0 || name.size() - dot - 1 > LONGEST ||
      name.find_first_of(" \t\n", dot) != std::string_view::npos) {
    return {};
  }
  return LowerText(name.substr(dot + 1));
}

const char* AgeName(int64_t mtime, int64_t now) {
  if (mtime > now) {
    return AGE_CLASSES[0].name;
  }
  const int64_t age = mtime < now - INT64_MAX / 2 ? INT64_MAX / 2 : now - mtime;
  const AgeClass* found = &AGE_CLASSES[1];
  while (found->days != INT64_MAX && age > found->days * DAY) {
    ++found;
  }
  return found->name;
}

bool IsGreater(const EntryGroup& a, const EntryGroup& b) {
  if (a.bytes != b.bytes) {
    return a.bytes > b.bytes;
  }
  if (a.entries != b.entries) {
    return a.entries > b.entries;
  }
  return a.name != b.name ? a.name < b.name : a.share < b.share;
}

bool IsLarger(const LargeFile& a, const LargeFile& b) {
  if (a.size != b.size) {
    return a.size > b.size;
  }
  return a.path != b.path ? a.path < b.path : a.share < b.share;
}

void GroupCounts::Add(std::string_view name, const CountedEntry& entry) {
  key = name;
  auto group = groups.find(key);
  if (group == groups.end()) {
    if (is_settled) {
      key = OTHERS_KEY;
    } else if (groups.size() >= 2 * MOST_GROUPS) {
      KeepGreatest();
    }
    group = groups.try_emplace(key).first;
    group->second.is_others = is_settled;
    group->second.name = is_settled ? OTHER_NAMES : key;
  }
  ++group->second.entries;
  group->second.bytes = AddedBytes(group->second.bytes, entry.is_further_name ? 0 : entry.size);
}

void GroupCounts::KeepGreatest() {
  std::vector<const EntryGroup*> order;
  order.reserve(groups.size());
  for (const auto& [name, group] : groups) {
    order.push_back(&group);
  }
  const auto least = order.begin() + static_cast<std::ptrdiff_t>(MOST_GROUPS);
  std::nth_element(order.begin(), least, order.end(),
                   [](const EntryGroup* a, const EntryGroup* b) { return IsGreater(*a, *b); });
  std::vector<std::string> gone;
  for (auto group = least; group != order.end(); ++group) {
    gone.push_back((*group)->name);
  }
  for (const std::string& name : gone) {
    groups.erase(name);
  }
  was_cut = true;
}

bool GroupCounts::Settle() {
  if (groups.size() > MOST_GROUPS) {
    KeepGreatest();
  }
  is_settled = true;
  for (auto& [name, group] : groups) {
    group.entries = was_cut ? 0 : group.entries;
    group.bytes = was_cut ? 0 : group.bytes;
  }
  return was_cut;
}

// The index by inode alone tells which have several entries; only those are looked up.
int StatisticsScan::FindFurtherNames() {
  Statement names;
  int code = names.Prepare(open.reader.database.db,
                           "SELECT entries.id, entries.inode, entries.birth_time"
                           " FROM (SELECT inode FROM entries GROUP BY inode HAVING count(*) > 1)"
                           " AS several CROSS JOIN entries ON entries.inode = several.inode"
                           " WHERE entries.thing <> 2"
                           " ORDER BY entries.inode, entries.birth_time, entries.path");
  if (code != SQLITE_OK) {
    return code;
  }

  std::pair<int64_t, int64_t> file;
  bool any = false;
  for (code = names.Step(); code == SQLITE_ROW; code = names.Step()) {
    const std::pair<int64_t, int64_t> next(names.Int(1), names.Int(2));
    if (any && next == file) {
      further_names.push_back(names.Int(0));
    }
    file = next;
    any = true;
  }
  std::sort(further_names.begin(), further_names.end());
  return StepError(code);
}

std::string StatisticsScan::EntriesSql() const {
  std::string kind = "kind";
  if (open.has_contents && wish.by == GroupBy::KIND) {
    kind =
        "CASE WHEN kind = 0 AND content_wanted = 1 THEN coalesce((SELECT found_kind"
        " FROM contents.files AS files WHERE " FILEINDEX_SAME_FILE "), 0) ELSE kind END";
  }
  return "SELECT id, path, thing, " + kind +
         ", owner, mtime, CASE birth_time WHEN 0 THEN first_seen ELSE birth_time END, size"
         " FROM entries ORDER BY id";
}

int StatisticsScan::Run() {
  totals.share = open.share.name;
  int code = FindFurtherNames();
  code = code == SQLITE_OK ? Walk(&StatisticsScan::Count) : code;
  counts_groups = groups.Settle();
  counts_born = born.Settle();
  return code == SQLITE_OK && (counts_groups || counts_born) ? Walk(&StatisticsScan::CountGroups)
                                                             : code;
}

int StatisticsScan::Walk(void (StatisticsScan::*count)(const CountedEntry& entry)) {
  Statement rows;
  int code = rows.Prepare(open.reader.database.db, EntriesSql().c_str());
  if (code != SQLITE_OK) {
    return code;
  }

  auto further = further_names.begin();
  for (code = rows.Step(); code == SQLITE_ROW; code = rows.Step()) {
    const int64_t id = rows.Int(0);
    CountedEntry entry{.path = View(rows, 1),
                       .thing = static_cast<Thing>(rows.Int(2)),
                       .kind = static_cast<Kind>(rows.Int(3)),
                       .owner = rows.Int(4),
                       .mtime = rows.Int(5),
                       .born = rows.Int(6),
                       .size = rows.Int(7)};
    entry.is_further_name = further != further_names.end() && *further == id;
    further += entry.is_further_name ? 1 : 0;
    (this->*count)(entry);
  }
  return StepError(code);
}

void StatisticsScan::Count(const CountedEntry& entry) {
  CountTotals(entry);
  CountGroups(entry);
  if (wish.largest > 0 && entry.thing == Thing::FILE && !entry.is_further_name) {
    CountLarge(entry);
  }
}

void StatisticsScan::CountGroups(const CountedEntry& entry) {
  if (counts_groups && wish.by.has_value()) {
    CountGroup(entry);
  }
  if (counts_born && wish.born_since.has_value() && entry.born >= *wish.born_since) {
    born.Add(FolderOf(entry), entry);
  }
}

void StatisticsScan::CountTotals(const CountedEntry& entry) {
  switch (entry.thing) {
    case Thing::FILE:
      ++totals.files;
      break;
    case Thing::DIRECTORY:
      ++totals.folders;
      break;
    case Thing::LINK:
      ++totals.links;
      break;
    case Thing::NONE:
      break;
  }
  totals.bytes = AddedBytes(totals.bytes, entry.is_further_name ? 0 : entry.size);
}

void StatisticsScan::CountGroup(const CountedEntry& entry) {
  const bool is_folder = entry.thing == Thing::DIRECTORY;
  switch (*wish.by) {
    case GroupBy::KIND:
      groups.Add(KindText(entry.kind), entry);
      break;
    case GroupBy::EXTENSION:
      if (!is_folder) {
        groups.Add(ExtensionOf(entry.path), entry);
      }
      break;
    case GroupBy::OWNER:
      groups.Add(std::to_string(entry.owner), entry);
      break;
    case GroupBy::FOLDER:
      groups.Add(FolderOf(entry), entry);
      break;
    case GroupBy::AGE:
      if (!is_folder) {
        groups.Add(AgeName(entry.mtime, wish.now), entry);
      }
      break;
  }
}

// The least of the largest stands in front.
void StatisticsScan::CountLarge(const CountedEntry& entry) {
  const bool is_full = largest.size() >= wish.largest;
  if (is_full && entry.size < largest.front().size) {
    return;
  }
  LargeFile file{open.share.name, std::string(entry.path), entry.size, entry.mtime};
  if (is_full) {
    if (!IsLarger(file, largest.front())) {
      return;
    }
    std::pop_heap(largest.begin(), largest.end(), IsLarger);
    largest.pop_back();
  }
  largest.push_back(std::move(file));
  std::push_heap(largest.begin(), largest.end(), IsLarger);
}

std::string_view StatisticsScan::FolderOf(const CountedEntry& entry) const {
  const std::string& root = open.share.path;
  const size_t first = root == "/" ? 1 : root.size() + 1;
  if (entry.path.size() <= first) {
    return root;
  }
  const size_t end = entry.path.find('/', first);
  if (end != std::string_view::npos) {
    return entry.path.substr(0, end);
  }
  return entry.thing == Thing::DIRECTORY ? entry.path : std::string_view(root);
}

}  // namespace fileindexd
