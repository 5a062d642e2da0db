// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/name_text.h"

#include "base/ascii.h"
#include "base/utf8.h"

namespace fileindexd {

namespace {

constexpr int32_t END_CODE = 0xe000;

// Wanted: a break without width parts words of texts, but none of names: these rows keep no copy of
// what was taken in, so that words cut otherwise would mean a new version of the whole database.
bool IsDropped(CharacterClass type, int32_t code) {
  return type == CharacterClass::MARK || code == BREAK_WITHOUT_WIDTH;
}

// Where what was added last came from.
void Note(std::vector<uint32_t>* origins, const std::string& text, size_t origin) {
  if (origins != nullptr) {
    origins->resize(text.size(), static_cast<uint32_t>(origin));
  }
}

}  // namespace

std::string NameFolder::Words(std::string_view name, std::vector<uint32_t>* origins) {
  return Fold(name, true, origins);
}

std::string NameFolder::Parts(std::string_view name, std::vector<uint32_t>* origins) {
  return Fold(name, false, origins);
}

std::string NameFolder::Fold(std::string_view name, bool apart, std::vector<uint32_t>* origins) {
  std::string text;
  text.reserve(name.size());
  int32_t last = 0;  // the character of a syllable that may go on, and where its bytes begin
  size_t last_at = 0;
  for (size_t at = 0; at < name.size();) {
    const auto byte = static_cast<unsigned char>(name[at]);
    if (byte < 0x80) {
      text += LowerLetter(name[at]);
      Note(origins, text, at);
      last = 0;
      ++at;
      continue;
    }
    if (!characters.has_value()) {
      characters.emplace();
    }
    const Character character = CharacterAt(name, at);
    const CharacterTable::Entry& entry = characters->Of(character.code);
    if (entry.type == CharacterClass::PAIRED) {
      const int32_t plain = characters->Plain(character.code);
      const int32_t joined = last == 0 ? 0 : Joined(last, plain);
      if (joined != 0) {
        text.resize(last_at);
      } else if (apart) {
        text += ' ';
        Note(origins, text, at);
      }
      last = joined != 0 ? joined : plain;
      last_at = text.size();
      AppendUtf8(static_cast<char32_t>(last), text);
    } else if (!IsDropped(entry.type, character.code)) {
      last = 0;
      if (entry.type == CharacterClass::SEPARATOR || character.code == END_CODE) {
        text.append(character.code == END_CODE ? " " : name.substr(at, character.size));
      } else {
        text += entry.Folded();
      }
    }
    Note(origins, text, at);
    at += character.size;
    const bool ends_run =
        last != 0 && apart &&
        (at == name.size() || static_cast<unsigned char>(name[at]) < 0x80 ||
         characters->Of(CharacterAt(name, at).code).type != CharacterClass::PAIRED);
    if (ends_run) {
      text += ' ';
      Note(origins, text, at);
      last = 0;
    }
  }
  Note(origins, text, name.size());
  if (origins != nullptr) {
    origins->push_back(static_cast<uint32_t>(name.size()));
  }
  return text;
}

bool HasEnding(std::string_view name, std::string_view ending) {
  return name.size() > ending.size() + 1 && name.ends_with(ending) &&
         name[name.size() - ending.size() - 1] == '.';
}

std::string NameRow(NameFolder& folder, std::string_view name) {
  return folder.Words(name) + " " + NAME_END;
}

}  // namespace fileindexd
