// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/kind.h"

#include <algorithm>
#include <array>
#include <unordered_map>

#include "base/ascii.h"
#include "index/kind_table.h"

namespace fileindexd {

namespace {

constexpr std::array<const char*, 6> KIND_TEXTS = {"other", "document", "audio",
                                                   "video", "photo",    "folder"};

using EndingMap = std::unordered_map<std::string_view, Kind>;

EndingMap MakeEndingMap() {
  EndingMap map;
  const auto add = [&map](std::string_view endings, Kind kind) {
    while (!endings.empty()) {
      const size_t blank = endings.find(' ');
      map.emplace(endings.substr(0, blank), kind);
      endings.remove_prefix(blank == std::string_view::npos ? endings.size() : blank + 1);
    }
  };
  add(DocumentEndings(), Kind::DOCUMENT);
  add(AudioEndings(), Kind::AUDIO);
  add(VideoEndings(), Kind::VIDEO);
  add(PhotoEndings(), Kind::PHOTO);
  return map;
}

}  // namespace

Kind KindOfName(std::string_view name) {
  static const EndingMap endings = MakeEndingMap();
  constexpr size_t LONGEST = 16;

  const size_t dot = name.rfind('.');
  // A dot in front makes a name hidden; it does not begin an ending.
  if (dot == std::string_view::npos || dot == 0 || name.size() - dot - 1 > LONGEST) {
    return Kind::OTHER;
  }

  std::array<char, LONGEST> lower{};
  const std::string_view ending = name.substr(dot + 1);
  std::transform(ending.begin(), ending.end(), lower.begin(), LowerLetter);

  const auto found = endings.find(std::string_view(lower.data(), ending.size()));
  return found == endings.end() ? Kind::OTHER : found->second;
}

const char* KindText(Kind kind) {
  return KIND_TEXTS.at(static_cast<size_t>(kind));
}

std::optional<Kind> KindFromText(std::string_view text) {
  const auto found = std::find(KIND_TEXTS.begin(), KIND_TEXTS.end(), text);
  if (found == KIND_TEXTS.end()) {
    return std::nullopt;
  }
  return static_cast<Kind>(found - KIND_TEXTS.begin());
}

bool IsContentWanted(Kind kind, const ContentFlags& flags) {
  switch (kind) {
    case Kind::DOCUMENT:
      return flags.document;
    case Kind::AUDIO:
      return flags.audio;
    case Kind::VIDEO:
      return flags.video;
    case Kind::PHOTO:
      return flags.photo;
    case Kind::OTHER:
      return flags.Any();
    case Kind::FOLDER:
      return false;
  }
  return false;
}

}  // namespace fileindexd
