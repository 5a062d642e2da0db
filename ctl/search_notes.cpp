// SPDX-License-Identifier: GPL-2.0-or-later
#include "ctl/search_notes.h"

#include <cstdio>
#include <string>

#include "base/ascii.h"
#include "ctl/output.h"
#include "ctl/terminal/cells.h"
#include "index/text_tokenizer.h"

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

void TellOfSmallOperator(const std::string& word, const std::optional<Screen>& screen) {
  const char first = LowerLetter(word.front());
  const std::string meant = first == 'o'   ? "OR is written in capitals"
                            : first == 'a' ? "all words are wanted anyway"
                                           : "NOT is written in capitals, or as -word";
  PutNote("'" + word + "' was looked for as a word: " + meant + ".", screen);
}

}  // namespace

void TellNothingFound(const Question& question, const Answer& answer,
                      const std::optional<Screen>& screen) {
  if (!answer.knows_under) {
    PutNote("No share that is asked knows the folder " +
                (screen.has_value() ? Printable(question.under) : OneLine(question.under)),
            screen);
    return;
  }
  if (!answer.small_operator.empty()) {
    TellOfSmallOperator(answer.small_operator, screen);
  }
  if (!answer.suggestion.empty()) {
    PutNote("Did you mean: " + Printable(answer.suggestion), screen);
    return;
  }
  const std::string& word = answer.word_like_field;
  if (!word.empty()) {
    PutNote("There is no field '" + word.substr(0, word.find(':')) + "': '" + Printable(word) +
                "' was looked for as words.",
            screen);
  } else if (screen.has_value() && answer.small_operator.empty()) {
    PutNote("Nothing found.", screen);
  }
}

void TellOfWords(const Settings& settings, const Answer& answer,
                 const std::optional<Screen>& screen) {
  for (const auto& [name, asked] : answer.words) {
    const Share* share = settings.ShareByName(name);
    const std::string wanted = share != nullptr ? LanguageOfWords(share->language) : "";
    if (share != nullptr && asked.has_texts && asked.language != wanted) {
      std::string note = "The words of share ";
      note.append(name).append(" are not made anew for ").append(wanted);
      note.append(" yet: those for ").append(asked.language).append(" were looked for.");
      PutNote(screen.has_value() ? Printable(note) : OneLine(note), screen);
    }
  }
}

void TellNothingBehind(const Question& question, const Answer& answer,
                       const std::optional<Screen>& screen) {
  if (screen.has_value()) {
    PutNote("Nothing behind the first " + std::to_string(question.offset) + ": there " +
                (answer.total == 1 ? "is " : "are ") + std::to_string(answer.total) + " in all.",
            screen);
  }
}

void TellOfMore(uint64_t shown, const std::optional<Screen>& screen) {
  PutNote("There are more than these " + std::to_string(shown) +
              ": --limit N or --limit all shows them, --offset N the next.",
          screen);
}

}  // namespace fileindexd
