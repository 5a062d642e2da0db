// SPDX-License-Identifier: GPL-2.0-or-later
// The names that stand in front of a colon in a question.
#pragma once

#include <optional>
#include <string_view>

#include "index/query.h"

namespace fileindexd {

enum class QueryField : uint8_t {
  NAME,
  TEXT,
  TEXT_FIELD,    // a text field of the content
  NUMBER_FIELD,  // a number field of the content
  SIZE,
  MODIFIED,
  ADDED,
  NEAR,
  KIND,
  EXT,
  PATH,
  SHARE,
  OWNER,
  UNDER,
  IS,
  HAS,
  CONTENT,
};

struct NamedField {
  const char* name;
  QueryField field;
  ContentField content;  // of TEXT_FIELD and NUMBER_FIELD
};

// Whether its values are compared: numbers, sizes and times.
bool TakesRange(QueryField field);
// Whether it takes several values with commas between.
bool TakesList(QueryField field);

// Letter case does not count. Null: no such field.
const NamedField* FindField(std::string_view name);
// The field's name that can be meant by `name`, which has at least four letters: it is one slip
// away. Null: none. What is shorter, or two slips away, is near to some field too often
// ("go:generate", "computer:7").
const char* NearField(std::string_view name);
// The name that users know a text or number field by.
const char* FieldName(ContentField field);

// How values of a number are written.
enum class ValueForm : uint8_t {
  NUMBER,
  RATING,
  BYTES,
  BITS,
  DURATION,
  SECONDS,
  NANOSECONDS,
  CAMERA_TIME
};
ValueForm FormOf(Column column, ContentField field);
bool IsTime(ValueForm form);
bool IsTime(const NamedField& field);  // whether its values are times

}  // namespace fileindexd
