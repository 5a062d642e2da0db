// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/query_fields.h"

#include <algorithm>
#include <string>

#include "base/ascii.h"
#include "index/edit_distance.h"
#include "index/letter_case.h"

namespace fileindexd {

namespace {

using F = QueryField;
using C = ContentField;

// The first name of a content's field is the one that is shown.
constexpr NamedField FIELDS[] = {
    {"name", F::NAME, {}},
    {"text", F::TEXT, {}},
    {"size", F::SIZE, {}},
    {"modified", F::MODIFIED, {}},
    {"added", F::ADDED, {}},
    {"near", F::NEAR, {}},
    {"kind", F::KIND, {}},
    {"ext", F::EXT, {}},
    {"path", F::PATH, {}},
    {"share", F::SHARE, {}},
    {"owner", F::OWNER, {}},
    {"under", F::UNDER, {}},
    {"is", F::IS, {}},
    {"has", F::HAS, {}},
    {"content", F::CONTENT, {}},
    {"title", F::TEXT_FIELD, C::TITLE},
    {"author", F::TEXT_FIELD, C::AUTHOR},
    {"subject", F::TEXT_FIELD, C::SUBJECT},
    {"description", F::TEXT_FIELD, C::DESCRIPTION},
    {"keywords", F::TEXT_FIELD, C::KEYWORDS},
    {"keyword", F::TEXT_FIELD, C::KEYWORDS},
    {"tag", F::TEXT_FIELD, C::KEYWORDS},
    {"from", F::TEXT_FIELD, C::FROM},
    {"to", F::TEXT_FIELD, C::TO},
    {"attachment", F::TEXT_FIELD, C::ATTACHMENTS},
    {"member", F::TEXT_FIELD, C::MEMBERS},
    {"artist", F::TEXT_FIELD, C::ARTIST},
    {"album", F::TEXT_FIELD, C::ALBUM},
    {"albumartist", F::TEXT_FIELD, C::ALBUM_ARTIST},
    {"genre", F::TEXT_FIELD, C::GENRE},
    {"composer", F::TEXT_FIELD, C::COMPOSER},
    {"codec", F::TEXT_FIELD, C::CODECS},
    {"camera", F::TEXT_FIELD, C::CAMERA},
    {"lens", F::TEXT_FIELD, C::LENS},
    {"caption", F::TEXT_FIELD, C::CAPTION},
    {"pages", F::NUMBER_FIELD, C::PAGES},
    {"created", F::NUMBER_FIELD, C::CREATED},
    {"sent", F::NUMBER_FIELD, C::SENT},
    {"taken", F::NUMBER_FIELD, C::TAKEN},
    {"recorded", F::NUMBER_FIELD, C::RECORDED},
    {"year", F::NUMBER_FIELD, C::YEAR},
    {"track", F::NUMBER_FIELD, C::TRACK},
    {"duration", F::NUMBER_FIELD, C::DURATION},
    {"bitrate", F::NUMBER_FIELD, C::BIT_RATE},
    {"width", F::NUMBER_FIELD, C::WIDTH},
    {"height", F::NUMBER_FIELD, C::HEIGHT},
    {"rating", F::NUMBER_FIELD, C::RATING},
};

}  // namespace

bool TakesRange(QueryField field) {
  return field == F::NUMBER_FIELD || field == F::SIZE || field == F::MODIFIED || field == F::ADDED;
}

bool TakesList(QueryField field) {
  return field == F::KIND || field == F::EXT || field == F::SHARE || field == F::OWNER;
}

const NamedField* FindField(std::string_view name) {
  for (const NamedField& field : FIELDS) {
    if (IsSameName(name, field.name)) {
      return &field;
    }
  }
  return nullptr;
}

const char* NearField(std::string_view name) {
  constexpr size_t SHORTEST = 4;
  if (name.size() < SHORTEST) {
    return nullptr;
  }
  std::string lower(name);
  std::transform(lower.begin(), lower.end(), lower.begin(), LowerLetter);
  const auto* const near = std::find_if(
      std::begin(FIELDS), std::end(FIELDS),
      [&lower](const NamedField& field) { return EditDistance(lower, field.name, 1) == 1; });
  return near == std::end(FIELDS) ? nullptr : near->name;
}

const char* FieldName(ContentField field) {
  for (const NamedField& named : FIELDS) {
    if ((named.field == F::TEXT_FIELD || named.field == F::NUMBER_FIELD) &&
        named.content == field) {
      return named.name;
    }
  }
  return "";
}

ValueForm FormOf(Column column, ContentField field) {
  switch (column) {
    case Column::SIZE:
      return ValueForm::BYTES;
    case Column::MODIFIED:
    case Column::ADDED:
      return ValueForm::NANOSECONDS;
    case Column::FIELD:
      break;
  }
  switch (field) {
    case C::CREATED:
    case C::SENT:
    case C::RECORDED:
      return ValueForm::SECONDS;
    case C::TAKEN:
      return ValueForm::CAMERA_TIME;
    case C::DURATION:
      return ValueForm::DURATION;
    case C::BIT_RATE:
      return ValueForm::BITS;
    case C::RATING:
      return ValueForm::RATING;
    default:
      return ValueForm::NUMBER;
  }
}

bool IsTime(ValueForm form) {
  return form == ValueForm::SECONDS || form == ValueForm::NANOSECONDS ||
         form == ValueForm::CAMERA_TIME;
}

bool IsTime(const NamedField& field) {
  return field.field == F::MODIFIED || field.field == F::ADDED ||
         (field.field == F::NUMBER_FIELD && IsTime(FormOf(Column::FIELD, field.content)));
}

}  // namespace fileindexd
