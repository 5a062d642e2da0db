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

// Sets the keys that begin with "contents", and "words_made_anew".
void AddContents(Json::Value& object, const ContentsReport& report);
// "not made anew for german yet, 5 of 10 texts done; those for english are found".
std::string WordsText(const WordsProgress& words);
Json::Value WordsObject(const std::optional<WordsProgress>& words);  // null: there are none
// One line for people.
std::string ContentsText(const ContentsReport& report);

}  // namespace fileindexd
