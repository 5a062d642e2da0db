// SPDX-License-Identifier: GPL-2.0-or-later
// "Did you mean": a question without an answer, in words that the indexes have.
#pragma once

#include <deque>
#include <string>
#include <vector>

#include "index/asked.h"
#include "index/asked_share.h"
#include "index/name_marker.h"

namespace fileindexd {

// The question's text with each word that no share knows, where the word is looked for (behind a
// field, in that field alone), changed into a near one that some share does: one slip of the
// fingers away, or two in a longer word. The words of a phrase are looked at one by one. What
// nothing is near to stays, as the other side of an OR may find something. A few texts, that of the
// nearest words first: whether the words stand together is not looked at. None when there are more
// than ten of them, or nothing was to be changed. Looks at a bounded part of the vocabularies.
std::vector<std::string> Suggest(const Asked& asked, std::deque<AskedShare>& shares,
                                 NameMarker& names);

// The first word like "type:pdf", which looks for a field that there is not; empty: there is none.
std::string WordLikeField(const QueryNode& node);

}  // namespace fileindexd
