// SPDX-License-Identifier: GPL-2.0-or-later
// What shows why a hit is one: places in its path, and a line of its content.
#pragma once

#include <string>
#include <vector>

#include "index/asked.h"
#include "index/candidate.h"
#include "index/name_marker.h"
#include "index/snippet.h"

namespace fileindexd {

class TextCutter;

// Bytes of the entry's path that answer the question; in order, none in another. Those of path: may
// stand anywhere, all others in the last component.
std::vector<Snippet::Mark> MarksInPath(const Asked& asked, const Entry& entry, NameMarker& marker);

// SQLite's code. No snippet where the content shows none of the words.
int AddSnippet(CandidateRows& rows, const Asked& asked, Candidate& candidate, TextCutter& cutter,
               Snippet& snippet);

}  // namespace fileindexd
