// SPDX-License-Identifier: GPL-2.0-or-later
#include "ctl/info_content.h"

#include <algorithm>
#include <cstdio>
#include <string_view>

#include "ctl/output.h"
#include "index/kind.h"
#include "index/query_fields.h"

namespace fileindexd {

namespace {

// As questions call it, so that what is shown may be asked for: but for positions, which near:
// compares, and milliseconds.
const char* ShownName(ContentField field) {
  switch (field) {
    case ContentField::DURATION:
      return "duration_ms";
    case ContentField::LATITUDE:
      return "latitude";
    case ContentField::LONGITUDE:
      return "longitude";
    default:
      return FieldName(field);
  }
}

bool IsTime(ContentField field) {
  return field == ContentField::CREATED || field == ContentField::SENT ||
         field == ContentField::TAKEN || field == ContentField::RECORDED;
}

bool IsPosition(ContentField field) {
  return field == ContentField::LATITUDE || field == ContentField::LONGITUDE;
}

double Degrees(int64_t number) {
  return static_cast<double>(number) / 1e7;
}

std::string NumberText(const NumberField& field) {
  if (field.field == ContentField::TAKEN) {
    return TimeOf(field.number, gmtime_r);  // what the camera's clock said
  }
  if (IsTime(field.field)) {
    return LocalTime(field.number);
  }
  if (IsPosition(field.field)) {
    char text[32];
    (void)snprintf(text, sizeof text, "%.7f", Degrees(field.number));
    return text;
  }
  return std::to_string(field.number);
}

using Lines = std::vector<std::pair<std::string, std::string>>;

void AddTextLines(const char* name, std::string_view text, size_t most, Lines& lines) {
  const auto count = static_cast<size_t>(std::count(text.begin(), text.end(), '\n')) + 1;
  const size_t shown = count > most ? most : count;
  for (size_t i = 0; i < shown; ++i) {
    const size_t end = text.find('\n');
    lines.emplace_back(i == 0 ? name : "", text.substr(0, end));
    text.remove_prefix(end == std::string_view::npos ? text.size() : end + 1);
  }
  if (shown < count) {
    lines.emplace_back("", "... and " + std::to_string(count - shown) + " more");
  }
}

}  // namespace

EntryContent ContentOf(const Share& share, const Entry& entry) {
  EntryContent content;
  StoredContent& stored = content.stored;
  ContentsReader reader;
  IndexError error = reader.Open(share.name);
  error = error == IndexError::NONE ? reader.Find(entry, stored) : error;
  if (error == IndexError::NONE && !reader.FindWordsProgress(share.language, content.words)) {
    error = IndexError::OTHER;
  }
  if (error != IndexError::NONE && error != IndexError::PATH_NOT_FOUND) {
    content.problem = IndexErrorText(error);
    return content;
  }
  content.is_known = true;
  if (stored.state == "done" && stored.extractor == 0) {
    stored.reason = "nothing is kept of a kind that is not wanted";
  }
  return content;
}

Json::Value ContentObject(const EntryContent& content) {
  if (!content.is_known) {
    return {};
  }
  const StoredContent& stored = content.stored;
  Json::Value object(Json::objectValue);
  object["state"] = stored.state;
  object["reason"] = stored.reason;
  object["extractor"] = static_cast<Json::Int64>(stored.extractor);
  object["tries"] = static_cast<Json::Int64>(stored.tries);
  object["kind"] = KindText(stored.content.kind);
  object["text_bytes"] = static_cast<Json::UInt64>(stored.content.text.size());
  object["cut"] = stored.content.is_cut;
  Json::Value& fields = object["fields"] = Json::Value(Json::objectValue);
  for (const TextField& field : stored.content.texts) {
    fields[ShownName(field.field)] = field.text;
  }
  for (const NumberField& field : stored.content.numbers) {
    fields[ShownName(field.field)] = IsPosition(field.field)
                                         ? Json::Value(Degrees(field.number))
                                         : Json::Value(static_cast<Json::Int64>(field.number));
  }
  return object;
}

std::vector<std::pair<std::string, std::string>> ContentLines(const EntryContent& content,
                                                              size_t most_of_field) {
  if (!content.problem.empty()) {
    return {{"problem", content.problem}};
  }
  if (!content.is_known) {
    return {};
  }
  const StoredContent& stored = content.stored;
  Lines lines;
  lines.emplace_back("state", stored.state + (stored.reason.empty() ? "" : ": " + stored.reason));
  if (stored.extractor != 0) {
    lines.emplace_back("read by", "version " + std::to_string(stored.extractor));
  }
  if (stored.tries != 0) {
    lines.emplace_back("tries", std::to_string(stored.tries));
  }
  if (stored.state == "waiting") {
    return lines;
  }
  lines.emplace_back("kind", KindText(stored.content.kind));
  for (const TextField& field : stored.content.texts) {
    AddTextLines(ShownName(field.field), field.text, most_of_field, lines);
  }
  for (const NumberField& field : stored.content.numbers) {
    lines.emplace_back(ShownName(field.field), NumberText(field));
  }
  lines.emplace_back("text", std::to_string(stored.content.text.size()) + " bytes" +
                                 (stored.content.is_cut ? ", and there is more" : ""));
  return lines;
}

}  // namespace fileindexd
