// SPDX-License-Identifier: GPL-2.0-or-later
// What was read out of one file: its kind, its fields, its text.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

#include "base/kind.h"

namespace fileindexd {

// Numbers are stored, and stand in helpers' answers: they never change. Those below
// FIRST_NUMBER_FIELD hold text, those from it on a number.
enum class ContentField : uint8_t {
  TITLE = 1,
  AUTHOR = 2,
  SUBJECT = 3,  // of a document or a message
  DESCRIPTION = 4,
  KEYWORDS = 5,  // of documents and photos; separated by ", "
  FROM = 6,
  TO = 7,           // cc and bcc too
  ATTACHMENTS = 8,  // names, one a line
  MEMBERS = 9,      // names of an archive's members, one a line
  ARTIST = 10,
  ALBUM = 11,
  ALBUM_ARTIST = 12,
  GENRE = 13,
  COMPOSER = 14,
  CODECS = 15,  // separated by ", "
  CAMERA = 16,
  LENS = 17,
  CAPTION = 18,

  PAGES = 64,
  CREATED = 65,   // seconds since the epoch; of a document
  SENT = 66,      // seconds since the epoch; of a message
  TAKEN = 67,     // seconds since the epoch, of a photo; a clock without zone counts as UTC
  RECORDED = 68,  // seconds since the epoch, of a video
  YEAR = 69,
  TRACK = 70,
  DURATION = 71,  // milliseconds
  BIT_RATE = 72,  // bits a second
  WIDTH = 73,     // pixels
  HEIGHT = 74,
  LATITUDE = 75,   // 1e-7 degrees, north positive
  LONGITUDE = 76,  // 1e-7 degrees, east positive
  RATING = 77,     // 0 to 5
};

constexpr ContentField FIRST_NUMBER_FIELD = ContentField::PAGES;
constexpr bool IsNumberField(ContentField field) {
  return field >= FIRST_NUMBER_FIELD;
}
constexpr size_t TEXT_FIELD_COUNT = 18;    // numbered from 1
constexpr size_t NUMBER_FIELD_COUNT = 14;  // numbered from FIRST_NUMBER_FIELD
// Of a number field, from 0.
constexpr size_t NumberPlace(ContentField field) {
  return static_cast<size_t>(field) - static_cast<size_t>(FIRST_NUMBER_FIELD);
}
// A field that this build knows.
constexpr bool IsContentField(uint8_t number) {
  const auto field = static_cast<ContentField>(number);
  return (number >= 1 && number <= TEXT_FIELD_COUNT) ||
         (IsNumberField(field) && NumberPlace(field) < NUMBER_FIELD_COUNT);
}

struct TextField {
  ContentField field = ContentField::TITLE;
  std::string text;  // valid UTF-8, not empty
};

struct NumberField {
  ContentField field = ContentField::PAGES;
  int64_t number = 0;
};

// Each field at most once.
struct Content {
  Kind kind = Kind::OTHER;  // as the content says; OTHER where it is nothing that is read
  std::vector<TextField> texts;
  std::vector<NumberField> numbers;
  std::string text;     // valid UTF-8, words separated by white space
  bool is_cut = false;  // there was more text than the cap takes
  uint64_t sample = 0;  // hash of the file's first, middle and last 64 KiB and its size
};

}  // namespace fileindexd
