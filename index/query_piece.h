// SPDX-License-Identifier: GPL-2.0-or-later
// A word or a value of a question as it is written: bare, in quotes, or several with commas
// between.
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "index/query_error.h"

namespace fileindexd {

// The bytes of the blank at that byte, which parts words; 0: there is none, or the text ends.
size_t BlankAt(std::string_view text, size_t at);
// The first byte at or behind that one that is no blank, and the first that is one.
size_t SkipBlanksAt(std::string_view text, size_t at);
size_t NextBlank(std::string_view text, size_t at);

// How many letters of ASCII, as names of fields are made of, `text` begins with.
size_t LettersAtStart(std::string_view text);

// What stands behind a field's colon, or alone.
struct Value {
  std::string text;  // without its quotes
  size_t at = 0;     // byte of the question
  bool is_quoted = false;
  bool has_star = false;  // behind the quotes
  // Of a list, what stands in quotes and what stands bare in between, commas in it as well.
  std::vector<Value> listed;
};

class PieceReader {
 public:
  // Reads from that byte on. `in_brackets`: the first ')' that a bare word has not opened itself
  // stands behind it. The text stays as long as the reader.
  PieceReader(const std::string& question, size_t start, bool in_brackets, QueryError& failure)
      : at(start), text(question), is_inside(in_brackets), error(failure) {}

  // False when it makes no sense, and the error says why.
  bool ReadOne(Value& value);
  bool ReadList(Value& value);  // as one text without its quotes, and part by part

  size_t at;  // behind what was read

 private:
  bool ReadQuoted(Value& value);
  bool ReadBare(Value& value, bool in_list);
  bool EndsQuotes();
  bool IsAtQuote() const { return at < text.size() && text[at] == '"'; }
  bool Fail(const std::string& what, size_t where);

  const std::string& text;
  bool is_inside;
  QueryError& error;
};

// What stands between separators, in front of the first and behind the last: one at least.
std::vector<std::string> SplitAt(std::string_view text, char separator);
// The same of a value with commas, each with its place.
std::vector<Value> AtCommas(const Value& value);
// Of a list that was read: commas part in quotes as well.
std::vector<Value> NamesIn(const Value& list);

}  // namespace fileindexd
