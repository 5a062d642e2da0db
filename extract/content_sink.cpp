// SPDX-License-Identifier: GPL-2.0-or-later
#include <algorithm>
#include <cassert>
#include <utility>

#include "extract/characters.h"
#include "extract/format.h"

namespace fileindexd {

namespace {

// A word that the cap cuts is taken away whole, but for one that goes on for longer than words do.
constexpr size_t LONGEST_WORD = 256;

constexpr bool IsPlain(char byte) {
  return byte > ' ' && byte < '\x7F';
}

// What stands between the values of a field that gathers; nothing for the others.
std::string_view Separator(ContentField field) {
  switch (field) {
    case ContentField::KEYWORDS:
    case ContentField::TO:
    case ContentField::CODECS:
      return ", ";
    case ContentField::MEMBERS:
    case ContentField::ATTACHMENTS:
      return "\n";
    default:
      return "";
  }
}

bool Holds(std::string_view list, std::string_view separator, std::string_view value) {
  for (size_t at = list.find(value); at != std::string_view::npos; at = list.find(value, at + 1)) {
    const bool begins = at == 0 || list.substr(0, at).ends_with(separator);
    const std::string_view rest = list.substr(at + value.size());
    if (begins && (rest.empty() || rest.starts_with(separator))) {
      return true;
    }
  }
  return false;
}

// Blanks at both ends go, runs of them become one. Reads no more than what fills `limit`.
std::string Cleaned(std::string_view bytes, size_t limit) {
  std::string clean;
  bool is_apart = false;
  while (!bytes.empty() && clean.size() < limit) {
    const Utf8Character character = FirstCharacter(bytes);
    if (IsBlank(character.code)) {
      is_apart = !clean.empty();
    } else {
      if (is_apart) {
        clean += ' ';
      }
      is_apart = false;
      clean += bytes.substr(0, character.length);
    }
    bytes.remove_prefix(character.length);
  }
  clean.resize(CutText(clean, limit).size());
  return clean;
}

}  // namespace

void ContentSink::AddText(std::string_view bytes) {
  std::string joined;
  if (!pending.empty()) {  // the rest of a character that the bytes before ended within
    joined = pending + std::string(bytes);
    bytes = joined;
    pending.clear();
  }

  while (!bytes.empty() && !content.is_cut) {
    const size_t plain =
        static_cast<size_t>(std::find_if_not(bytes.begin(), bytes.end(), IsPlain) - bytes.begin());
    if (plain > 0) {
      Append(bytes.substr(0, plain));
      bytes.remove_prefix(plain);
      continue;
    }

    const Utf8Character character = FirstCharacter(bytes);
    if (character.is_cut) {
      pending = bytes;
      return;
    }
    if (IsBlank(character.code)) {
      is_apart = true;
    } else {
      Append(bytes.substr(0, character.length));
    }
    bytes.remove_prefix(character.length);
  }
}

// Takes characters of one word, as many as there is room for.
void ContentSink::Append(std::string_view word) {
  std::string& text = content.text;
  const size_t ended = text.size();
  const bool begins = is_apart;
  if (begins && !text.empty() && text.size() < text_cap) {
    text += ' ';
  }
  is_apart = false;
  const std::string_view fitting = CutText(word, text_cap - text.size());
  text += fitting;
  if (fitting.size() == word.size()) {
    return;
  }

  content.is_cut = true;
  const size_t blank = begins ? ended : text.rfind(' ');
  if (blank != std::string::npos && text.size() - blank <= LONGEST_WORD) {
    text.resize(blank);
  }
}

ContentSink::Mark ContentSink::Here() const {
  const size_t size = content.text.size();
  return {content.kind,
          content.texts,
          content.numbers,
          size,
          content.text.substr(size - std::min(size, LONGEST_WORD)),
          content.is_cut,
          is_apart,
          pending,
          converter};
}

void ContentSink::ReturnTo(Mark&& mark) {
  content.kind = mark.kind;
  content.texts = std::move(mark.texts);
  content.numbers = std::move(mark.numbers);
  content.text.resize(mark.text_size - mark.text_end.size());
  content.text += mark.text_end;
  content.is_cut = mark.is_cut;
  is_apart = mark.is_apart;
  pending = std::move(mark.pending);
  converter = std::move(mark.converter);
}

void ContentSink::Set(ContentField field, std::string_view text) {
  assert(!IsNumberField(field));
  const std::string value = Cleaned(text, MAX_FIELD);
  if (value.empty()) {
    return;
  }

  const auto known = std::find_if(content.texts.begin(), content.texts.end(),
                                  [field](const TextField& other) { return other.field == field; });
  if (known == content.texts.end()) {
    content.texts.push_back({field, value});
    return;
  }

  const std::string_view separator = Separator(field);
  const bool fits = known->text.size() + separator.size() + value.size() <= MAX_FIELD;
  if (!separator.empty() && fits && !Holds(known->text, separator, value)) {
    known->text += separator;
    known->text += value;
  }
}

void ContentSink::Set(ContentField field, int64_t number) {
  assert(IsNumberField(field));
  const bool is_known =
      std::any_of(content.numbers.begin(), content.numbers.end(),
                  [field](const NumberField& other) { return other.field == field; });
  if (!is_known && IsPlausible(field, number)) {
    content.numbers.push_back({field, number});
  }
}

}  // namespace fileindexd
