// SPDX-License-Identifier: GPL-2.0-or-later
// What status tells of contents: how many are read, wait, failed, by kind, and how fast it goes.
#pragma once

#include <json/value.h>

#include <cstdint>
#include <string>

#include "index/contents_reader.h"

namespace fileindexd {

struct ContentsReport {
  ContentCounts counts;
  std::string problem;  // empty: none; that nothing was read yet is none
};

// `wanted`: entries whose content is wanted; all of them wait where nothing was read yet.
ContentsReport ReportContents(const std::string& share_name, uint64_t wanted);

// Sets the keys that begin with "contents".
void AddContents(Json::Value& object, const ContentsReport& report);
// One line for people.
std::string ContentsText(const ContentsReport& report);

}  // namespace fileindexd
