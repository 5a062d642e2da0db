// SPDX-License-Identifier: GPL-2.0-or-later
// What was read out of a file, as info shows it.
#pragma once

#include <json/value.h>

#include <string>
#include <utility>
#include <vector>

#include "base/content.h"
#include "index/entry.h"

namespace fileindexd {

struct EntryContent {
  bool is_known = false;
  std::string problem;  // why it cannot be read; empty: it can
  std::string state;    // "waiting", "done", "failed"
  std::string reason;   // of a failure, or why nothing is kept of what was read
  Content content;
  int64_t extractor = 0;  // version of the readers of what is kept; 0: nothing is
  int64_t tries = 0;      // that ended with the death of the reader
  std::string language;   // whose word forms are found together
};

// Of an entry whose content is wanted. Known, unless it cannot be read.
EntryContent ContentOf(const std::string& share, const Entry& entry);

Json::Value ContentObject(const EntryContent& content);  // null when not known
// Names and values for people: state first, then the fields; or the problem alone.
std::vector<std::pair<std::string, std::string>> ContentLines(const EntryContent& content);

}  // namespace fileindexd
