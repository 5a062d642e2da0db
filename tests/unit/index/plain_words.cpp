// SPDX-License-Identifier: GPL-2.0-or-later
// Questions for words, and for names and paths by their letters.
#include <algorithm>

#include "tests/unit/index/plain_questions.h"

namespace fileindexd {

namespace {

using Texts = std::vector<std::string>;

bool IsWordByte(char c) {
  return std::isalnum(static_cast<unsigned char>(c)) != 0 || (c & 0x80) != 0;
}

Texts WordsIn(const std::string& text) {
  Texts words;
  bool inside = false;
  for (const char c : text) {
    if (IsWordByte(c)) {
      words.resize(words.size() + (inside ? 0 : 1));
      words.back() += c;
    }
    inside = IsWordByte(c);
  }
  return words;
}

bool HasRow(const std::string& text, const Texts& row, bool last_is_beginning) {
  const Texts words = WordsIn(text);
  for (size_t at = 0; at + row.size() <= words.size(); ++at) {
    size_t same = 0;
    for (; same < row.size(); ++same) {
      const bool begins = last_is_beginning && same + 1 == row.size();
      const std::string& word = words[at + same];
      if (begins ? !word.starts_with(row[same]) : word != row[same]) {
        break;
      }
    }
    if (same == row.size()) {
      return true;
    }
  }
  return false;
}

bool Contains(const std::string& text, const std::string& piece) {
  return text.find(piece) != std::string::npos;
}

// The whole name, with stars for anything.
bool Fits(std::string_view name, std::string_view pattern) {
  if (pattern.empty()) {
    return name.empty();
  }
  if (pattern.front() == '*') {
    return Fits(name, pattern.substr(1)) || (!name.empty() && Fits(name.substr(1), pattern));
  }
  return !name.empty() && name.front() == pattern.front() &&
         Fits(name.substr(1), pattern.substr(1));
}

std::string InQuotes(const std::string& text) {
  return "\"" + text + "\"";
}

}  // namespace

PlainQuestion QuestionMaker::Words() {
  Texts row;
  std::string text;
  for (size_t left = chance.OneOf(4) ? 2 : 1; left > 0; --left) {
    const SpeltWord& word = chance.Word();
    row.push_back(word.plain);
    text += (text.empty() ? "" : " ") + chance.Spell(word);
  }
  const bool is_ascii = std::all_of(row.back().begin(), row.back().end(), isalpha);
  const bool beginning = is_ascii && chance.OneOf(5);
  if (beginning) {
    const size_t letters = 2 + chance.Below(3);
    text.resize(row.size() > 1 ? text.find(' ') + 1 : 0);
    row.back().resize(std::min(letters, row.back().size()));
    text += row.back();
  }
  text = (row.size() > 1 ? InQuotes(text) : text) + (beginning ? "*" : "");
  const auto in_field = [=](const PlainFile& file, ContentField field) {
    const auto found = file.texts.find(field);
    return found != file.texts.end() && HasRow(found->second, row, beginning);
  };
  const auto in_name = [=](const PlainFile& f) { return HasRow(f.PlainName(), row, beginning); };
  switch (chance.Below(8)) {
    case 0:
      if (row.size() == 1) {  // several in quotes would be the whole name
        return {"name:" + text, in_name};
      }
      [[fallthrough]];
    case 1:
      return {"text:" + text, [=](const PlainFile& f) { return HasRow(f.text, row, beginning); }};
    case 2:
      return {"title:" + text,
              [=](const PlainFile& f) { return in_field(f, ContentField::TITLE); }};
    case 3:
      return {"camera:" + text,
              [=](const PlainFile& f) { return in_field(f, ContentField::CAMERA); }};
    case 4:
      return {(chance.OneOf(2) ? "keyword:" : "tag:") + text,
              [=](const PlainFile& f) { return in_field(f, ContentField::KEYWORDS); }};
    default:
      return {text, [=](const PlainFile& f) {
                return in_name(f) || HasRow(f.text, row, beginning) ||
                       std::any_of(f.texts.begin(), f.texts.end(), [&](const auto& field) {
                         return HasRow(field.second, row, beginning);
                       });
              }};
  }
}

// Pieces of words, as they are spelt, and the same plain.
PlainQuestion QuestionMaker::NamePattern() {
  std::string text;
  std::string plain;
  const bool at_start = chance.OneOf(4);
  const size_t pieces = 1 + chance.Below(2);
  for (size_t i = 0; i < pieces; ++i) {
    const SpeltWord& word = chance.Word();
    const bool is_whole = chance.OneOf(3) || (word.plain[0] & 0x80) != 0;
    const std::string cut = word.plain.substr(chance.Below(2), 1 + chance.Below(4));
    text += (i == 0 && at_start ? "" : "*") + (is_whole ? chance.Spell(word) : cut);
    plain += (i == 0 && at_start ? "" : "*") + (is_whole ? word.plain : cut);
  }
  // A star at the end alone would make a beginning of it.
  const std::string tail = at_start && pieces == 1 ? "*.txt" : chance.OneOf(3) ? ".md" : "*";
  plain += tail;
  return {"name:" + text + tail, [=](const PlainFile& f) { return Fits(f.PlainName(), plain); }};
}

PlainQuestion QuestionMaker::ExactName() {
  const PlainFile& file = chance.Of(world.files);
  const std::string plain = file.PlainName();
  return {"name:" + InQuotes(file.entry.path.substr(file.entry.path.rfind('/') + 1)),
          [=](const PlainFile& f) { return f.PlainName() == plain; }};
}

PlainQuestion QuestionMaker::PathPiece() {
  const SpeltWord& word = chance.Word();
  if (chance.OneOf(3)) {
    return {"path:/" + chance.Spell(word), [plain = "/" + word.plain](const PlainFile& f) {
              return Contains(f.plain_path, plain);
            }};
  }
  return {"path:" + chance.Spell(word) + "*/*plum",
          [plain = "*" + word.plain + "*/*plum*"](const PlainFile& f) {
            return Fits(f.plain_path, plain);
          }};
}

}  // namespace fileindexd
