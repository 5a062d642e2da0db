// SPDX-License-Identifier: GPL-2.0-or-later
// What status tells of contents: how many are read, wait, failed, by kind, and how fast it goes.
#pragma once

#include <json/value.h>

#include <cstdint>
#include <optional>
#include <string>

#include "index/contents_reader.h"
#include "state/settings.h"

namespace fileindexd {

struct ContentsReport {
  ContentCounts counts;
  std::optional<WordsProgress> words;  // that are being made anew
  std::string problem;                 // empty: none; that nothing was read yet is none
};

// `wanted`: entries whose content is wanted; all of them wait where nothing was read yet.
ContentsReport ReportContents(const Share& share, uint64_t wanted);

// Sets the keys that begin with "contents".
void AddContents(Json::Value& object, const ContentsReport& report);
// "made anew for german, 5 of 10 texts done; until then those of english are found".
std::string WordsText(const WordsProgress& words);
Json::Value WordsObject(const std::optional<WordsProgress>& words);  // null: there are none
// One line for people.
std::string ContentsText(const ContentsReport& report);

}  // namespace fileindexd
