// SPDX-License-Identifier: GPL-2.0-or-later
#include <string>

#include "index/kind.h"
#include "index/query.h"
#include "index/query_fields.h"

namespace fileindexd {

namespace {

std::string Bound(int64_t value) {
  return value == INT64_MIN || value == INT64_MAX ? "" : std::to_string(value);
}

std::string WordText(const QueryNode& node) {
  std::string text = node.is_phrase ? "\"" + node.text + "\"" : node.text;
  text += node.is_beginning && node.is_phrase ? "*" : "";
  switch (node.scope) {
    case Scope::ANY:
      return text;
    case Scope::NAME:
      return "name:" + text;
    case Scope::TEXT:
      return "text:" + text;
    case Scope::FIELD:
      break;
  }
  return FieldName(node.field) + (":" + text);
}

std::string RangeText(const QueryNode& node) {
  const std::string column = node.column == Column::SIZE       ? "size"
                             : node.column == Column::MODIFIED ? "modified"
                             : node.column == Column::ADDED    ? "added"
                                                               : FieldName(node.field);
  return column + "[" + Bound(node.lowest) + ".." + Bound(node.highest) + "]";
}

std::string PatternText(const char* field, const QueryNode& node) {
  std::string text = std::string(field) + (node.at_start ? "" : "*");
  for (size_t i = 0; i < node.pieces.size(); ++i) {
    text += (i == 0 ? "" : "*") + node.pieces[i];
  }
  return text + (node.at_end ? "" : "*");
}

std::string ListText(const char* name, const QueryNode& node) {
  std::string text = std::string(name) + ":";
  for (size_t i = 0; i < node.names.size(); ++i) {
    text += (i == 0 ? "" : ",") + node.names[i];
  }
  for (size_t i = 0; i < node.numbers.size(); ++i) {
    text += i == 0 ? "" : ",";
    text += node.part == Part::KIND ? KindText(static_cast<Kind>(node.numbers[i]))
                                    : std::to_string(node.numbers[i]);
  }
  return text;
}

std::string GroupText(const QueryNode& node) {
  std::string text = "(";
  for (size_t i = 0; i < node.below.size(); ++i) {
    text += (i == 0 ? "" : node.part == Part::OR ? " OR " : " ") + QueryText(node.below[i]);
  }
  return text + ")";
}

}  // namespace

std::string QueryText(const QueryNode& node) {
  constexpr const char* PROPERTIES[] = {"file", "folder", "link", "empty", "hidden", "duplicate"};
  constexpr const char* STAGES[] = {"waiting", "done", "failed"};
  switch (node.part) {
    case Part::AND:
    case Part::OR:
      return GroupText(node);
    case Part::NOT:
      return "-" + QueryText(node.below.front());
    case Part::WORD:
      return WordText(node);
    case Part::NAME_PATTERN:
      return PatternText("name:", node);
    case Part::EXACT_NAME:
      return "name:\"" + node.text + "\"";
    case Part::PATH:
      return PatternText("path:", node);
    case Part::SHARE:
      return ListText("share", node);
    case Part::RANGE:
      return RangeText(node);
    case Part::NEAR:
      return "near:" + std::to_string(node.latitude) + "," + std::to_string(node.longitude) + "," +
             std::to_string(node.radius);
    case Part::KIND:
      return ListText("kind", node);
    case Part::EXT:
      return ListText("ext", node);
    case Part::OWNER:
      return ListText("owner", node);
    case Part::UNDER:
      return ListText("under", node);
    case Part::IS:
      return std::string("is:") + PROPERTIES[static_cast<size_t>(node.property)];
    case Part::HAS:
      return node.presence == Presence::CONTENT    ? "has:content"
             : node.presence == Presence::TEXT     ? "has:text"
             : node.presence == Presence::LOCATION ? "has:location"
                                                   : std::string("has:") + FieldName(node.field);
    case Part::CONTENT:
      break;
  }
  return std::string("content:") + STAGES[static_cast<size_t>(node.stage)];
}

}  // namespace fileindexd
