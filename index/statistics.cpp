// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/statistics.h"

#include <algorithm>
#include <deque>
#include <utility>

#include "index/alike_files.h"
#include "index/statistics_scan.h"
#include "index/suspicion.h"

namespace fileindexd {

namespace {

std::vector<EntryGroup> Sorted(std::unordered_map<std::string, EntryGroup>& groups) {
  std::vector<EntryGroup> list;
  list.reserve(groups.size());
  for (auto& [key, group] : groups) {
    list.push_back(std::move(group));
  }
  std::sort(list.begin(), list.end(), IsGreater);
  return list;
}

// Groups of all shares. Folders of two shares stay apart, though their names may be alike.
class Merge {
 public:
  void Add(const std::string& share, bool by_share, GroupCounts& counts) {
    const std::string before = by_share ? share + '/' : "";
    for (auto& [name, group] : counts.groups) {
      std::string key = before;
      EntryGroup& sum = sums[key.append(name)];
      sum.share = by_share ? share : "";
      sum.name = group.name;
      sum.is_others = group.is_others;
      sum.entries += group.entries;
      sum.bytes = AddedBytes(sum.bytes, group.bytes);
    }
    counts.groups.clear();
  }

  std::unordered_map<std::string, EntryGroup> sums;
};

void KeepLargest(std::vector<LargeFile>& found, uint64_t wanted, std::vector<LargeFile>& largest) {
  largest.insert(largest.end(), std::make_move_iterator(found.begin()),
                 std::make_move_iterator(found.end()));
  std::sort(largest.begin(), largest.end(), IsLarger);
  largest.resize(std::min<size_t>(largest.size(), static_cast<size_t>(wanted)));
}

bool HasMoreBytes(const ShareTotals& a, const ShareTotals& b) {
  return a.bytes != b.bytes ? a.bytes > b.bytes : a.share < b.share;
}

}  // namespace

void Gather(const StatisticsWish& wish, Statistics& statistics) {
  Statistics made;
  Merge groups;
  Merge born;
  std::deque<OpenShare> shares;
  const bool needs_entries =
      wish.totals || wish.by.has_value() || wish.largest > 0 || wish.born_since.has_value();
  for (const Share& share : wish.shares) {
    OpenShare& open = shares.emplace_back(share);
    const bool with_contents = wish.duplicates || wish.by == GroupBy::KIND;
    if (!open.Open(with_contents, made.failures)) {
      shares.pop_back();
      continue;
    }

    StatisticsScan scan(wish, open);
    const int code = needs_entries ? scan.Run() : SQLITE_OK;
    if (code != SQLITE_OK) {
      TellWriter(share.name, FromSqlite(code));
      if (open.has_contents) {  // which may be to blame
        TellContentsWriter(share.name, FromSqlite(code));
      }
      made.failures.push_back("share " + share.name + ": " + IndexErrorText(FromSqlite(code)));
      shares.pop_back();
      continue;
    }
    made.answered += needs_entries || open.has_contents ? 1 : 0;
    groups.Add(share.name, wish.by == GroupBy::FOLDER, scan.groups);
    born.Add(share.name, true, scan.born);
    KeepLargest(scan.largest, wish.largest, made.largest);
    if (wish.totals) {
      made.totals.push_back(scan.totals);
    }
    if (!wish.duplicates) {
      shares.pop_back();
    }
  }

  made.groups = Sorted(groups.sums);
  made.born = Sorted(born.sums);
  std::sort(made.totals.begin(), made.totals.end(), HasMoreBytes);
  if (wish.duplicates) {
    FindAlikeFiles(shares, made.duplicates, made.failures);
  }
  statistics = std::move(made);
}

}  // namespace fileindexd
