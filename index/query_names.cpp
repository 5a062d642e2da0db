// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/query_names.h"

#include <algorithm>
#include <cstdio>
#include <utility>

#include "index/name_text.h"
#include "index/query_piece.h"
#include "index/text_characters.h"

namespace fileindexd {

namespace {

// Accents and what is not seen are of no account: alone they would stand in every name.
bool IsOfAccount(std::string_view text, size_t at, QueryError& error) {
  if (!NameFolder().Parts(text).empty()) {
    return true;
  }
  char code[16];
  (void)snprintf(code, sizeof code, "U+%04X", static_cast<unsigned>(CharacterAt(text, 0).code));
  return Fail(error,
              std::string(code) +
                  " alone is nothing to search for: accents and what is not seen do not count",
              at);
}

std::string WithoutStars(std::string text) {
  std::erase(text, '*');
  return text;
}

bool FillSign(const Value& value, QueryNode& node, QueryError& error) {
  if (value.text.find_first_not_of('*') == std::string::npos) {
    return Fail(error, "'*' needs something to begin with, as in rep*", value.at);
  }
  node.part = Part::NAME_PATTERN;
  node.pieces = {value.text.substr(0, value.text.find_last_not_of('*') + 1)};
  return IsOfAccount(WithoutStars(value.text), value.at, error);
}

// "*part*", "*.pdf", "a*b".
bool FillPattern(const Value& value, Part part, QueryNode& node, QueryError& error) {
  node.part = part;
  std::string letters;
  for (std::string& piece : SplitAt(value.text, '*')) {
    if (!piece.empty()) {
      letters += piece;
      node.pieces.push_back(std::move(piece));
    }
  }
  if (node.pieces.empty()) {
    return Fail(error, "'*' alone stands for everything; add a part, as in name:*part*", value.at);
  }
  return IsOfAccount(letters, value.at + value.text.find_first_not_of('*'), error);
}

bool HoldsNoSlash(const Value& value, QueryError& error) {
  const size_t slash = value.text.find('/');
  return slash == std::string::npos ||
         Fail(error, "no name holds a '/'; path: looks in whole paths", value.at + slash);
}

// "annual report\"": without the first of the two, what should be a row of words is none.
bool OpensItsQuotes(const Value& value, QueryError& error) {
  const bool is_even = std::count(value.text.begin(), value.text.end(), '"') % 2 == 0;
  const size_t last = value.text.find_last_not_of('*');
  return value.is_quoted || is_even || value.text[last] != '"' ||
         Fail(error, "this quote closes nothing; one opens in front of the first word",
              value.at + last);
}

}  // namespace

bool HoldsWords(std::string_view text) {
  for (size_t at = 0; at < text.size();) {
    const Character character = CharacterAt(text, at);
    const CharacterClass type = ClassOf(character.code);
    if (type != CharacterClass::SEPARATOR && type != CharacterClass::MARK) {
      return true;
    }
    at += character.size;
  }
  return false;
}

bool BeginsAsWord(const Value& value, const std::string& field, QueryError& error) {
  const char sign = value.text.front();
  if (value.is_quoted || !HoldsWords(value.text) ||
      std::string_view("-<>=").find(sign) == std::string_view::npos) {
    return true;
  }
  error = {field + ": compares nothing", value.at};
  if (sign == '-') {
    error.what = "a '-' that leaves out stands in front of the field";
    error.example = "-" + field + ":" + value.text.substr(value.text.find_first_not_of("-<>="));
    error.example_at = error.what.size();
  }
  error.what += std::string(" (a value that begins with ") + sign + " stands in quotes)";
  return false;
}

// In quotes a star says nothing, nor is it part of any word.
bool FillWords(const Value& value, QueryNode& node, QueryError& error) {
  const size_t end = value.text.find_last_not_of('*') + 1;
  const size_t star = value.text.find('*');
  if (!value.is_quoted && star < end) {
    return Fail(error, "'*' stands at the end of a word; names with gaps are found by name:inv*ce",
                value.at + star);
  }
  if (!OpensItsQuotes(value, error)) {
    return false;
  }
  if (!HoldsWords(value.text)) {
    if (value.text.empty() && value.is_quoted) {
      return Fail(error, "nothing stands between the quotes", value.at - 1);
    }
    if (node.scope == Scope::FIELD || node.scope == Scope::TEXT) {
      return Fail(error, Cited(value.text) + " is no word", value.at);
    }
    return FillSign(value, node, error);
  }
  // A mark of Arabic as a letter of its own.
  if (!IsOfAccount(WithoutStars(value.text), value.at, error)) {
    return false;
  }
  node.part = Part::WORD;
  node.text_at = value.at;
  node.text = value.is_quoted ? value.text.substr(0, end) : value.text;
  node.is_phrase = value.is_quoted;
  node.is_beginning = value.is_quoted ? value.has_star : value.text.ends_with('*');
  return true;
}

// In quotes it is the whole name, but for what a '*' stands for.
bool FillName(const Value& value, QueryNode& node, QueryError& error) {
  if (!HoldsNoSlash(value, error)) {
    return false;
  }
  const size_t star = value.text.find('*');
  const bool is_beginning = !value.is_quoted && star + 1 == value.text.size();
  if ((star != std::string::npos && !is_beginning) || value.has_star) {
    node.at_start = value.text.front() != '*';
    node.at_end = value.text.back() != '*' && !value.has_star;
    return FillPattern(value, Part::NAME_PATTERN, node, error);
  }
  if (value.is_quoted) {
    node.part = Part::EXACT_NAME;
    node.text_at = value.at;
    node.text = value.text;
    return true;
  }
  node.scope = Scope::NAME;
  return FillWords(value, node, error);
}

bool FillPath(const Value& value, QueryNode& node, QueryError& error) {
  const bool has_gaps = value.text.find('*') != std::string::npos;
  return (has_gaps || OpensItsQuotes(value, error)) && FillPattern(value, Part::PATH, node, error);
}

bool FillExt(const Value& value, QueryNode& node, QueryError& error) {
  node.part = Part::EXT;
  for (const Value& one : NamesIn(value)) {
    std::string& name = node.names.emplace_back(one.text);
    if (!name.empty() && !BeginsAsWord(one, "ext", error)) {
      return false;
    }
    name.erase(0, name.starts_with('.') ? 1 : 0);
    if (name.find('*') != std::string::npos) {
      return Fail(error, "ext: takes no '*'; names with gaps are found by name:*.jp*", one.at);
    }
    if (name.empty() || name.find('/') != std::string::npos) {
      return Fail(error, Cited(value.text) + " is no ending of names like pdf or jpg,png", one.at);
    }
    if (!OpensItsQuotes(one, error) || !IsOfAccount(name, one.at, error)) {
      return false;
    }
  }
  return true;
}

}  // namespace fileindexd
