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

// Hits on a screen, one by one: an answer may be long, and what a screen needs of a path is many
// times its bytes.
class HitFormat {
 public:
  // Figures stand behind the widest of the paths.
  HitFormat(const std::vector<Hit>& hits, const Screen& shown_on);

  std::vector<std::string> Lines(const Hit& hit) const;  // without their ends

 private:
  Screen screen;
  size_t widest = 0;
};

}  // namespace fileindexd
