// SPDX-License-Identifier: GPL-2.0-or-later
#include "ctl/search_notes.h"

#include <algorithm>
#include <cstdio>
#include <ctime>
#include <string>
#include <string_view>

#include "ctl/output.h"
#include "ctl/terminal/cells.h"
#include "index/query.h"

namespace fileindexd {

namespace {

void PutNote(const std::string& note, const std::optional<Screen>& screen) {
  if (!screen.has_value()) {
    (void)fprintf(stderr, "%s\n", note.c_str());  // nowhere left to tell of a failure
    return;
  }
  for (const std::string& line : WrappedLines(note, screen->columns)) {
    (void)PutLine(line);
  }
}

bool IsLetter(char c) {
  return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z');
}

// The first word like "type:pdf", which looks for a field that there is not; empty: there is none.
std::string WordLikeField(const QueryNode& node) {
  if (node.part == Part::NOT) {
    return "";
  }
  for (const QueryNode& below : node.below) {
    std::string word = WordLikeField(below);
    if (!word.empty()) {
      return word;
    }
  }
  if (node.part != Part::WORD || node.scope != Scope::ANY || node.is_phrase) {
    return "";
  }
  const std::string& text = node.text;
  const auto end = std::find_if_not(text.begin(), text.end(), IsLetter);
  const std::string_view rest(end, text.end());
  const bool is_like_field = end - text.begin() >= 2 && rest.size() >= 2 && rest[0] == ':' &&
                             rest[1] != ':' && rest[1] != '/';
  return is_like_field ? text : "";
}

}  // namespace

void TellNothingFound(const Question& question, const Answer& answer,
                      const std::optional<Screen>& screen) {
  if (!answer.suggestion.empty()) {
    PutNote("Did you mean: " + Printable(answer.suggestion), screen);
    return;
  }
  QueryNode tree;
  QueryError error;
  const bool is_read = ParseQuery(question.text, time(nullptr), tree, error);
  const std::string word = is_read ? WordLikeField(tree) : "";
  if (!word.empty()) {
    PutNote("There is no field '" + word.substr(0, word.find(':')) + "': '" + Printable(word) +
                "' was looked for as words.",
            screen);
  } else if (screen.has_value()) {
    PutNote("Nothing found.", screen);
  }
}

void TellOfMore(uint64_t shown, const std::optional<Screen>& screen) {
  PutNote("There are more than these " + std::to_string(shown) +
              ": --limit N or --limit all shows them, --offset N the next.",
          screen);
}

}  // namespace fileindexd
