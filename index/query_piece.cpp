// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/query_piece.h"

#include <algorithm>

#include "index/text_characters.h"

namespace fileindexd {

namespace {

// ":)", ";-))".
bool EndsWithFace(std::string_view word) {
  word.remove_suffix(word.size() - (word.find_last_not_of(')') + 1));
  word.remove_suffix(word.ends_with('-') ? 1 : 0);
  return word.ends_with(':') || word.ends_with(';') || word.ends_with('=');
}

}  // namespace

// No byte within a character is well-formed alone, so that text can be looked through by bytes.
size_t BlankAt(std::string_view text, size_t at) {
  if (at >= text.size()) {
    return 0;
  }
  const Character character = CharacterAt(text, at);
  const bool is_one = character.size > 1 || static_cast<unsigned char>(text[at]) < 0x80;
  return is_one && IsBlankCharacter(character.code) ? character.size : 0;
}

size_t SkipBlanksAt(std::string_view text, size_t at) {
  while (const size_t size = BlankAt(text, at)) {
    at += size;
  }
  return at;
}

size_t NextBlank(std::string_view text, size_t at) {
  while (at < text.size() && BlankAt(text, at) == 0) {
    ++at;
  }
  return at;
}

size_t LettersAtStart(std::string_view text) {
  const auto* const end = std::find_if_not(text.begin(), text.end(), [](char c) {
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z');
  });
  return static_cast<size_t>(end - text.begin());
}

bool PieceReader::Fail(const std::string& what, size_t where) {
  error = {what, where};
  return false;
}

bool PieceReader::ReadQuoted(Value& value) {
  const size_t start = at;
  const size_t end = text.find('"', at + 1);
  if (end == std::string::npos) {
    return Fail("this quote is never closed", start);
  }
  value.text = text.substr(at + 1, end - at - 1);
  value.at = at + 1;
  value.is_quoted = true;
  at = end + 1;
  value.has_star = at < text.size() && text[at] == '*';
  at += value.has_star ? 1 : 0;
  return true;
}

// A bracket that a word itself opened belongs to it: "copy(1).txt". So does one within it that
// closes nothing ("a)b"), but not at its end.
bool PieceReader::ReadBare(Value& value, bool in_list) {
  value.at = at;
  int inside = 0;
  size_t unopened = std::string::npos;
  while (at < text.size() && BlankAt(text, at) == 0) {
    if (in_list && text.compare(at, 2, ",\"") == 0) {
      break;
    }
    inside += text[at] == '(' ? 1 : 0;
    if (text[at] == ')' && --inside < 0) {
      if (is_inside) {
        break;
      }
      inside = 0;
      unopened = at;
    }
    ++at;
  }
  value.text = text.substr(value.at, at - value.at);
  // "report)*" is "report)", but "*)*" a name with a bracket in it.
  std::string_view word = value.text;
  word = word.starts_with('*') ? word : word.substr(0, word.find_last_not_of('*') + 1);
  return unopened == std::string::npos || unopened + 1 != value.at + word.size() ||
         EndsWithFace(word) ||
         Fail("this bracket closes nothing (a word that ends with one stands in quotes)", unopened);
}

bool PieceReader::EndsQuotes() {
  return at == text.size() || BlankAt(text, at) > 0 || text[at] == ')' ||
         Fail("a blank is missing behind what stands in quotes", at);
}

bool PieceReader::ReadOne(Value& value) {
  if (IsAtQuote()) {
    return ReadQuoted(value) && EndsQuotes();
  }
  return ReadBare(value, false);
}

bool PieceReader::ReadList(Value& value) {
  value.at = at + (IsAtQuote() ? 1 : 0);
  while (true) {
    Value part;
    if (IsAtQuote() ? !ReadQuoted(part) : !ReadBare(part, true)) {
      return false;
    }
    value.text += part.text;
    value.has_star = part.has_star;
    const bool goes_on = at < text.size() && text[at] == ',' && !value.has_star;
    value.listed.push_back(part);
    if (!goes_on) {
      return !part.is_quoted || EndsQuotes();
    }
    value.text += ',';
    ++at;
  }
}

std::vector<std::string> SplitAt(std::string_view text, char separator) {
  std::vector<std::string> parts;
  while (true) {
    const size_t end = text.find(separator);
    parts.emplace_back(text.substr(0, end));
    if (end == std::string_view::npos) {
      return parts;
    }
    text.remove_prefix(end + 1);
  }
}

std::vector<Value> AtCommas(const Value& value) {
  std::vector<Value> names;
  size_t at = value.at;
  for (const std::string& text : SplitAt(value.text, ',')) {
    Value& name = names.emplace_back();
    name.text = text;
    name.at = at;
    name.is_quoted = value.is_quoted;
    at += text.size() + 1;
  }
  return names;
}

std::vector<Value> NamesIn(const Value& list) {
  std::vector<Value> names;
  for (const Value& part : list.listed) {
    const std::vector<Value> parted = AtCommas(part);
    names.insert(names.end(), parted.begin(), parted.end());
  }
  return names;
}

}  // namespace fileindexd
