// SPDX-License-Identifier: GPL-2.0-or-later
#include "ctl/info_content.h"

#include <cstdio>

#include "ctl/output.h"
#include "index/contents_reader.h"
#include "index/kind.h"

namespace fileindexd {

namespace {

const char* FieldName(ContentField field) {
  switch (field) {
    case ContentField::TITLE:
      return "title";
    case ContentField::AUTHOR:
      return "author";
    case ContentField::SUBJECT:
      return "subject";
    case ContentField::DESCRIPTION:
      return "description";
    case ContentField::KEYWORDS:
      return "keywords";
    case ContentField::FROM:
      return "from";
    case ContentField::TO:
      return "to";
    case ContentField::ATTACHMENTS:
      return "attachments";
    case ContentField::MEMBERS:
      return "members";
    case ContentField::ARTIST:
      return "artist";
    case ContentField::ALBUM:
      return "album";
    case ContentField::ALBUM_ARTIST:
      return "album_artist";
    case ContentField::GENRE:
      return "genre";
    case ContentField::COMPOSER:
      return "composer";
    case ContentField::CODECS:
      return "codecs";
    case ContentField::CAMERA:
      return "camera";
    case ContentField::LENS:
      return "lens";
    case ContentField::CAPTION:
      return "caption";
    case ContentField::PAGES:
      return "pages";
    case ContentField::CREATED:
      return "created";
    case ContentField::SENT:
      return "sent";
    case ContentField::TAKEN:
      return "taken";
    case ContentField::RECORDED:
      return "recorded";
    case ContentField::YEAR:
      return "year";
    case ContentField::TRACK:
      return "track";
    case ContentField::DURATION:
      return "duration_ms";
    case ContentField::BIT_RATE:
      return "bit_rate";
    case ContentField::WIDTH:
      return "width";
    case ContentField::HEIGHT:
      return "height";
    case ContentField::LATITUDE:
      return "latitude";
    case ContentField::LONGITUDE:
      return "longitude";
    case ContentField::RATING:
      return "rating";
  }
  return "";
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

}  // namespace

EntryContent ContentOf(const std::string& share, const Entry& entry) {
  EntryContent content;
  ContentsReader reader;
  bool is_there = false;
  IndexError error = reader.Open(share);
  error = error == IndexError::NONE ? reader.LookFor(entry, is_there) : error;
  if (error != IndexError::NONE && error != IndexError::PATH_NOT_FOUND) {
    content.problem = IndexErrorText(error);
    return content;
  }
  content.is_known = true;
  if (!is_there) {
    content.state = "waiting";
    return content;
  }
  if (!reader.Find(entry, content.content, content.state, content.reason)) {
    content.is_known = false;
    content.problem = "cannot be read";
    return content;
  }
  ContentReading reading;
  (void)reader.FindReading(entry, reading);  // shown as none
  content.extractor = reading.extractor;
  content.tries = reading.tries;
  content.language = reader.Language();
  if (content.state == "done" && content.extractor == 0) {
    content.reason = "nothing is kept of a kind that is not wanted";
  }
  return content;
}

Json::Value ContentObject(const EntryContent& content) {
  if (!content.is_known) {
    return {};
  }
  Json::Value object(Json::objectValue);
  object["state"] = content.state;
  object["reason"] = content.reason;
  object["extractor"] = static_cast<Json::Int64>(content.extractor);
  object["tries"] = static_cast<Json::Int64>(content.tries);
  object["kind"] = KindText(content.content.kind);
  object["text_bytes"] = static_cast<Json::UInt64>(content.content.text.size());
  object["cut"] = content.content.is_cut;
  Json::Value& fields = object["fields"] = Json::Value(Json::objectValue);
  for (const TextField& field : content.content.texts) {
    fields[FieldName(field.field)] = field.text;
  }
  for (const NumberField& field : content.content.numbers) {
    fields[FieldName(field.field)] = IsPosition(field.field)
                                         ? Json::Value(Degrees(field.number))
                                         : Json::Value(static_cast<Json::Int64>(field.number));
  }
  return object;
}

std::vector<std::pair<std::string, std::string>> ContentLines(const EntryContent& content) {
  if (!content.problem.empty()) {
    return {{"problem", content.problem}};
  }
  if (!content.is_known) {
    return {};
  }
  std::vector<std::pair<std::string, std::string>> lines;
  lines.emplace_back("state",
                     content.state + (content.reason.empty() ? "" : ": " + content.reason));
  if (content.extractor != 0) {
    lines.emplace_back("read by", "version " + std::to_string(content.extractor));
  }
  if (content.tries != 0) {
    lines.emplace_back("tries", std::to_string(content.tries));
  }
  if (content.state == "waiting") {
    return lines;
  }
  lines.emplace_back("kind", KindText(content.content.kind));
  for (const TextField& field : content.content.texts) {
    lines.emplace_back(FieldName(field.field), field.text);
  }
  for (const NumberField& field : content.content.numbers) {
    lines.emplace_back(FieldName(field.field), NumberText(field));
  }
  lines.emplace_back("text", std::to_string(content.content.text.size()) + " bytes" +
                                 (content.content.is_cut ? ", and there is more" : ""));
  return lines;
}

}  // namespace fileindexd
