// SPDX-License-Identifier: GPL-2.0-or-later
// What was read out of a file, as info shows it.
#pragma once

#include <json/value.h>

#include <string>
#include <utility>
#include <vector>

#include "index/contents_reader.h"
#include "index/entry.h"
#include "state/settings.h"

namespace fileindexd {

struct EntryContent {
  bool is_known = false;
  std::string problem;                 // why it cannot be read; empty: it can
  std::optional<WordsProgress> words;  // of the share, that are being made anew
  StoredContent stored;  // a reason stands here also where nothing is kept of what was read
};

// Of an entry whose content is wanted. Known, unless it cannot be read.
EntryContent ContentOf(const Share& share, const Entry& entry);

Json::Value ContentObject(const EntryContent& content);  // null when not known
// Names and values for people: state first, then the fields; or the problem alone. What holds
// several lines, such as the members of an archive, has a line for each, the others without a name;
// at most so many, and what is left out is told.
std::vector<std::pair<std::string, std::string>> ContentLines(const EntryContent& content,
                                                              size_t most_of_field);

}  // namespace fileindexd
