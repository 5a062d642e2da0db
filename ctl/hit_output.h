// SPDX-License-Identifier: GPL-2.0-or-later
// Hits, as search shows them.
//
// On a terminal each hit is a line of path, size and time, and below it one of its content where
// that answers the question. No line is wider than the screen: a path is cut in the middle, where
// it hides none of the question's words if that can be, a line of content at its end. On a narrow
// screen the time goes first, then the size. Elsewhere: the paths alone, whole, one a line.
#pragma once

#include <json/value.h>

#include <string>
#include <vector>

#include "ctl/terminal/screen.h"
#include "index/search.h"

namespace fileindexd {

Json::Value HitObject(const Hit& hit);

// Lines for a screen, without their ends.
std::vector<std::string> HitLines(const std::vector<Hit>& hits, const Screen& screen);

}  // namespace fileindexd
