// SPDX-License-Identifier: GPL-2.0-or-later
// A line of a content around the words of a question.
#pragma once

#include <string>
#include <vector>

namespace fileindexd {

struct Content;
struct QueryNode;
class TextCutter;

struct Snippet {
  struct Mark {
    size_t start = 0;
    size_t end = 0;
  };
  std::string text;         // one line of valid UTF-8; empty: none of the words was found
  std::vector<Mark> marks;  // the words in it, in order
};

// Of the text, or of a field if none of the words stands in the text. Where many stand close
// together, of those. Looks at the first part of a long text only.
// `words`: nodes that are words; those that are looked for in one field count in that field alone.
Snippet MakeSnippet(const Content& content, const std::vector<const QueryNode*>& words,
                    TextCutter& cutter);

}  // namespace fileindexd
