// SPDX-License-Identifier: GPL-2.0-or-later
#include "ctl/stats_output.h"

#include <pwd.h>

#include <utility>

#include "base/utf8.h"
#include "ctl/output.h"
#include "ctl/terminal/cells.h"
#include "ctl/terminal/figures.h"
#include "ctl/terminal/table.h"

namespace fileindexd {

namespace {

constexpr std::pair<GroupBy, const char*> GROUPINGS[] = {
    {GroupBy::KIND, "kind"},     {GroupBy::EXTENSION, "ext"}, {GroupBy::OWNER, "owner"},
    {GroupBy::FOLDER, "folder"}, {GroupBy::AGE, "age"},
};

constexpr const char* ALIKE_NOTE =
    "probably alike, among files whose content is looked at: same size, same samples of beginning, "
    "middle and end; not compared in full";

// The user's name, or the number where there is none. One thread.
std::string UserName(const std::string& number) {
  // A number of the index's own: it converts.
  const auto id = static_cast<uid_t>(std::stoul(number));
  const passwd* user = getpwuid(id);  // NOLINT(concurrency-mt-unsafe): one thread
  return user == nullptr ? number : user->pw_name;
}

ShareTotals SumOf(const std::vector<ShareTotals>& shares) {
  ShareTotals sum;
  for (const ShareTotals& share : shares) {
    sum.files += share.files;
    sum.folders += share.folders;
    sum.links += share.links;
    sum.bytes = AddedBytes(sum.bytes, share.bytes);
  }
  return sum;
}

Json::Value TotalsObject(const ShareTotals& totals) {
  Json::Value object(Json::objectValue);
  object["files"] = static_cast<Json::UInt64>(totals.files);
  object["folders"] = static_cast<Json::UInt64>(totals.folders);
  object["links"] = static_cast<Json::UInt64>(totals.links);
  object["bytes"] = static_cast<Json::Int64>(totals.bytes);
  return object;
}

Json::Value GroupObject(const EntryGroup& group, GroupBy by) {
  Json::Value object(Json::objectValue);
  if (by == GroupBy::FOLDER) {
    object["share"] = ToUtf8(group.share);
  }
  if (group.is_others) {
    object["others"] = true;
  } else if (by == GroupBy::FOLDER) {
    SetPath(object, group.name);
  } else if (by == GroupBy::OWNER) {
    object["owner"] = static_cast<Json::UInt64>(std::stoul(group.name));
    SetPath(object, UserName(group.name), "name");
  } else {
    SetPath(object, group.name, "name");
  }
  object["entries"] = static_cast<Json::UInt64>(group.entries);
  object["bytes"] = static_cast<Json::Int64>(group.bytes);
  return object;
}

Json::Value GroupsList(const std::vector<EntryGroup>& groups, GroupBy by) {
  Json::Value list(Json::arrayValue);
  for (const EntryGroup& group : groups) {
    list.append(GroupObject(group, by));
  }
  return list;
}

Json::Value LargestList(const std::vector<LargeFile>& largest) {
  Json::Value list(Json::arrayValue);
  for (const LargeFile& file : largest) {
    Json::Value object(Json::objectValue);
    object["share"] = ToUtf8(file.share);
    SetPath(object, file.path);
    object["size"] = static_cast<Json::Int64>(file.size);
    object["mtime"] = static_cast<Json::Int64>(WholeSeconds(file.mtime));
    list.append(object);
  }
  return list;
}

uint64_t SetsLeftOut(const Duplicates& duplicates) {
  return duplicates.set_count - duplicates.sets.size();
}

Json::Value DuplicatesObject(const Duplicates& duplicates) {
  Json::Value sets(Json::arrayValue);
  for (const AlikeFiles& alike : duplicates.sets) {
    Json::Value set(Json::objectValue);
    set["size"] = static_cast<Json::Int64>(alike.size);
    set["files"] = static_cast<Json::UInt64>(alike.files);
    set["spare"] = static_cast<Json::Int64>(alike.Spare());
    set["places"] = Json::arrayValue;
    for (const AlikeFiles::Place& place : alike.places) {
      Json::Value item(Json::objectValue);
      item["share"] = ToUtf8(place.share);
      SetPath(item, place.path);
      set["places"].append(item);
    }
    sets.append(set);
  }
  Json::Value object(Json::objectValue);
  object["note"] = ALIKE_NOTE;
  object["set_count"] = static_cast<Json::UInt64>(duplicates.set_count);
  object["files"] = static_cast<Json::UInt64>(duplicates.files);
  object["spare"] = static_cast<Json::Int64>(duplicates.spare);
  object["sets"] = sets;
  object["sets_left_out"] = static_cast<Json::UInt64>(SetsLeftOut(duplicates));
  return object;
}

// Lines of everything that was asked for, part by part.
struct Lines {
  std::string Bytes(int64_t bytes) const {
    return screen.has_value() ? ShortSize(bytes) : std::to_string(bytes);
  }

  void PartFromLast() {
    if (!lines.empty()) {
      lines.emplace_back();
    }
  }

  void AddTable(const TableRow& headings, const std::vector<TableRow>& rows) {
    PartFromLast();
    for (std::string& line : TableLines(headings, rows, screen)) {
      lines.push_back(std::move(line));
    }
  }

  void AddTotals(const std::vector<ShareTotals>& shares) {
    std::vector<TableRow> rows;
    const auto add = [&](const ShareTotals& totals, const std::string& name) {
      rows.push_back({Bytes(totals.bytes), std::to_string(totals.files),
                      std::to_string(totals.folders), std::to_string(totals.links), name});
    };
    for (const ShareTotals& totals : shares) {
      add(totals, totals.share);
    }
    if (shares.size() > 1 && screen.has_value()) {
      add(SumOf(shares), "(all)");
    }
    AddTable({"BYTES", "FILES", "FOLDERS", "LINKS", "SHARE"}, rows);
  }

  void AddGroups(const std::vector<EntryGroup>& groups, GroupBy by, const char* heading) {
    std::vector<TableRow> rows;
    for (const EntryGroup& group : groups) {
      std::string name = group.name;
      if (by == GroupBy::OWNER && !group.is_others) {
        name = UserName(name);
      } else if (by == GroupBy::EXTENSION && name.empty()) {
        name = "(none)";
      }
      rows.push_back({Bytes(group.bytes), std::to_string(group.entries), name});
    }
    AddTable({"BYTES", "ENTRIES", heading}, rows);
  }

  void AddLargest(const std::vector<LargeFile>& largest) {
    std::vector<TableRow> rows;
    rows.reserve(largest.size());
    for (const LargeFile& file : largest) {
      rows.push_back({Bytes(file.size), LocalTime(WholeSeconds(file.mtime)), file.path});
    }
    AddTable({"BYTES", "MODIFIED", "PATH"}, rows);
  }

  void AddDuplicates(const Duplicates& duplicates) {
    PartFromLast();
    std::string text = std::to_string(duplicates.set_count) + " sets, " +
                       std::to_string(duplicates.files) + " files, " + Bytes(duplicates.spare) +
                       (screen.has_value() ? "" : " bytes") + " to spare; ";
    if (SetsLeftOut(duplicates) > 0) {
      text += std::to_string(SetsLeftOut(duplicates)) + " sets with less to spare left out; ";
    }
    text += ALIKE_NOTE;
    for (std::string& line : screen.has_value() ? WrappedLines(text, screen->columns)
                                                : std::vector<std::string>{text}) {
      lines.push_back(std::move(line));
    }
    for (const AlikeFiles& alike : duplicates.sets) {
      std::vector<TableRow> rows;
      for (const AlikeFiles::Place& place : alike.places) {
        rows.push_back({Bytes(alike.size), place.path});
      }
      if (alike.files > alike.places.size()) {
        rows.push_back(
            {Bytes(alike.size), std::to_string(alike.files - alike.places.size()) + " more"});
      }
      lines.emplace_back();  // sets are parted by an empty line
      for (std::string& line : TableLines({}, rows, screen)) {
        lines.push_back(std::move(line));
      }
    }
  }

  const std::optional<Screen>& screen;
  std::vector<std::string> lines = {};
};

}  // namespace

const char* GroupByText(GroupBy by) {
  for (const auto& [grouping, text] : GROUPINGS) {
    if (grouping == by) {
      return text;
    }
  }
  return "";
}

std::optional<GroupBy> GroupByFromText(const std::string& text) {
  for (const auto& [grouping, name] : GROUPINGS) {
    if (text == name) {
      return grouping;
    }
  }
  return std::nullopt;
}

Json::Value StatisticsObject(const StatisticsWish& wish, const Statistics& statistics) {
  Json::Value object(Json::objectValue);
  if (wish.totals) {
    object["shares"] = Json::arrayValue;
    for (const ShareTotals& totals : statistics.totals) {
      Json::Value item = TotalsObject(totals);
      item["name"] = ToUtf8(totals.share);
      object["shares"].append(item);
    }
    object["total"] = TotalsObject(SumOf(statistics.totals));
  }
  if (wish.by.has_value()) {
    object["by"] = GroupByText(*wish.by);
    object["groups"] = GroupsList(statistics.groups, *wish.by);
  }
  if (wish.largest > 0) {
    object["largest"] = LargestList(statistics.largest);
  }
  if (wish.duplicates) {
    object["duplicates"] = DuplicatesObject(statistics.duplicates);
  }
  if (wish.born_since.has_value()) {
    object["growth"]["since"] = static_cast<Json::Int64>(WholeSeconds(*wish.born_since));
    object["growth"]["folders"] = GroupsList(statistics.born, GroupBy::FOLDER);
  }
  return object;
}

std::vector<std::string> StatisticsLines(const StatisticsWish& wish, const Statistics& statistics,
                                         const std::optional<Screen>& screen) {
  Lines shown{screen};
  if (wish.totals) {
    shown.AddTotals(statistics.totals);
  }
  if (wish.by.has_value()) {
    constexpr const char* HEADINGS[] = {"KIND", "ENDING", "OWNER", "FOLDER", "AGE"};
    shown.AddGroups(statistics.groups, *wish.by, HEADINGS[static_cast<size_t>(*wish.by)]);
  }
  if (wish.largest > 0) {
    shown.AddLargest(statistics.largest);
  }
  if (wish.duplicates) {
    shown.AddDuplicates(statistics.duplicates);
  }
  if (wish.born_since.has_value()) {
    shown.AddGroups(statistics.born, GroupBy::FOLDER, "ADDED IN FOLDER");
  }
  return std::move(shown.lines);
}

}  // namespace fileindexd
