// SPDX-License-Identifier: GPL-2.0-or-later
// What a watch told, as text, and waiting for it.
#pragma once

#include <poll.h>

#include <algorithm>
#include <string>
#include <vector>

#include "notify/change.h"

namespace fileindexd {

// "create+modify /d/file", "rename /a/ -> /b/": with a slash at the end for directories.
inline std::string TextOf(const Change& change) {
  constexpr std::pair<uint32_t, const char*> NAMES[] = {
      {CREATED, "create"}, {MODIFIED, "modify"}, {ATTRIBUTES, "attrib"}, {WRITTEN, "write"},
      {DELETED, "delete"}, {MOVED_FROM, "from"}, {MOVED_TO, "to"}};
  std::string text;
  for (const auto& [bit, name] : NAMES) {
    if ((change.what & bit) != 0) {
      text += (text.empty() ? "" : "+") + std::string(name);
    }
  }
  const std::string end = change.directory ? "/" : "";
  text += " " + (change.from.empty() ? "" : change.from + end + " -> ") + change.path + end;
  return text;
}

using Texts = std::vector<std::string>;

// Reads until nothing waits.
template <typename Watch>
Texts ReadAll(Watch& watch, bool& failed) {
  Texts told;
  for (;;) {
    const auto result = watch.Read([&](const Change& change) { told.push_back(TextOf(change)); });
    failed = result == Watch::Result::FAILED;
    if (failed || result == Watch::Result::EMPTY) {
      return told;
    }
  }
}

// Waits until something can be read: at most 20 s.
template <typename Watch>
bool WaitFor(const Watch& watch) {
  pollfd waited{watch.Descriptor(), POLLIN, 0};
  return poll(&waited, 1, 20000) == 1;
}

inline Texts Sorted(Texts texts) {
  std::sort(texts.begin(), texts.end());
  return texts;
}

}  // namespace fileindexd
