// SPDX-License-Identifier: GPL-2.0-or-later
// The language of questions:
//
//   question  = any
//   any       = all { "OR" all }
//   all       = part { [ "AND" ] part }
//   part      = ( "-" | "NOT" ) part | "(" any ")" | field ":" ( value | "(" values ")" ) | words
//   values    = any    where each of words is a value of that field, and no other field stands
//   words     = '"' { character } '"' [ "*" ] | word
//   word      = characters up to a blank, or up to a ")" that closes a group; "*" at its end, and
//               nowhere else: what begins with it. In quotes it says nothing. At the end of a word
//               no bracket and no quote closes what the word has not opened
//   value     = word | pattern | '"' whole name '"'     of name
//             | pattern                                of path
//             | words                                  of text and of the text fields
//             | range | circle                         see query_values.h
//             | names { "," names }                    of kind, ext, owner, share
//             | path | property | presence | stage     of under, is, has, content
//   names     = word or quoted text: a name, or several with commas between
//   pattern   = word or quoted text, with "*" for anything; in name: anywhere but at a word's end
//               alone
//
// Behind a closing quote, or the "*" there, stands a blank, a ")", in a list a ",", or nothing.
// AND, OR and NOT count in capitals only; alone they are words. What stands before a colon and is
// no field belongs to the word, unless it can only be meant as one (query_slips.h). A word
// without a letter or a digit ("++") is looked for as it stands, in the name.
#include <algorithm>
#include <utility>

#include "index/query.h"
#include "index/query_names.h"
#include "index/query_parts.h"
#include "index/query_piece.h"
#include "index/query_slips.h"
#include "index/query_times.h"

namespace fileindexd {

namespace {

constexpr size_t MOST_BYTES = 4096;
constexpr size_t MOST_PARTS = 100;
constexpr int MOST_DEPTH = 50;

class Parser {
 public:
  Parser(const std::string& question, time_t moment, QueryError& failure)
      : text(question), now(moment), error(failure) {}

  bool Run(QueryNode& query);

 private:
  bool ReadAny(QueryNode& node, int depth);
  bool ReadAll(QueryNode& node, int depth);
  bool ReadPart(QueryNode& node, int depth);
  bool ReadGroup(QueryNode& node, int depth);
  bool ReadNot(QueryNode& node, size_t length, int depth);
  bool ReadFieldGroup(const NamedField& field, QueryNode& node, int depth);
  bool ReadLeaf(QueryNode& node, int depth);
  const NamedField* TakeField();

  void SkipBlanks();
  bool IsAt(std::string_view keyword) const;  // as a word of its own
  bool IsNegation() const;
  bool Fail(const std::string& what, size_t where);

  const std::string& text;
  time_t now;
  QueryError& error;
  size_t at = 0;
  int open = 0;                        // groups
  const NamedField* shared = nullptr;  // of all in the group that is open; null: each its own
  size_t leaves = 0;
};

void ShowExample(time_t now, QueryError& error) {
  if (error.example.empty()) {
    return;
  }
  QueryError wrong;
  QueryNode ignored;
  const std::string asked = "a " + error.example;  // alone, what leaves out is refused
  if (Parser(asked, now, wrong).Run(ignored)) {
    error.what.insert(error.example_at, ", as in " + Shortened(error.example));
  }
}

bool Parser::Fail(const std::string& what, size_t where) {
  error = {what, where};
  return false;
}

void Parser::SkipBlanks() {
  at = SkipBlanksAt(text, at);
}

bool Parser::IsAt(std::string_view keyword) const {
  const size_t end = at + keyword.size();
  return text.compare(at, keyword.size(), keyword) == 0 &&
         (end == text.size() || BlankAt(text, end) > 0 || text[end] == '(' ||
          (text[end] == ')' && open > 0));
}

// "-5" is no number: a minus in front says what not to find, but for "-7d" in the brackets of a
// time. "--" and "- " are signs.
bool Parser::IsNegation() const {
  if (shared != nullptr && IsTime(*shared) && BeginsWithAgo(std::string_view(text).substr(at))) {
    return false;
  }
  return text[at] == '-' && at + 1 < text.size() && BlankAt(text, at + 1) == 0 &&
         text[at + 1] != '-' && text[at + 1] != ')';
}

// Of what is not positive: the NOT that is alone. `is_side`: it is, or stands in, a side of an OR.
const QueryNode& FirstNegative(const QueryNode& node, bool& is_side) {
  if (node.part == Part::NOT) {
    return node;
  }
  is_side = is_side || node.part == Part::OR;
  return FirstNegative(*std::find_if_not(node.below.begin(), node.below.end(), IsPositive),
                       is_side);
}

bool Parser::Run(QueryNode& query) {
  if (text.size() > MOST_BYTES) {
    return Fail("the question is too long", MOST_BYTES);
  }
  if (const size_t zero = text.find('\0'); zero != std::string_view::npos) {
    return Fail("no name and no word holds this character", zero);
  }
  SkipBlanks();
  if (at == text.size()) {
    return Fail("nothing to search for", 0);
  }

  QueryNode read;
  const size_t end = NextBlank(text, at);
  const std::string_view first = std::string_view(text).substr(at, end - at);
  const bool is_alone = SkipBlanksAt(text, end) == text.size();
  if (is_alone && (first == "AND" || first == "OR" || first == "NOT")) {
    read.text = first;
    read.start = at;
    read.end = end;
  } else if (!ReadAny(read, 0)) {
    return false;
  }
  if (!IsPositive(read)) {
    bool is_side = false;
    const size_t where = FirstNegative(read, is_side).start;
    return Fail(is_side
                    ? "this side of OR says only what not to find; add to it what to find, as in "
                      "kind:document"
                    : "this says only what not to find; add what to find, as in kind:document",
                where);
  }
  query = std::move(read);
  return true;
}

bool Parser::ReadAny(QueryNode& node, int depth) {
  if (depth > MOST_DEPTH) {
    return Fail("too many brackets inside each other", at);
  }
  QueryNode any;
  any.part = Part::OR;
  while (true) {
    if (!ReadAll(any.below.emplace_back(), depth)) {
      return false;
    }
    if (at == text.size() || !IsAt("OR")) {
      break;
    }
    at += 2;
  }
  any.start = any.below.front().start;
  any.end = any.below.back().end;
  node = any.below.size() == 1 ? QueryNode(std::move(any.below.front())) : std::move(any);
  return true;
}

bool Parser::ReadAll(QueryNode& node, int depth) {
  QueryNode all;
  all.part = Part::AND;
  bool wants_more = true;
  while (true) {
    SkipBlanks();
    const bool ends = at == text.size() || (text[at] == ')' && open > 0) || IsAt("OR");
    if (ends && wants_more) {
      return Fail(at == text.size() ? "something to find is missing here"
                  : text[at] == ')' ? "something to find is missing in front of this bracket"
                                    : "OR stands between two things (the word stands in quotes: "
                                      "\"OR\")",
                  at);
    }
    if (ends) {
      break;
    }
    if (IsAt("AND")) {
      if (wants_more) {
        return Fail("AND stands between two things (the word stands in quotes: \"AND\")", at);
      }
      at += 3;
      wants_more = true;
      continue;
    }
    if (!ReadPart(all.below.emplace_back(), depth)) {
      return false;
    }
    wants_more = false;
  }
  all.start = all.below.front().start;
  all.end = all.below.back().end;
  node = all.below.size() == 1 ? QueryNode(std::move(all.below.front())) : std::move(all);
  return true;
}

bool Parser::ReadPart(QueryNode& node, int depth) {
  if (text[at] == '(') {
    return ReadGroup(node, depth);
  }
  if (text[at] == ')') {
    return Fail("this bracket closes nothing", at);
  }
  if (IsAt("NOT")) {
    return ReadNot(node, 3, depth);
  }
  return IsNegation() ? ReadNot(node, 1, depth) : ReadLeaf(node, depth);
}

bool Parser::ReadGroup(QueryNode& node, int depth) {
  const size_t start = at;
  ++at;
  ++open;
  if (!ReadAny(node, depth + 1)) {
    return false;
  }
  if (at == text.size()) {
    return Fail("this bracket is never closed", start);
  }
  ++at;
  --open;
  return true;
}

bool Parser::ReadNot(QueryNode& node, size_t length, int depth) {
  if (depth >= MOST_DEPTH) {
    return Fail("too many NOT inside each other", at);
  }
  QueryNode negation;
  negation.part = Part::NOT;
  negation.start = at;
  at += length;
  SkipBlanks();
  if (at == text.size() || IsAt("OR") || IsAt("AND") || (text[at] == ')' && open > 0)) {
    return Fail("NOT stands before something (the word stands in quotes: \"NOT\")", negation.start);
  }
  if (!ReadPart(negation.below.emplace_back(), depth + 1)) {
    return false;
  }
  negation.end = at;
  negation.shared_field = shared == nullptr ? nullptr : shared->name;
  node = std::move(negation);
  return true;
}

bool Parser::ReadFieldGroup(const NamedField& field, QueryNode& node, int depth) {
  shared = &field;
  const bool is_read = ReadGroup(node, depth);
  shared = nullptr;
  return is_read;
}

// The field in front of a colon, if it is one.
const NamedField* Parser::TakeField() {
  const std::string_view rest = std::string_view(text).substr(at);
  const size_t letters = LettersAtStart(rest);
  const bool has_colon = letters < rest.size() && rest[letters] == ':';
  const NamedField* field = has_colon ? FindField(rest.substr(0, letters)) : nullptr;
  at += field == nullptr ? 0 : letters + 1;
  return field;
}

bool Parser::ReadLeaf(QueryNode& node, int depth) {
  const size_t start = at;
  const NamedField* field = TakeField();
  if (field != nullptr && shared != nullptr) {
    return Fail(
        "no field stands within the brackets of another, " + std::string(shared->name) + ":( )",
        start);
  }
  if (field != nullptr && at < text.size() && text[at] == '(') {
    return ReadFieldGroup(*field, node, depth);
  }
  if (++leaves > MOST_PARTS) {
    return Fail("too many words", start);
  }
  if (field == nullptr) {
    QueryError slip = MeantOtherwise(std::string_view(text).substr(start));
    if (!slip.what.empty()) {
      slip.at = start;
      error = std::move(slip);
      return false;
    }
  }
  node.start = start;
  node.shared_field = shared == nullptr ? nullptr : shared->name;
  field = field == nullptr ? shared : field;
  PieceReader reader(text, at, open > 0, error);
  Value value;
  const bool is_list = field != nullptr && TakesList(field->field);
  if (is_list ? !reader.ReadList(value) : !reader.ReadOne(value)) {
    return false;
  }
  at = node.end = reader.at;
  return field == nullptr ? FillWords(value, node, error)
                          : FillField(*field, value, now, node, error);
}

}  // namespace

bool IsPositive(const QueryNode& node) {
  switch (node.part) {
    case Part::AND:
      return std::any_of(node.below.begin(), node.below.end(), IsPositive);
    case Part::OR:
      return std::all_of(node.below.begin(), node.below.end(), IsPositive);
    case Part::NOT:
      return false;
    default:
      return true;
  }
}

bool ParseQuery(const std::string& text, time_t now, QueryNode& query, QueryError& error) {
  if (Parser(text, now, error).Run(query)) {
    return true;
  }
  ShowExample(now, error);
  return false;
}

}  // namespace fileindexd
