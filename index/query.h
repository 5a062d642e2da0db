// SPDX-License-Identifier: GPL-2.0-or-later
// A question as a tree: what its text means. The language is written down above the parser
// (query_parse.cpp), and for users in QUERY.md.
#pragma once

#include <cstdint>
#include <ctime>
#include <string>
#include <string_view>
#include <vector>

#include "base/content.h"
#include "index/query_error.h"

namespace fileindexd {

enum class Part : uint8_t {
  AND,
  OR,
  NOT,           // of one
  WORD,          // one word or several in a row
  NAME_PATTERN,  // of the whole name, with gaps
  EXACT_NAME,
  PATH,     // pieces of the whole path, with gaps
  SHARE,    // one of several
  RANGE,    // of a number that the entry or its content has
  NEAR,     // by where a photo was taken
  KIND,     // one of several
  EXT,      // one of several
  OWNER,    // by number
  UNDER,    // at or below a path
  IS,       // a property that has a name
  HAS,      // a field of the content that is there
  CONTENT,  // how far its reading has come
};

// Where a word is looked for.
enum class Scope : uint8_t {
  ANY,    // in the name and in all of the content
  NAME,   // the last component
  FIELD,  // one text field of the content
  TEXT,   // the text itself
};

// What a range is of, in the unit that is stored.
enum class Column : uint8_t {
  SIZE,      // bytes
  MODIFIED,  // nanoseconds since the epoch
  ADDED,     // the same: when the index first saw it
  FIELD,     // a number field
};

enum class Property : uint8_t { FILE, FOLDER, LINK, EMPTY, HIDDEN, DUPLICATE };
enum class ContentStage : uint8_t { WAITING, DONE, FAILED };
enum class Presence : uint8_t { CONTENT, TEXT, LOCATION, FIELD };

// Only the members of its part count.
struct QueryNode {
  Part part = Part::WORD;
  size_t start = 0;  // bytes of the question
  size_t end = 0;
  const char* shared_field = nullptr;  // in front of the brackets that it stands in; null: none
  std::vector<QueryNode> below;        // AND, OR: two at least

  // WORD, EXACT_NAME, UNDER
  std::string text;
  size_t text_at = 0;  // where it stands in the question
  Scope scope = Scope::ANY;
  bool is_phrase = false;
  bool is_beginning = false;                 // the last word may go on
  ContentField field = ContentField::TITLE;  // also of RANGE and HAS
  // NAME_PATTERN, PATH: the pieces follow each other; not anchored: anything may stand there
  std::vector<std::string> pieces;
  bool at_start = false;
  bool at_end = false;
  // RANGE, both inclusive
  Column column = Column::SIZE;
  int64_t lowest = INT64_MIN;
  int64_t highest = INT64_MAX;
  // NEAR
  double latitude = 0;
  double longitude = 0;
  double radius = 0;  // metres

  std::vector<std::string> names;  // EXT, SHARE; UNDER: one normal path
  std::vector<int64_t> numbers;    // KIND, OWNER
  Property property = Property::FILE;
  ContentStage stage = ContentStage::DONE;
  Presence presence = Presence::TEXT;
};

// `now`, seconds since the epoch, is what "today" and "-7d" count from; days are those of the local
// time zone. `text` is valid UTF-8. False when it makes no sense: the tree is then unchanged.
bool ParseQuery(const std::string& text, time_t now, QueryNode& query, QueryError& error);

// A tree as text, brackets around every group: for tests and for logs.
std::string QueryText(const QueryNode& query);

}  // namespace fileindexd
