// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/query_parts.h"

#include <pwd.h>

#include <algorithm>
#include <cerrno>
#include <charconv>
#include <iterator>
#include <optional>
#include <system_error>

#include "base/ascii.h"
#include "index/kind.h"
#include "index/letter_case.h"
#include "index/query_names.h"
#include "index/query_piece.h"
#include "index/query_values.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

// A share's name may hold commas: in quotes it is taken whole.
bool FillShare(const Value& value, QueryNode& node, QueryError& error) {
  node.part = Part::SHARE;
  for (const Value& part : value.listed) {
    for (const Value& name : part.is_quoted ? std::vector{part} : AtCommas(part)) {
      if (!IsValidShareName(name.text)) {
        return Fail(error, Cited(name.text) + " is no name of a share", name.at);
      }
      node.names.push_back(name.text);
    }
  }
  return true;
}

bool FillRange(Column column, const Value& value, time_t now, QueryNode& node, QueryError& error) {
  node.part = Part::RANGE;
  node.column = column;
  ValueRange range;
  std::string what;
  size_t at = 0;
  if (!ParseRange(value.text, FormOf(column, node.field), now, range, what, at)) {
    return Fail(error, what, value.at + at);
  }
  node.lowest = range.lowest;
  node.highest = range.highest;
  return true;
}

bool FillNear(const Value& value, QueryNode& node, QueryError& error) {
  Circle circle;
  std::string what;
  if (!ParseCircle(value.text, circle, what)) {
    return Fail(error, what, value.at);
  }
  node.part = Part::NEAR;
  node.latitude = circle.latitude;
  node.longitude = circle.longitude;
  node.radius = circle.radius;
  return true;
}

bool FillKind(const Value& value, QueryNode& node, QueryError& error) {
  node.part = Part::KIND;
  for (Value& name : NamesIn(value)) {
    std::string& text = name.text;
    std::transform(text.begin(), text.end(), text.begin(), LowerLetter);
    const std::optional<Kind> kind = KindFromText(text);
    if (!kind.has_value()) {
      return Fail(error,
                  Cited(text) + " is no kind: document, audio, video, photo, other or folder",
                  name.at);
    }
    node.numbers.push_back(static_cast<int64_t>(*kind));
  }
  return true;
}

// 0, or why it cannot be told. `number` is none when there is no such user.
int UserNumber(const std::string& name, std::optional<int64_t>& number) {
  uint32_t given = 0;
  const auto [end, failed] = std::from_chars(name.data(), name.data() + name.size(), given);
  if (failed == std::errc() && end == name.data() + name.size()) {
    number = given;
    return 0;
  }
  constexpr size_t MOST_ROOM = 1 << 20;
  passwd user{};
  passwd* found = nullptr;
  std::string room(16384, '\0');
  int code = getpwnam_r(name.c_str(), &user, room.data(), room.size(), &found);
  while (code == ERANGE && room.size() < MOST_ROOM) {
    room.resize(room.size() * 4);
    code = getpwnam_r(name.c_str(), &user, room.data(), room.size(), &found);
  }
  // Sources of users that do not know one say so in several ways.
  const bool is_unknown = code == ENOENT || code == ESRCH || code == EBADF || code == EPERM;
  number = found == nullptr ? std::nullopt : std::optional<int64_t>(user.pw_uid);
  return is_unknown ? 0 : code;
}

bool FillOwner(const Value& value, QueryNode& node, QueryError& error) {
  node.part = Part::OWNER;
  for (const Value& name : NamesIn(value)) {
    std::optional<int64_t> user;
    const int failed = UserNumber(name.text, user);
    if (failed != 0) {
      return Fail(error,
                  "cannot look up the user " + Cited(name.text) + ": " +
                      std::generic_category().message(failed) + "; a number needs none",
                  name.at);
    }
    if (!user.has_value()) {
      return Fail(error, "there is no user " + Cited(name.text), name.at);
    }
    node.numbers.push_back(*user);
  }
  return true;
}

bool FillUnder(const Value& value, QueryNode& node, QueryError& error) {
  const std::optional<std::string> path = NormalPath(value.text);
  if (!path.has_value()) {
    return Fail(error, Cited(value.text) + " is not a plain absolute path", value.at);
  }
  node.part = Part::UNDER;
  node.text = value.text;
  node.text_at = value.at;
  node.names = {*path};
  return true;
}

bool FillIs(const Value& value, QueryNode& node, QueryError& error) {
  constexpr const char* NAMES[] = {"file", "folder", "link", "empty", "hidden", "duplicate"};
  const auto* const name = std::find_if(std::begin(NAMES), std::end(NAMES), [&](const char* known) {
    return IsSameName(value.text, known);
  });
  if (name == std::end(NAMES)) {
    return Fail(error, "is: knows file, folder, link, empty, hidden and duplicate", value.at);
  }
  node.part = Part::IS;
  node.property = static_cast<Property>(name - std::begin(NAMES));
  return true;
}

bool FillHas(const Value& value, QueryNode& node, QueryError& error) {
  node.part = Part::HAS;
  constexpr const char* NAMES[] = {"content", "text", "location"};
  const auto* const name = std::find_if(std::begin(NAMES), std::end(NAMES), [&](const char* known) {
    return IsSameName(value.text, known);
  });
  if (name != std::end(NAMES)) {
    node.presence = static_cast<Presence>(name - std::begin(NAMES));
    return true;
  }
  const NamedField* field = FindField(value.text);
  if (field == nullptr ||
      (field->field != QueryField::TEXT_FIELD && field->field != QueryField::NUMBER_FIELD)) {
    return Fail(error,
                "has: knows content, text, location and the fields of contents, as in has:title",
                value.at);
  }
  node.presence = Presence::FIELD;
  node.field = field->content;
  return true;
}

bool FillContent(const Value& value, QueryNode& node, QueryError& error) {
  constexpr const char* NAMES[] = {"waiting", "done", "failed"};
  const auto* const name = std::find_if(std::begin(NAMES), std::end(NAMES), [&](const char* known) {
    return IsSameName(value.text, known);
  });
  if (name == std::end(NAMES)) {
    return Fail(error, "content: knows waiting, done and failed", value.at);
  }
  node.part = Part::CONTENT;
  node.stage = static_cast<ContentStage>(name - std::begin(NAMES));
  return true;
}

}  // namespace

bool FillField(const NamedField& field, const Value& value, time_t now, QueryNode& node,
               QueryError& error) {
  if (value.text.empty()) {
    return Fail(error, std::string(field.name) + ": needs a value right behind the colon",
                node.start);
  }
  const bool has_words = field.field == QueryField::NAME || field.field == QueryField::PATH ||
                         field.field == QueryField::TEXT || field.field == QueryField::TEXT_FIELD;
  if (value.has_star && !has_words) {
    return Fail(error, std::string(field.name) + ": takes no '*'", node.end - 1);
  }
  if (has_words && !BeginsAsWord(value, field.name, error)) {
    return false;
  }
  node.field = field.content;
  switch (field.field) {
    case QueryField::NAME:
      return FillName(value, node, error);
    case QueryField::TEXT:
      node.scope = Scope::TEXT;
      return FillWords(value, node, error);
    case QueryField::TEXT_FIELD:
      node.scope = Scope::FIELD;
      return FillWords(value, node, error);
    case QueryField::NUMBER_FIELD:
      return FillRange(Column::FIELD, value, now, node, error);
    case QueryField::SIZE:
      return FillRange(Column::SIZE, value, now, node, error);
    case QueryField::MODIFIED:
      return FillRange(Column::MODIFIED, value, now, node, error);
    case QueryField::ADDED:
      return FillRange(Column::ADDED, value, now, node, error);
    case QueryField::NEAR:
      return FillNear(value, node, error);
    case QueryField::KIND:
      return FillKind(value, node, error);
    case QueryField::EXT:
      return FillExt(value, node, error);
    case QueryField::PATH:
      return FillPath(value, node, error);
    case QueryField::SHARE:
      return FillShare(value, node, error);
    case QueryField::OWNER:
      return FillOwner(value, node, error);
    case QueryField::UNDER:
      return FillUnder(value, node, error);
    case QueryField::IS:
      return FillIs(value, node, error);
    case QueryField::HAS:
      return FillHas(value, node, error);
    case QueryField::CONTENT:
      return FillContent(value, node, error);
  }
  return Fail(error, "no such field", node.start);
}

}  // namespace fileindexd
