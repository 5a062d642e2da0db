// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/row_sql.h"

#include <optional>
#include <string_view>
#include <vector>

#include "index/candidate.h"
#include "index/contents_schema.h"
#include "index/entry_table.h"
#include "index/schema.h"

namespace fileindexd {

namespace {

// What every answer has to fulfil.
std::vector<const QueryNode*> Conditions(const QueryNode& tree) {
  std::vector<const QueryNode*> all;
  if (tree.part == Part::AND) {
    for (const QueryNode& below : tree.below) {
      all.push_back(&below);
    }
  } else {
    all.push_back(&tree);
  }
  return all;
}

std::string Blob(std::string_view bytes) {
  constexpr std::string_view DIGITS = "0123456789abcdef";
  std::string text = "x'";
  for (const char c : bytes) {
    const auto byte = static_cast<unsigned char>(c);
    text += DIGITS[byte >> 4];
    text += DIGITS[byte & 15];
  }
  return text + "'";
}

std::string Between(const std::string& column, int64_t lowest, int64_t highest) {
  std::string sql;
  if (lowest != INT64_MIN) {
    sql += " AND " + column + " >= " + std::to_string(lowest);
  }
  if (highest != INT64_MAX) {
    sql += " AND " + column + " <= " + std::to_string(highest);
  }
  return sql;
}

std::string ColumnOf(ContentField field) {
  return "files." + ColumnAt(NUMBER_COLUMNS, NumberPlace(field));
}

std::string OfEntry(const QueryNode& node) {
  switch (node.part) {
    case Part::RANGE:
      return node.column == Column::SIZE
                 ? " AND entries.thing <> 2" + Between("entries.size", node.lowest, node.highest)
             : node.column == Column::MODIFIED
                 ? " AND entries.thing <> 2" + Between("entries.mtime", node.lowest, node.highest)
             : node.column == Column::ADDED
                 ? Between("entries.first_seen", node.lowest, node.highest)
                 : "";
    case Part::UNDER: {
      const PathRange range(node.names.front());
      return " AND " + AtOrBelowSql(Blob(range.at), Blob(range.first), Blob(range.end));
    }
    case Part::OWNER: {
      std::string numbers;
      for (const int64_t number : node.numbers) {
        numbers += (numbers.empty() ? "" : ", ") + std::to_string(number);
      }
      return " AND entries.owner IN (" + numbers + ")";
    }
    default:
      return "";
  }
}

// A degree of latitude is about as long everywhere; one of longitude only near the equator.
std::string NearSql(const QueryNode& node) {
  constexpr double METRES = 110'000;  // in a degree, at least
  constexpr double STORED = 1e7;
  const auto lowest = static_cast<int64_t>((node.latitude - node.radius / METRES) * STORED);
  const auto highest = static_cast<int64_t>((node.latitude + node.radius / METRES) * STORED);
  return " AND files.latitude BETWEEN " + std::to_string(lowest) + " AND " +
         std::to_string(highest) + " AND files.longitude IS NOT NULL";
}

// None: rows of files do not help, as what answers may have none.
std::optional<std::string> OfFile(const QueryNode& node) {
  switch (node.part) {
    case Part::RANGE:
      if (node.column == Column::FIELD) {
        const std::string column = ColumnOf(node.field);
        return " AND " + column + " IS NOT NULL" + Between(column, node.lowest, node.highest);
      }
      return std::nullopt;
    case Part::NEAR:
      return NearSql(node);
    case Part::HAS:
      return node.presence == Presence::CONTENT    ? " AND files.state <> 0"
             : node.presence == Presence::TEXT     ? " AND files.text <> 0"
             : node.presence == Presence::LOCATION ? " AND files.latitude IS NOT NULL"
             : IsNumberField(node.field)
                 ? " AND " + ColumnOf(node.field) + " IS NOT NULL"
                 : " AND files.fields >> " + std::to_string(static_cast<int>(node.field)) + " & 1";
    case Part::CONTENT:
      return node.stage == ContentStage::WAITING  ? std::nullopt
             : node.stage == ContentStage::FAILED ? std::optional(" AND files.state >= 2")
                                                  : std::optional(" AND files.state = 1");
    case Part::IS:
      return node.property == Property::DUPLICATE
                 ? std::optional(
                       " AND (files.sample, files.size) IN (SELECT sample, size FROM "
                       "contents.files WHERE sample <> 0 GROUP BY sample, size HAVING count(*) > "
                       "1)")
                 : std::nullopt;
    default:
      return std::nullopt;
  }
}

}  // namespace

std::string RowsSql(const QueryNode& tree, bool has_contents) {
  std::string of_entry;
  std::string of_file;
  bool by_file = false;
  for (const QueryNode* node : Conditions(tree)) {
    of_entry += OfEntry(*node);
    const std::optional<std::string> file = OfFile(*node);
    by_file = by_file || file.has_value();
    of_file += file.value_or("");
  }
  const std::string columns = "SELECT " FILEINDEX_ENTRY_COLUMNS " FROM ";
  return by_file && has_contents
             ? columns +
                   "contents.files AS files CROSS JOIN entries ON " FILEINDEX_WANTED_FILE
                   " WHERE 1" +
                   of_file + of_entry
             : columns + "entries WHERE 1" + of_entry;
}

std::string OrderedSql(SortBy sort) {
  switch (sort) {
    case SortBy::SCORE:
    case SortBy::NAME:
      return "";
    case SortBy::SIZE:
      return "SELECT " FILEINDEX_ENTRY_COLUMNS
             ", size FROM entries INDEXED BY entries_large WHERE " FILEINDEX_IS_LARGE
             " ORDER BY size DESC";
    case SortBy::MODIFIED:
      break;
  }
  // What is older than the first week has the key 0, like nothing at all.
  return "SELECT " FILEINDEX_ENTRY_COLUMNS ", " FILEINDEX_WEEK
         " FROM entries INDEXED BY entries_by_week WHERE mtime <> 0 AND " FILEINDEX_WEEK
         " > 0 ORDER BY " FILEINDEX_WEEK " DESC";
}

}  // namespace fileindexd
